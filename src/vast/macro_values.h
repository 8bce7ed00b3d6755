// The VAST macros the player's values fill, and how each value is spelled before it is
// URL-encoded into the expanded URL.
#pragma once

#include <cstddef>
#include <cstdint>

#include "ka/vmap_parser_ext.h"

namespace ka {

// Longest macro name, brackets excluded ("BLOCKEDADCATEGORIES", "VERIFICATIONVENDORS").
constexpr size_t kMacroNameMax = 19;
// Room for the longest value spelled from numbers: a timestamp or a clock time of an int64.
constexpr size_t kMacroNumberSize = 64;

// One value to substitute: text of length size, borrowed from the player's record or from
// number, which holds what was spelled from numbers.
struct MacroValue {
    const char* text = nullptr;
    size_t size = 0;
    char number[kMacroNumberSize] = {};
};

// What a call spells fresh: the same for every macro of one URL.
struct MacroCall {
    uint32_t cacheBusting;  // eight digits
    int64_t nowMs;          // wall clock, ms since 1970 UTC
};

// Fills *value for the macro name (length size, brackets excluded) and returns true, or false
// when name is no VAST macro. values may be null.
bool LookUpMacro(const char* name, size_t size, const KaMacroValues* values, const MacroCall& call,
                 MacroValue* value);

}  // namespace ka
