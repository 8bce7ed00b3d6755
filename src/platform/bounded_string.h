// Bounded copies into the fixed character arrays of the loader records: the result is always
// terminated and never runs past the array, whatever the caller passes. A string that does not
// fit is reported, never used cut short: a cut path or module name names some other file.
#pragma once

#include <cstddef>
#include <cstring>

namespace ka {

// Copies src into dst (size bytes); a null src gives the empty string. False, with dst holding
// "", when src does not fit whole.
[[nodiscard]] inline bool CopyBounded(char* dst, size_t size, const char* src) {
    if (size == 0) return false;
    if (src == nullptr) src = "";
    const size_t n = strnlen(src, size);
    if (n == size) {
        dst[0] = '\0';
        return false;
    }
    memcpy(dst, src, n + 1);
    return true;
}

// Appends src to the string in dst (size bytes). False, with dst left as it was, when the whole
// of src does not fit behind it.
[[nodiscard]] inline bool AppendBounded(char* dst, size_t size, const char* src) {
    const size_t used = strnlen(dst, size);
    if (used == size) return false;
    if (src == nullptr) return true;
    if (strnlen(src, size - used) == size - used) return false;
    return CopyBounded(dst + used, size - used, src);
}

}  // namespace ka
