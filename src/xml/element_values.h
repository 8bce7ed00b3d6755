// Small helpers of both parsers' handlers: name matching, string copies, attribute lookups and
// the raw element text with its CDATA section unwrapped.
#pragma once

#include <cstddef>
#include <cstring>
#include <string>

class CXMLDocument;

namespace ka {

// Exact, case-sensitive comparison of a tag name of the given length with a literal. Inline, so
// that the literal's length is known where it is called: every handler tries several names.
inline bool NameIs(const char* name, unsigned int length, const char* literal) {
    if (name == nullptr) return false;
    const size_t n = std::char_traits<char>::length(literal);
    return length == n && memcmp(name, literal, n) == 0;
}

// A new[] copy of the first length characters of text, terminated.
char* CopyText(const char* text, size_t length);

// Looks up an attribute: true when it exists with at least one character.
bool ReadAttribute(CXMLDocument& doc, void* node, const char* name, char** value, int& length);

// Replaces field with a copy of the attribute's value when it is present; true when it did.
bool CopyAttribute(CXMLDocument& doc, void* node, const char* name, char*& field);

// Raw element text (entities kept as written) with a CDATA section unwrapped and trimmed.
// Replaces field only when the element has at least one character of text; true when it did.
bool ReadRawText(CXMLDocument& doc, void* node, char*& field);

}  // namespace ka
