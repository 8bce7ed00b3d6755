#include "vmap/vmap_values.h"

#include <cstring>

#include "ka/vmap_records.h"
#include "xml/text.h"

namespace ka {

namespace {

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

// Letters of words; bytes of multi-byte characters count as letters, so "linear\xc3\xa9" is
// one unknown word rather than "linear".
bool IsWordByte(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') ||
           static_cast<unsigned char>(c) >= 0x80;
}

struct BreakWord {
    const char* word;
    uint32_t flag;
};

const BreakWord kBreakWords[] = {
    {"linear", BREAK_TYPE_LINEAR},       {"nonlinear", BREAK_TYPE_NONLINEAR},
    {"Companion", BREAK_TYPE_COMPANION}, {"Skippable", BREAK_TYPE_SKIPPABLE},
    {"AdPods", BREAK_TYPE_ADPODS},
};

uint32_t FlagOfWord(const char* word, size_t length) {
    for (const BreakWord& entry : kBreakWords) {
        if (strlen(entry.word) == length && memcmp(entry.word, word, length) == 0) {
            return entry.flag;
        }
    }
    return 0;
}

// Clock times have exactly these lengths: "hh:mm:ss" and "hh:mm:ss.mmm".
bool IsClockLength(int length) { return length == 8 || length == 12; }

// VMAP's own percentage notation: digits, then "%" as the last character.
bool IsTrailingPercent(const char* value, int length) {
    if (length < 2 || value[length - 1] != '%') return false;
    for (int i = 0; i < length - 1; ++i) {
        if (!IsDigit(value[i])) return false;
    }
    return true;
}

bool Equals(const char* value, int length, const char* word) {
    return static_cast<size_t>(length) == strlen(word) && memcmp(value, word, length) == 0;
}

}  // namespace

uint32_t ParseBreakType(const char* value, int length) {
    if (value == nullptr) return 0;
    uint32_t flags = 0;
    int start = 0;
    for (int i = 0; i <= length; ++i) {
        if (i < length && IsWordByte(value[i])) continue;
        if (i > start) flags |= FlagOfWord(value + start, i - start);
        start = i + 1;
    }
    return flags;
}

bool ParseTimeOffset(const char* value, int length, uint32_t* type, int64_t* offset) {
    if (value == nullptr || length < 1) return false;
    if (memchr(value, ':', length) != nullptr) {
        if (IsClockLength(length)) {
            *type = TIME_OFFSET_CLOCK;
            *offset = string2time(value, length);
        } else {
            *type = TIME_OFFSET_NONE;
            *offset = 0;
        }
        return true;
    }
    if (value[0] == '%') {
        *type = TIME_OFFSET_PERCENT;
        *offset = ParseDecimal(value + 1);
        return true;
    }
    if (IsTrailingPercent(value, length)) {
        *type = TIME_OFFSET_PERCENT;
        *offset = ParseDecimal(value);
        return true;
    }
    if (Equals(value, length, "start") || Equals(value, length, "end")) {
        *type = TIME_OFFSET_START_END;
        *offset = value[0] == 'e' ? 1 : 0;
        return true;
    }
    if (value[0] == '#') {
        int position = ParseDecimal(value + 1);
        *type = TIME_OFFSET_POSITION;
        *offset = position < 1 ? 1 : position;
        return true;
    }
    return false;
}

uint64_t ParseRepeatAfter(const char* value, int length) {
    if (value == nullptr || !IsClockLength(length)) return 0;
    return string2time(value, length);
}

}  // namespace ka
