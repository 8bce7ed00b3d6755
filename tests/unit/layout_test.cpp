// The public VAST and VMAP records, the constants and the API table keep one layout for C and
// C++ players. The C side pins the LP64 values at build time; here the C++ view must match it.
#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <type_traits>

#include "kaVMAPParser.h"
#include "layout_fields.h"

namespace {

const KaFieldLayout kCxx[] = {KA_LAYOUT_MEASURED};

#define KA_CXX_TRAITS(T, size)                                                    \
    static_assert(std::is_standard_layout<T>::value && std::is_trivial<T>::value, \
                  #T " must stay a plain C record");
KA_LAYOUT_SIZES(KA_CXX_TRAITS)

// Signedness is part of what a player reads.
#define KA_SIGNED(T, f) std::is_signed<decltype(T::f)>::value
#define KA_UNSIGNED(T, f) std::is_unsigned<decltype(T::f)>::value
#define KA_TYPE(T, f, type) std::is_same<decltype(T::f), type>::value
static_assert(KA_SIGNED(AdLinear, skipOffset) && KA_SIGNED(AdTracking, offset) &&
                  KA_SIGNED(AdData, sequence) && KA_SIGNED(AdMediaFile, width) &&
                  KA_SIGNED(AdBreak, timeOffset) && KA_SIGNED(AdSource, id),
              "signed fields");
static_assert(KA_UNSIGNED(AdLinear, duration) && KA_UNSIGNED(AdData, type) &&
                  KA_UNSIGNED(AdMediaFile, delivery) && KA_UNSIGNED(AdInfo, adBreakCount) &&
                  KA_UNSIGNED(AdBreak, timeOffsetType) && KA_UNSIGNED(AdBreak, linearDuration) &&
                  KA_UNSIGNED(AdBreak, breakType) && KA_UNSIGNED(AdBreak, repeatAfter),
              "unsigned fields");
static_assert(KA_TYPE(AdSource, allowMultipleAds, KA_BOOL) &&
                  KA_TYPE(AdSource, followRedirects, KA_BOOL) &&
                  KA_TYPE(AdSource, vastAdData, VastAdData*),
              "AdSource field types");

// Every field's offset and width, every record's size and every constant's value, in list order.
TEST(Layout, CAndCxxAgree) {
    unsigned long count = 0;
    const KaFieldLayout* c = ka_layout_c(&count);
    ASSERT_EQ(count, sizeof(kCxx) / sizeof(kCxx[0]));
    for (unsigned long i = 0; i < count; ++i) {
        SCOPED_TRACE(kCxx[i].name);
        EXPECT_EQ(std::string(c[i].name), kCxx[i].name);
        EXPECT_EQ(c[i].offset, kCxx[i].offset);
        EXPECT_EQ(c[i].size, kCxx[i].size);
    }
}

}  // namespace
