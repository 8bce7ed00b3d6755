/* The VAST records as a C11 player compiles them: the build fails when a field moves or changes
 * width on LP64, and the C++ side of the test compares its own layout with this one. */
#include <stddef.h>

#include "ka/vast_records.h"
#include "vast_layout_fields.h"

#if defined(__LP64__)
#define KA_CHECK_FIELD(T, f, off, size)                                     \
    _Static_assert(offsetof(T, f) == (off) && sizeof(((T*)0)->f) == (size), \
                   #T "." #f " moved or changed width");
#define KA_CHECK_SIZE(T, size) _Static_assert(sizeof(T) == (size), #T " changed size");
KA_VAST_FIELDS(KA_CHECK_FIELD)
KA_VAST_SIZES(KA_CHECK_SIZE)
#endif

/* Every field is also reachable under its C name, and the constants are plain C. */
_Static_assert(AD_TYPE_INLINE == 1u && AD_TYPE_WRAPPER == 2u, "ad types");
_Static_assert(AD_CREATIVE_LINEAR == 1u && AD_DELIVERY_STREAMING == 1u, "creative constants");
_Static_assert(AD_OFFSET_TIME == 1u && AD_OFFSET_PERCENT == 2u, "offset kinds");
_Static_assert(KA_PID_VAST_EXTENSION_PARSER == 0x45000001u, "extension parser id");
_Static_assert(sizeof(CVASTParser*) == sizeof(void*), "opaque pointers are pointer-sized");

#define KA_MEASURE_FIELD(T, f, off, size) {#T "." #f, offsetof(T, f), sizeof(((T*)0)->f)},
#define KA_MEASURE_SIZE(T, size) sizeof(T),

static const KaVastFieldLayout kFields[] = {KA_VAST_FIELDS(KA_MEASURE_FIELD)};
static const unsigned long kSizes[] = {KA_VAST_SIZES(KA_MEASURE_SIZE)};

const KaVastFieldLayout* ka_vast_layout_c(unsigned long* count) {
    *count = sizeof(kFields) / sizeof(kFields[0]);
    return kFields;
}

const unsigned long* ka_vast_sizes_c(unsigned long* count) {
    *count = sizeof(kSizes) / sizeof(kSizes[0]);
    return kSizes;
}
