// kaExpandVASTMacros on arbitrary templates and records. The input splits at NUL bytes: the
// template, the raw bytes of the record's numbers, then texts for its text fields in order. The
// first byte chooses the record's declared size (or no record) and the second the buffer's size;
// every buffer is heap-allocated to its exact size, so a write past it is reported.
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "ka/vmap_parser_ext.h"

namespace {

constexpr size_t kNumbersEnd = offsetof(KaMacroValues, assetUri);
constexpr size_t kTextCount = (sizeof(KaMacroValues) - kNumbersEnd) / sizeof(const char*);

void Check(bool ok, const char* what) {
    if (!ok) {
        fprintf(stderr, "macro fuzz: %s\n", what);
        abort();
    }
}

// Expands into a buffer of exactly size bytes and checks what the call promises.
uint32_t ExpandInto(const std::string& urlTemplate, const KaMacroValues* values, uint32_t size) {
    std::vector<char> out(size == 0 ? 1 : size, 'G');
    uint32_t length = 0;
    const uint32_t result =
        kaExpandVASTMacros(urlTemplate.c_str(), values, out.data(), size, &length);
    if (result == KA_OK) {
        Check(length < size && out[length] == '\0' && strlen(out.data()) == length,
              "a result that fits is not terminated at its length");
    } else {
        Check(result == KA_ERR_BUFFER_TOO_SMALL, "unexpected result code");
        Check(length > size, "too small, yet the size reported fits");
        Check(size == 0 || out[0] == '\0', "a result that does not fit left text behind");
    }
    return result == KA_OK ? 0 : length;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 2) return 0;
    std::vector<std::string> parts(1);
    for (size_t i = 2; i < size; ++i) {
        if (data[i] == '\0') {
            parts.emplace_back();
        } else {
            parts.back().push_back(static_cast<char>(data[i]));
        }
    }
    KaMacroValues values = KA_MACRO_VALUES_INIT;
    if (parts.size() > 1) {
        memcpy(reinterpret_cast<char*>(&values) + 4, parts[1].data(),
               parts[1].size() < kNumbersEnd - 4 ? parts[1].size() : kNumbersEnd - 4);
    }
    for (size_t i = 2; i < parts.size() && i - 2 < kTextCount; ++i) {
        const char* text = parts[i].c_str();
        memcpy(reinterpret_cast<char*>(&values) + kNumbersEnd + (i - 2) * sizeof(text), &text,
               sizeof(text));
    }
    // 255: no record; 254: this version's; else a record cut short, possibly mid-field.
    values.size = data[0] == 254 ? sizeof(values) : data[0] * 2u;

    const KaMacroValues* given = data[0] == 255 ? nullptr : &values;
    const uint32_t needed = ExpandInto(parts[0], given, data[1]);
    // A retry with the size reported must fit (the cache buster keeps its eight digits).
    if (needed != 0)
        Check(ExpandInto(parts[0], given, needed) == 0, "the size reported does not fit");
    return 0;
}
