// The text helpers the parsers apply to element texts. The first byte sets the destination size
// of parse_cdata (1 to 256 bytes, an exact heap buffer); the rest, up to its first NUL, is the
// text. unescape_amp is checked against a plain left-to-right replacement.
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "xml/text.h"

namespace {

// "&amp;" becomes "&" once per occurrence, scanning on after the replaced entity.
std::string DecodeAmp(const std::string& text) {
    std::string out;
    for (size_t i = 0; i < text.size();) {
        if (text.compare(i, 5, "&amp;") == 0) {
            out.push_back('&');
            i += 5;
        } else {
            out.push_back(text[i++]);
        }
    }
    return out;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    const int room = data[0] + 1;
    const std::string text(reinterpret_cast<const char*>(data + 1),
                           strnlen(reinterpret_cast<const char*>(data + 1), size - 1));

    char* dst = new char[room];
    memset(dst, 'x', room);
    parse_cdata(dst, text.c_str(), room);
    if (memchr(dst, '\0', room) == nullptr) {
        fprintf(stderr, "text fuzz: parse_cdata left its output unterminated\n");
        abort();
    }
    delete[] dst;

    char* copy = new char[text.size() + 1];
    memcpy(copy, text.c_str(), text.size() + 1);
    unescape_amp(copy);
    if (DecodeAmp(text) != copy) {
        fprintf(stderr, "text fuzz: unescape_amp differs from the plain replacement\n");
        abort();
    }
    delete[] copy;

    volatile unsigned int sink = string2time(text.c_str(), static_cast<int>(text.size()));
    sink = sink + string2time(text.c_str(), 0);
    (void)sink;
    return 0;
}
