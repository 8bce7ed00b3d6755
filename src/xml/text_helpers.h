// Turning raw element texts into stored values: CDATA unwrapping, "&amp;" decoding and the
// "hh:mm:ss.mmm" clock times of VMAP and VAST.
#pragma once

#include <cstddef>

// Copies the trimmed content of a raw "![CDATA[...]]" section into dst (size bytes, always
// terminated); 0 when the whole content fit, 0x91001000 otherwise or for a null source.
unsigned int parse_cdata(char* dst, const char* src, int size);
// Turns every "&amp;" into "&" in place, each occurrence once; always 0.
int unescape_amp(char* text);
// Milliseconds of a clock time "%02d:%02d:%02d.%03d"; fields not reached count 0.
unsigned int string2time(const char* text, int length);

namespace ka {

// Where the trimmed content of a complete raw "![CDATA[...]]" section of length bytes begins and
// how long it is; false (outputs untouched) when text is not such a section.
bool CDataContent(const char* text, size_t length, size_t* begin, size_t* count);
// One "%Nd" conversion of sscanf with width N at *cursor: white space skipped, a sign and then
// digits, N characters at most after the white space. Advances *cursor and writes *value only
// when it succeeds.
bool ScanDecimal(const char** cursor, int width, long long* value);

}  // namespace ka
