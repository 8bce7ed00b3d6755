#include "xml/text_helpers.h"

#include <cstdio>
#include <cstring>

#include "ka/result_codes.h"

namespace {

constexpr char kCDataOpen[] = "![CDATA[";
constexpr size_t kCDataOpenLength = sizeof(kCDataOpen) - 1;
constexpr char kCDataClose[] = "]]";
constexpr size_t kCDataCloseLength = sizeof(kCDataClose) - 1;

constexpr char kAmpEntity[] = "&amp;";
constexpr size_t kAmpEntityLength = sizeof(kAmpEntity) - 1;

// Bytes at or above 0x80 are never white space, whatever the locale says.
bool IsSpace(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

}  // namespace

unsigned int parse_cdata(char* dst, const char* src, int size) {
    // A destination without room for the terminator cannot be written at all.
    if (src == nullptr || dst == nullptr || size <= 0) return KA_ERR_LOAD_FAILED;
    const size_t room = static_cast<size_t>(size) - 1;
    const size_t length = strlen(src);

    // The opening ends in '[' and the closing holds none, so the two never overlap.
    const bool isSection = length >= kCDataOpenLength + kCDataCloseLength &&
                           strncmp(src, kCDataOpen, kCDataOpenLength) == 0 &&
                           strcmp(src + length - kCDataCloseLength, kCDataClose) == 0;
    if (!isSection) {
        strncpy(dst, src, room);
        dst[room] = '\0';
        return KA_ERR_LOAD_FAILED;
    }

    size_t begin = kCDataOpenLength;
    size_t end = length - kCDataCloseLength;
    while (begin < end && IsSpace(src[begin])) ++begin;
    while (end > begin && IsSpace(src[end - 1])) --end;
    const size_t content = end - begin;
    if (content <= room) {
        memcpy(dst, src + begin, content);
        dst[content] = '\0';
        return KA_OK;
    }
    memcpy(dst, src + begin, room);
    dst[room] = '\0';
    return KA_ERR_LOAD_FAILED;
}

// One pass with a read and a write cursor: the same result as decoding each occurrence in place
// from left to right, without moving the tail once per occurrence.
int unescape_amp(char* text) {
    if (text == nullptr) return 0;
    const size_t length = strlen(text);
    if (length < kAmpEntityLength) return 0;

    size_t write = 0;
    size_t read = 0;
    while (read < length) {
        if (text[read] == '&' && length - read >= kAmpEntityLength &&
            memcmp(text + read, kAmpEntity, kAmpEntityLength) == 0) {
            text[write++] = '&';
            read += kAmpEntityLength;
        } else {
            text[write++] = text[read++];
        }
    }
    text[write] = '\0';
    return 0;
}

unsigned int string2time(const char* text, int length) {
    if (text == nullptr || length < 1) return 0;
    int hours = 0;
    int minutes = 0;
    int seconds = 0;
    int milliseconds = 0;
    sscanf(text, "%02d:%02d:%02d.%03d", &hours, &minutes, &seconds, &milliseconds);
    // Unsigned arithmetic: wraps like the 32-bit result it is, whatever the signs.
    return ((static_cast<unsigned int>(hours) * 3600u + static_cast<unsigned int>(minutes) * 60u) +
            static_cast<unsigned int>(seconds)) *
               1000u +
           static_cast<unsigned int>(milliseconds);
}
