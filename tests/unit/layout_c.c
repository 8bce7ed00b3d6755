/* The public records, constants and API table as a C11 player compiles them through the
 * umbrella header: the build fails when a field moves or changes width on LP64 or a constant
 * changes, and the C++ side of the test compares its own view with this one. */
#include <stddef.h>
#include <stdint.h>

#include "kaVMAPParser.h"
#include "layout_fields.h"

#if defined(__LP64__)
#define KA_CHECK_FIELD(T, f, off, size)                                     \
    _Static_assert(offsetof(T, f) == (off) && sizeof(((T*)0)->f) == (size), \
                   #T "." #f " moved or changed width");
#define KA_CHECK_SIZE(T, size) _Static_assert(sizeof(T) == (size), #T " changed size");
KA_LAYOUT_FIELDS(KA_CHECK_FIELD)
KA_LAYOUT_SIZES(KA_CHECK_SIZE)
#endif

#define KA_CHECK_CONSTANT(name, value) _Static_assert((name) == (value), #name " changed");
KA_LAYOUT_CONSTANTS(KA_CHECK_CONSTANT)
_Static_assert(sizeof(KA_BOOL) == 4, "KA_BOOL is 32 bits");
_Static_assert(sizeof(CVASTParser*) == sizeof(void*), "opaque pointers are pointer-sized");

/* The entries are declared with the types a player calls them with: a mismatch is an
 * incompatible pointer assignment, which the build treats as an error. */
static uint32_t (*const kEntry)(VMAPParserAPI*) = kaGetVMAPParserAPI;
static uintptr_t (*const kAdapter)(void) = kaGetVMAPParserAPIAdapter;
static uint32_t (*const kExpand)(const char*, const KaMacroValues*, char*, uint32_t,
                                 uint32_t*) = kaExpandVASTMacros;
/* The initializer names every field of the record, as C sees it. */
static const KaMacroValues kMacroInit = KA_MACRO_VALUES_INIT;

static const KaFieldLayout kMeasured[] = {KA_LAYOUT_MEASURED};

const KaFieldLayout* ka_layout_c(unsigned long* count) {
    (void)kEntry;
    (void)kAdapter;
    (void)kExpand;
    (void)kMacroInit;
    *count = sizeof(kMeasured) / sizeof(kMeasured[0]);
    return kMeasured;
}
