// Character-level helpers of both parsers: white space, tag names, CDATA sections, "&amp;"
// decoding, decimal numbers, "hh:mm:ss.mmm" clock times and string copies. Nothing here knows
// the XML module; reading an element's text or attributes is CXMLDocument's.
#pragma once

#include <cstddef>
#include <cstring>
#include <string>

#include "xml_parser_api.h"

// Copies the trimmed content of a raw "![CDATA[...]]" section into dst (size bytes, always
// terminated); 0 when the whole content fit, 0x91001000 otherwise or for a null source.
unsigned int parse_cdata(char* dst, const char* src, int size);
// Turns every "&amp;" into "&" in place, each occurrence once; always 0.
int unescape_amp(char* text);
// Milliseconds of a clock time "%02d:%02d:%02d.%03d"; fields not reached count 0.
unsigned int string2time(const char* text, int length);

namespace ka {

// The six white-space characters of C's "C" locale, the same the XML module trims; bytes at or
// above 0x80 are never white space, whatever the locale says.
inline bool IsSpace(char c) { return IsXmlSpace(c); }

// Exact, case-sensitive comparison of a tag name of the given length with a literal. Inline, so
// that the literal's length is known where it is called: every handler tries several names.
inline bool NameIs(const char* name, unsigned int length, const char* literal) {
    if (name == nullptr) return false;
    const size_t n = std::char_traits<char>::length(literal);
    return length == n && memcmp(name, literal, n) == 0;
}

// True when text begins with the "![CDATA[" opening, whether or not the section closes. Inline:
// every element text is tested, and most fail at the first character.
inline bool IsCDataSection(const char* text) {
    return text[0] == kXmlCDataOpen[0] && strncmp(text, kXmlCDataOpen, kXmlCDataOpenLength) == 0;
}
// The same for a text whose length is known: one comparison of the opening's eight bytes,
// without a call.
inline bool IsCDataSection(const char* text, size_t length) {
    return length >= kXmlCDataOpenLength && memcmp(text, kXmlCDataOpen, kXmlCDataOpenLength) == 0;
}
// Where the trimmed content of a complete raw "![CDATA[...]]" section of length bytes begins and
// how long it is; false (outputs untouched) when text is not such a section.
bool CDataContent(const char* text, size_t length, size_t* begin, size_t* count);

// One "%Nd" conversion of sscanf with width N at *cursor: white space skipped, a sign and then
// digits, N characters at most after the white space. The magnitude stops growing past
// INT_MAX + 1, so any width is safe. Advances *cursor and writes *value only when it succeeds.
bool ScanDecimal(const char** cursor, int width, long long* value);
// atoi's reading (leading white space, a sign, digits up to the first other character, 0
// without digits), clamped to the int range instead of overflowing.
int ParseDecimal(const char* text);
// The value of a decimal digit, or a number above 9 for any other character.
inline unsigned int DigitValue(char c) {
    return static_cast<unsigned int>(static_cast<unsigned char>(c)) -
           static_cast<unsigned int>('0');
}
// What atoi gives, without the locale machinery of strtol: the number read as strtol reads it
// into a long (clamped to the long range), then taken as an int (its low 32 bits).
int Atoi(const char* text);
// Atoi of a terminated text of the given length. Attribute numbers are mostly a few digits and
// nothing else: those are read here directly, anything else goes to Atoi.
inline int Atoi(const char* text, int length) {
    if (length < 1 || length > 9) return Atoi(text);
    int value = 0;
    for (int i = 0; i < length; ++i) {
        const unsigned int digit = DigitValue(text[i]);
        if (digit > 9) return Atoi(text);
        value = value * 10 + static_cast<int>(digit);
    }
    return value;
}

// Copies the first length characters of text into out (room for length + 1), turning every
// "&amp;" into "&" as unescape_amp does, and terminates it; the length written.
size_t CopyDecodingAmp(char* out, const char* text, size_t length);
// The bytes a copy of text takes (ka::Arena::CopyString); 0 for null.
inline size_t CopySize(const char* text) { return text == nullptr ? 0 : strlen(text) + 1; }

}  // namespace ka
