// kaExpandVASTMacros: one pass over the template that writes while the result fits and counts
// on when it does not, so the call allocates nothing and reports the size a retry needs.
#include <cstdint>
#include <cstring>
#include <ctime>

#include "ka/result_codes.h"
#include "ka/vmap_parser_ext.h"
#include "vast/macro_values.h"

namespace ka {
namespace {

// The expanded URL: bytes go to out while they fit with the terminator; size counts them all,
// saturating, so that no template can wrap it.
class Sink {
public:
    Sink(char* out, uint32_t room) : mOut(out), mRoom(room) {}

    void Put(const char* bytes, size_t count) {
        if (Fits(count)) memcpy(mOut + mSize, bytes, count);
        mSize = count > SIZE_MAX - mSize ? SIZE_MAX : mSize + count;
    }
    // RFC 3986: all but the unreserved characters as %XX, a multi-byte character byte by byte.
    void PutEncoded(const char* text, size_t count) {
        static const char kHex[] = "0123456789ABCDEF";
        for (size_t i = 0; i < count; ++i) {
            const unsigned char c = static_cast<unsigned char>(text[i]);
            if (Unreserved(c)) {
                Put(text + i, 1);
            } else {
                const char escaped[3] = {'%', kHex[c >> 4], kHex[c & 15]};
                Put(escaped, 3);
            }
        }
    }
    // Terminates a result that fits; else wipes what was written, so that no cut-short URL is
    // left behind.
    bool Finish() {
        if (Fits(0)) {
            mOut[mSize] = '\0';
            return true;
        }
        memset(mOut, 0, mSize < mRoom ? mSize : mRoom);
        return false;
    }
    size_t size() const { return mSize; }

private:
    bool Fits(size_t count) const { return mSize < mRoom && count < mRoom - mSize; }
    static bool Unreserved(unsigned char c) {
        return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
               c == '-' || c == '.' || c == '_' || c == '~';
    }

    char* mOut;
    size_t mRoom;
    size_t mSize = 0;
};

bool IsNameChar(char c) { return c >= 'A' && c <= 'Z'; }

// True when text starts with "%5B" or "%5D" (hex digits of either case), for open or close.
bool PercentBracket(const char* text, bool open) {
    return text[0] == '%' && text[1] == '5' &&
           (text[2] == (open ? 'B' : 'D') || text[2] == (open ? 'b' : 'd'));
}

// The length of the macro name at text ending in the closing bracket, whose length goes to
// *closeSize; 0 when no whole name ends there. Reads at most the longest name and its bracket.
size_t NameAt(const char* text, bool percent, size_t* closeSize) {
    size_t n = 0;
    while (n <= kMacroNameMax && IsNameChar(text[n])) ++n;
    if (n == 0 || n > kMacroNameMax) return 0;
    if (!percent && text[n] == ']') {
        *closeSize = 1;
        return n;
    }
    if (percent && PercentBracket(text + n, false)) {
        *closeSize = 3;
        return n;
    }
    return 0;
}

int64_t NowMs() {
    timespec now = {};
    clock_gettime(CLOCK_REALTIME, &now);
    return int64_t{now.tv_sec} * 1000 + now.tv_nsec / 1000000;
}

// Eight random digits, never the same twice in a row on one thread. Not for secrets: a cache
// buster only has to differ between pings.
uint32_t CacheBusting() {
    thread_local uint64_t state = 0;
    thread_local uint32_t last = 0;
    if (state == 0) {
        timespec a = {}, b = {};
        clock_gettime(CLOCK_REALTIME, &a);
        clock_gettime(CLOCK_MONOTONIC, &b);
        state = (uint64_t(a.tv_sec) << 32) ^ uint64_t(a.tv_nsec) ^ (uint64_t(b.tv_nsec) << 20) ^
                reinterpret_cast<uintptr_t>(&last);
    }
    uint32_t digits = last;
    while (digits == last) {
        // splitmix64
        uint64_t z = (state += 0x9E3779B97F4A7C15ull);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
        z ^= z >> 31;
        digits = 10000000u + static_cast<uint32_t>(z % 90000000u);
    }
    return last = digits;
}

uint32_t Expand(const char* urlTemplate, const KaMacroValues* values, char* out, uint32_t outSize,
                uint32_t* outLength) {
    const MacroCall call = {CacheBusting(), NowMs()};
    Sink sink(out, outSize);
    const char* p = urlTemplate;
    while (*p != '\0') {
        const bool bracket = *p == '[';
        const bool percent = !bracket && PercentBracket(p, true);
        size_t open = bracket ? 1 : percent ? 3 : 0, close = 0, name = 0;
        MacroValue value;
        if (open > 0 && (name = NameAt(p + open, percent, &close)) > 0 &&
            LookUpMacro(p + open, name, values, call, &value)) {
            sink.PutEncoded(value.text, value.size);
            p += open + name + close;
            continue;
        }
        // Not a macro: copy up to the next place one may start.
        const char* next = p + 1;
        while (*next != '\0' && *next != '[' && *next != '%') ++next;
        sink.Put(p, static_cast<size_t>(next - p));
        p = next;
    }
    const bool fits = sink.Finish();
    if (outLength != nullptr) {
        const size_t reported = fits ? sink.size() : sink.size() + 1;
        *outLength = reported >= UINT32_MAX || sink.size() == SIZE_MAX
                         ? UINT32_MAX
                         : static_cast<uint32_t>(reported);
    }
    return fits ? KA_OK : KA_ERR_BUFFER_TOO_SMALL;
}

}  // namespace
}  // namespace ka

uint32_t kaExpandVASTMacros(const char* urlTemplate, const KaMacroValues* values, char* out,
                            uint32_t outSize, uint32_t* outLength) {
    if (urlTemplate == nullptr || out == nullptr) return KA_ERR_NULL_ARGUMENT;
    try {
        return ka::Expand(urlTemplate, values, out, outSize, outLength);
    } catch (...) {
        // Nothing here throws; a C caller must not see an exception even so.
        return KA_ERR_INTERNAL;
    }
}
