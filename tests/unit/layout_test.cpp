// The public VAST and VMAP records, the constants and the API table keep one layout for C and
// C++ players.
#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <type_traits>

#include "kaVMAPParser.h"
#include "layout_fields.h"

namespace {

struct Measured {
    const char* name;
    unsigned long offset;  // 0 for a record size or a constant
    unsigned long size;    // size of the field or record; a constant's value
    unsigned long expectedOffset;
    unsigned long expected;
};

#define KA_CXX_FIELD(T, f, off, size) \
    {#T "." #f, offsetof(T, f), sizeof(((T*)nullptr)->f), off, size},
#define KA_CXX_SIZE(T, size) {#T, 0, sizeof(T), 0, size},
#define KA_CXX_CONSTANT(name, value) {#name, 0, name, 0, value},

const Measured kFields[] = {KA_LAYOUT_FIELDS(KA_CXX_FIELD)};
const Measured kSizes[] = {KA_LAYOUT_SIZES(KA_CXX_SIZE)};
const Measured kConstants[] = {KA_LAYOUT_CONSTANTS(KA_CXX_CONSTANT)};

#define KA_CXX_TRAITS(T, size)                                                    \
    static_assert(std::is_standard_layout<T>::value && std::is_trivial<T>::value, \
                  #T " must stay a plain C record");
KA_LAYOUT_SIZES(KA_CXX_TRAITS)

// Signedness is part of what a player reads.
#define KA_SIGNED(T, f) static_assert(std::is_signed<decltype(T::f)>::value, #T "." #f);
#define KA_UNSIGNED(T, f) static_assert(std::is_unsigned<decltype(T::f)>::value, #T "." #f);
KA_SIGNED(AdLinear, skipOffset)
KA_UNSIGNED(AdLinear, duration)
KA_SIGNED(AdTracking, offset)
KA_SIGNED(AdData, sequence)
KA_UNSIGNED(AdData, type)
KA_SIGNED(AdMediaFile, width)
KA_UNSIGNED(AdMediaFile, delivery)
KA_UNSIGNED(AdInfo, adBreakCount)
KA_UNSIGNED(AdBreak, timeOffsetType)
KA_SIGNED(AdBreak, timeOffset)
KA_UNSIGNED(AdBreak, linearDuration)
KA_UNSIGNED(AdBreak, breakType)
KA_UNSIGNED(AdBreak, repeatAfter)
KA_SIGNED(AdSource, id)
static_assert(std::is_same<decltype(AdSource::allowMultipleAds), KA_BOOL>::value, "");
static_assert(std::is_same<decltype(AdSource::followRedirects), KA_BOOL>::value, "");
static_assert(std::is_same<decltype(AdSource::vastAdData), VastAdData*>::value, "");

template <size_t N>
void ExpectSameValues(const unsigned long* c, unsigned long count, const Measured (&cxx)[N]) {
    ASSERT_EQ(count, N);
    for (size_t i = 0; i < N; ++i) EXPECT_EQ(c[i], cxx[i].size) << cxx[i].name;
}

// The C side's fields, sizes and constants, in list order, against the C++ side's.
TEST(Layout, CAndCxxAgree) {
    unsigned long count = 0;
    const KaFieldLayout* fields = ka_layout_fields_c(&count);
    ASSERT_EQ(count, sizeof(kFields) / sizeof(kFields[0]));
    for (unsigned long i = 0; i < count; ++i) {
        SCOPED_TRACE(kFields[i].name);
        EXPECT_EQ(std::string(fields[i].name), kFields[i].name);
        EXPECT_EQ(fields[i].offset, kFields[i].offset);
        EXPECT_EQ(fields[i].size, kFields[i].size);
    }
    const unsigned long* sizes = ka_layout_sizes_c(&count);
    ExpectSameValues(sizes, count, kSizes);
    const unsigned long* constants = ka_layout_constants_c(&count);
    ExpectSameValues(constants, count, kConstants);
}

// The C++ side against the fixed values (the C side checks them at build time).
TEST(Layout, FixedOffsetsWidthsAndValues) {
    for (const Measured& m : kConstants) EXPECT_EQ(m.size, m.expected) << m.name;
#if defined(__LP64__)
    for (const Measured& m : kFields) {
        EXPECT_EQ(m.offset, m.expectedOffset) << m.name;
        EXPECT_EQ(m.size, m.expected) << m.name;
    }
    for (const Measured& m : kSizes) EXPECT_EQ(m.size, m.expected) << m.name;
#endif
}

}  // namespace
