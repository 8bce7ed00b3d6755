#include "xml/text.h"

#include <climits>
#include <cstdint>
#include <cstring>

#include "ka/result_codes.h"
#include "xml_parser_api.h"

namespace {

constexpr char kAmpEntity[] = "&amp;";
constexpr size_t kAmpEntityLength = sizeof(kAmpEntity) - 1;

#if __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
// Flags the bytes of a little-endian word that are '&' (their top bit); the lowest byte flagged
// is the first '&', as borrows only flag bytes above it.
uint64_t AmpBytes(uint64_t word) {
    constexpr uint64_t kOnes = 0x0101010101010101ull;
    const uint64_t x = word ^ (kOnes * '&');
    return (x - kOnes) & ~x & (kOnes << 7);
}
#endif

// Copies the bytes from read on that come before the next '&' in whole blocks and words, and
// says how many it copied: texts are mostly URLs of a few dozen bytes with one or two entities,
// where a call per block costs more than the block. What it leaves starts at the '&', or is a
// run of under eight bytes. Decoding only shrinks, so a block written never passes the end of
// the copy while one is read.
size_t CopyToAmp(char* write, const char* read, const char* end) {
    const char* const start = read;
#if __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
    // Sixteen bytes at a time in the vector unit of every 64-bit target (SSE2, NEON): a byte
    // equal to '&' turns into 0xff, and the lowest one set in either half is the first '&'.
    typedef unsigned char Block __attribute__((vector_size(16)));
    while (end - read >= 16) {
        Block block;
        memcpy(&block, read, sizeof(block));
        memcpy(write, &block, sizeof(block));
        const auto hits = block == '&';
        uint64_t halves[2];
        memcpy(halves, &hits, sizeof(halves));
        if ((halves[0] | halves[1]) != 0) {
            const size_t before = halves[0] != 0 ? __builtin_ctzll(halves[0]) / 8
                                                 : 8 + __builtin_ctzll(halves[1]) / 8;
            return static_cast<size_t>(read - start) + before;
        }
        read += 16;
        write += 16;
    }
    // Then a word.
    if (end - read >= 8) {
        uint64_t word;
        memcpy(&word, read, sizeof(word));
        memcpy(write, &word, sizeof(word));
        const uint64_t amps = AmpBytes(word);
        if (amps != 0) return static_cast<size_t>(read - start) + __builtin_ctzll(amps) / 8;
        read += 8;
        write += 8;
    }
    // The last few bytes as the word that ends with them, when that word lies within this run:
    // its first bytes were copied already and hold no '&', so rewriting them changes nothing
    // and whatever is flagged is one of the last bytes.
    const size_t left = static_cast<size_t>(end - read);
    if (left > 0 && end - start >= 8) {
        uint64_t word;
        memcpy(&word, end - 8, sizeof(word));
        memcpy(write + left - 8, &word, sizeof(word));
        const uint64_t amps = AmpBytes(word);
        const size_t at = amps != 0 ? __builtin_ctzll(amps) / 8 : 8;
        return static_cast<size_t>(read - start) + at - (8 - left);
    }
#else
    (void)write;
    (void)end;
#endif
    return static_cast<size_t>(read - start);
}

// Past this a decimal magnitude stops growing: it already clamps to either end of int.
constexpr long long kDecimalCeiling = static_cast<long long>(INT_MAX) + 1;

// ScanDecimal's reading, inlined where string2time reads its four fields.
__attribute__((always_inline)) inline bool ScanDecimalInline(const char** cursor, int width,
                                                             long long* value) {
    const char* p = *cursor;
    while (ka::IsSpace(*p)) ++p;
    int left = width;
    bool negative = false;
    if (*p == '+' || *p == '-') {
        negative = *p == '-';
        ++p;
        --left;
    }
    long long result = 0;
    int digits = 0;
    while (left > 0 && *p >= '0' && *p <= '9') {
        result = result * 10 + (*p - '0');
        if (result > kDecimalCeiling) result = kDecimalCeiling;
        ++p;
        --left;
        ++digits;
    }
    if (digits == 0) return false;
    *value = negative ? -result : result;
    *cursor = p;
    return true;
}

}  // namespace

namespace ka {

bool CDataContent(const char* text, size_t length, size_t* begin, size_t* count) {
    // The opening ends in '[' and the closing holds none, so the two never overlap.
    if (length < kXmlCDataOpenLength + kXmlCDataCloseLength ||
        memcmp(text, kXmlCDataOpen, kXmlCDataOpenLength) != 0 ||
        memcmp(text + length - kXmlCDataCloseLength, kXmlCDataClose, kXmlCDataCloseLength) != 0) {
        return false;
    }
    size_t first = kXmlCDataOpenLength;
    size_t end = length - kXmlCDataCloseLength;
    while (first < end && IsSpace(text[first])) ++first;
    while (end > first && IsSpace(text[end - 1])) --end;
    *begin = first;
    *count = end - first;
    return true;
}

bool ScanDecimal(const char** cursor, int width, long long* value) {
    return ScanDecimalInline(cursor, width, value);
}

int ParseDecimal(const char* text) {
    if (text == nullptr) return 0;
    long long value = 0;
    if (!ScanDecimal(&text, INT_MAX, &value)) return 0;
    if (value > INT_MAX) return INT_MAX;
    if (value < INT_MIN) return INT_MIN;
    return static_cast<int>(value);
}

int Atoi(const char* text) {
    const char* p = text;
    while (IsSpace(*p)) ++p;
    bool negative = false;
    if (*p == '+' || *p == '-') {
        negative = *p == '-';
        ++p;
    }
    // strtol stops growing the magnitude at the end of the long range and answers that end.
    const unsigned long limit = negative ? static_cast<unsigned long>(LONG_MAX) + 1 : LONG_MAX;
    // Below this, another digit cannot pass the limit: the common case needs no test.
    constexpr unsigned long kSafe = LONG_MAX / 10 - 1;
    unsigned long magnitude = 0;
    for (; *p >= '0' && *p <= '9'; ++p) {
        const unsigned long digit = static_cast<unsigned long>(*p - '0');
        if (magnitude < kSafe) {
            magnitude = magnitude * 10 + digit;
        } else {
            magnitude = magnitude > (limit - digit) / 10 ? limit : magnitude * 10 + digit;
        }
    }
    const unsigned long bits = negative ? 0 - magnitude : magnitude;
    // The low 32 bits as a signed int: what converting strtol's long to int gives.
    return static_cast<int>(static_cast<uint32_t>(bits));
}

size_t CopyDecodingAmp(char* out, const char* text, size_t length) {
    char* write = out;
    const char* read = text;
    const char* end = text + length;
    for (;;) {
        const size_t plain = CopyToAmp(write, read, end);
        read += plain;
        write += plain;
        while (read < end && *read != '&') *write++ = *read++;
        if (read == end) break;
        *write++ = '&';
        const bool entity = static_cast<size_t>(end - read) >= kAmpEntityLength &&
                            memcmp(read, kAmpEntity, kAmpEntityLength) == 0;
        read += entity ? kAmpEntityLength : 1;
    }
    *write = '\0';
    return static_cast<size_t>(write - out);
}

}  // namespace ka

unsigned int parse_cdata(char* dst, const char* src, int size) {
    // A destination without room for the terminator cannot be written at all.
    if (src == nullptr || dst == nullptr || size <= 0) return KA_ERR_LOAD_FAILED;
    const size_t room = static_cast<size_t>(size) - 1;
    const size_t length = strlen(src);

    size_t begin = 0;
    size_t content = 0;
    if (!ka::CDataContent(src, length, &begin, &content)) {
        strncpy(dst, src, room);
        dst[room] = '\0';
        return KA_ERR_LOAD_FAILED;
    }
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
// from left to right, without moving the tail once per occurrence. Most texts hold no "&amp;" at
// all and are left after one search.
int unescape_amp(char* text) {
    if (text == nullptr) return 0;
    char* read = strstr(text, kAmpEntity);
    if (read == nullptr) return 0;
    char* write = read;
    while (read != nullptr) {
        *write++ = '&';
        read += kAmpEntityLength;
        // Everything up to the next entity moves down as one block.
        char* next = strstr(read, kAmpEntity);
        const size_t block = next != nullptr ? static_cast<size_t>(next - read) : strlen(read);
        memmove(write, read, block);
        write += block;
        read = next;
    }
    *write = '\0';
    return 0;
}

namespace {

// "dd" at text as a number; false, having read nothing past a non-digit, for anything else.
bool TwoDigits(const char* text, unsigned int* value) {
    const unsigned int high = ka::DigitValue(text[0]);
    if (high > 9) return false;
    const unsigned int low = ka::DigitValue(text[1]);
    if (low > 9) return false;
    *value = high * 10 + low;
    return true;
}

}  // namespace

unsigned int string2time(const char* text, int length) {
    if (text == nullptr || length < 1) return 0;
    // "hh:mm:ss" and "hh:mm:ss.mmm", what nearly every document writes, are read directly, a
    // character at a time so that nothing past the terminator is read; the general reading below
    // gives the same for them, whatever follows.
    unsigned int hh = 0, mm = 0, ss = 0, msHigh = 0;
    if (TwoDigits(text, &hh) && text[2] == ':' && TwoDigits(text + 3, &mm) && text[5] == ':' &&
        TwoDigits(text + 6, &ss)) {
        const unsigned int whole = (hh * 3600u + mm * 60u + ss) * 1000u;
        if (text[8] != '.') return whole;
        // Milliseconds: exactly three digits here; any other form goes the general way.
        if (TwoDigits(text + 9, &msHigh) && ka::DigitValue(text[11]) <= 9) {
            return whole + msHigh * 10u + ka::DigitValue(text[11]);
        }
    }
    // sscanf(text, "%02d:%02d:%02d.%03d") without the cost of the format machinery: each field
    // is read only when everything before it matched.
    long long fields[4] = {0, 0, 0, 0};
    const int widths[4] = {2, 2, 2, 3};
    const char separators[4] = {':', ':', '.', '\0'};
    const char* cursor = text;
    for (int i = 0; i < 4; ++i) {
        if (!ScanDecimalInline(&cursor, widths[i], &fields[i])) break;
        if (separators[i] == '\0' || *cursor != separators[i]) break;
        ++cursor;
    }
    // Unsigned arithmetic: wraps like the 32-bit result it is, whatever the signs.
    const unsigned int hours = static_cast<unsigned int>(static_cast<int>(fields[0]));
    const unsigned int minutes = static_cast<unsigned int>(static_cast<int>(fields[1]));
    const unsigned int seconds = static_cast<unsigned int>(static_cast<int>(fields[2]));
    const unsigned int milliseconds = static_cast<unsigned int>(static_cast<int>(fields[3]));
    return ((hours * 3600u + minutes * 60u) + seconds) * 1000u + milliseconds;
}
