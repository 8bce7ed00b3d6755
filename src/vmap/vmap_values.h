// Turning the attribute values of a VMAP document into record fields: break type flags, the
// kinds of time offset and repeat intervals. Decimal numbers are read by ParseDecimal
// ("xml/text.h").
#pragma once

#include <cstdint>

namespace ka {

// BREAK_TYPE_* flags for the whole words of value, where any character that is not a letter
// (ASCII letters and bytes of multi-byte characters) separates words; case-sensitive.
uint32_t ParseBreakType(const char* value, int length);

// Reads a timeOffset value into its TIME_OFFSET_* kind and value. Returns false and leaves
// both untouched for a value of no known form.
bool ParseTimeOffset(const char* value, int length, uint32_t* type, int64_t* offset);

// Milliseconds of a repeatAfter clock time ("hh:mm:ss" or "hh:mm:ss.mmm"); 0 for other lengths.
uint64_t ParseRepeatAfter(const char* value, int length);

}  // namespace ka
