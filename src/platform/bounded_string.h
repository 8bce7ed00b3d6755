// Bounded copies into the fixed character arrays of the loader records: the result is always
// terminated and never runs past the array, whatever the caller passes.
#pragma once

#include <cstddef>
#include <cstring>

namespace ka {

// Copies src into dst (size bytes); a null src gives the empty string.
inline void CopyBounded(char* dst, size_t size, const char* src) {
    if (size == 0) return;
    size_t n = src == nullptr ? 0 : strnlen(src, size - 1);
    memcpy(dst, src == nullptr ? "" : src, n);
    dst[n] = '\0';
}

// Appends src to the string in dst (size bytes), cutting what does not fit.
inline void AppendBounded(char* dst, size_t size, const char* src) {
    size_t used = strnlen(dst, size);
    if (used + 1 >= size || src == nullptr) return;
    CopyBounded(dst + used, size - used, src);
}

}  // namespace ka
