// What a handler tells CXMLDocument::ReadAttributes: the names of the attributes it reads, grouped
// by length at compile time, and the values the module lends for them.
#pragma once

#include <cstddef>
#include <cstdint>

// The name of an attribute a handler reads, with its length known where it is written.
struct XMLAttributeName {
    template <size_t N>
    constexpr XMLAttributeName(const char (&literal)[N]) : name(literal), length(N - 1) {}
    const char* name;
    int length;
};

// Names of attributes are at most this long (bytes), for the table below.
constexpr int kXMLAttributeNameLimit = 32;

// The attributes one handler reads, with its names grouped by length: each attribute of an
// element is compared only with the names of its own length, mostly one or none.
template <size_t N>
struct XMLAttributeNames {
    XMLAttributeName names[N];
    uint32_t byLength[kXMLAttributeNameLimit];  // bit i: names[i] has that length
};

// XMLAttributeNames of the given literals, built at compile time:
//   static constexpr auto kNames = ka::AttributeNames("id", "sequence");
namespace ka {
template <typename... Literals>
constexpr XMLAttributeNames<sizeof...(Literals)> AttributeNames(const Literals&... literals) {
    static_assert(sizeof...(Literals) <= 32, "one bit per name");
    XMLAttributeNames<sizeof...(Literals)> set = {{XMLAttributeName(literals)...}, {}};
    for (size_t i = 0; i < sizeof...(Literals); ++i) {
        const int length = set.names[i].length;
        // A name too long for the table is refused where the set is built.
        set.byLength[length < kXMLAttributeNameLimit ? length : throw "attribute name too long"] |=
            1u << i;
    }
    return set;
}
}  // namespace ka

// An attribute's value as the module lends it: null and 0 when the element has none.
struct XMLAttributeValue {
    char* value = nullptr;
    int length = 0;
    // Present as the parsers count it: at least one character.
    bool Present() const { return value != nullptr && length >= 1; }
};
