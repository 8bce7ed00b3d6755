/* The VMAP records and the API table as a C11 player compiles them, through the umbrella
 * header: the build fails when a field moves or changes width on LP64, and the C++ side of the
 * test compares its own layout with this one. */
#include <stddef.h>
#include <stdint.h>

#include "kaVMAPParser.h"
#include "vmap_layout_fields.h"

#if defined(__LP64__)
#define KA_CHECK_FIELD(T, f, off, size)                                     \
    _Static_assert(offsetof(T, f) == (off) && sizeof(((T*)0)->f) == (size), \
                   #T "." #f " moved or changed width");
#define KA_CHECK_SIZE(T, size) _Static_assert(sizeof(T) == (size), #T " changed size");
KA_VMAP_FIELDS(KA_CHECK_FIELD)
KA_VMAP_SIZES(KA_CHECK_SIZE)
#endif

_Static_assert(TIME_OFFSET_NONE == 0u && TIME_OFFSET_CLOCK == 1u && TIME_OFFSET_PERCENT == 2u &&
                   TIME_OFFSET_START_END == 3u && TIME_OFFSET_POSITION == 4u,
               "time offset kinds");
_Static_assert(BREAK_TYPE_LINEAR == 1u && BREAK_TYPE_NONLINEAR == 2u &&
                   BREAK_TYPE_COMPANION == 4u && BREAK_TYPE_SKIPPABLE == 8u &&
                   BREAK_TYPE_ADPODS == 16u,
               "break type flags");
_Static_assert(KA_PID_VMAP_CONTENT_URI == 0x44000001u && KA_PID_VMAP_VAST_ONLY == 0x44000002u &&
                   KA_PID_VMAP_MERGE_WRAPPERS == 0x44000003u &&
                   KA_PID_VMAP_STOP_FLAG == 0x44000004u,
               "parameter identifiers");
_Static_assert(sizeof(KA_BOOL) == 4, "KA_BOOL is 32 bits");

/* The entries are declared with the types a player calls them with: a mismatch is an
 * incompatible pointer assignment, which the build treats as an error. */
static uint32_t (*const kEntry)(VMAPParserAPI*) = kaGetVMAPParserAPI;
static uintptr_t (*const kAdapter)(void) = kaGetVMAPParserAPIAdapter;

#define KA_MEASURE_FIELD(T, f, off, size) {#T "." #f, offsetof(T, f), sizeof(((T*)0)->f)},
#define KA_MEASURE_SIZE(T, size) sizeof(T),

static const KaVmapFieldLayout kFields[] = {KA_VMAP_FIELDS(KA_MEASURE_FIELD)};
static const unsigned long kSizes[] = {KA_VMAP_SIZES(KA_MEASURE_SIZE)};
static const unsigned long kConstants[] = {
    TIME_OFFSET_NONE,           TIME_OFFSET_CLOCK,        TIME_OFFSET_PERCENT,
    TIME_OFFSET_START_END,      TIME_OFFSET_POSITION,     BREAK_TYPE_LINEAR,
    BREAK_TYPE_NONLINEAR,       BREAK_TYPE_COMPANION,     BREAK_TYPE_SKIPPABLE,
    BREAK_TYPE_ADPODS,          KA_PID_VMAP_CONTENT_URI,  KA_PID_VMAP_VAST_ONLY,
    KA_PID_VMAP_MERGE_WRAPPERS, KA_PID_VMAP_STOP_FLAG,    KA_ERR_NULL_ARGUMENT,
    KA_ERR_LOAD_FAILED,         KA_ERR_MODULE_NOT_LOADED,
};

const KaVmapFieldLayout* ka_vmap_layout_c(unsigned long* count) {
    (void)kEntry;
    (void)kAdapter;
    *count = sizeof(kFields) / sizeof(kFields[0]);
    return kFields;
}

const unsigned long* ka_vmap_sizes_c(unsigned long* count) {
    *count = sizeof(kSizes) / sizeof(kSizes[0]);
    return kSizes;
}

const unsigned long* ka_vmap_constants_c(unsigned long* count) {
    *count = sizeof(kConstants) / sizeof(kConstants[0]);
    return kConstants;
}
