// The public VMAP records and API table keep one layout for C and C++ players.
#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <type_traits>

#include "kaVMAPParser.h"
#include "vmap_layout_fields.h"

namespace {

struct Field {
    const char* name;
    unsigned long offset;
    unsigned long size;
    unsigned long expectedOffset;
    unsigned long expectedSize;
};

#define KA_CXX_FIELD(T, f, off, size) \
    {#T "." #f, offsetof(T, f), sizeof(((T*)nullptr)->f), off, size},
#define KA_CXX_SIZE(T, size) {#T, sizeof(T), size},

const Field kCxxFields[] = {KA_VMAP_FIELDS(KA_CXX_FIELD)};

struct Size {
    const char* name;
    unsigned long size;
    unsigned long expected;
};
const Size kCxxSizes[] = {KA_VMAP_SIZES(KA_CXX_SIZE)};

#define KA_CXX_TRAITS(T, size)                                                    \
    static_assert(std::is_standard_layout<T>::value && std::is_trivial<T>::value, \
                  #T " must stay a plain C record");
KA_VMAP_SIZES(KA_CXX_TRAITS)

TEST(VmapLayout, CAndCxxAgreeOnEveryField) {
    unsigned long count = 0;
    const KaVmapFieldLayout* c = ka_vmap_layout_c(&count);
    ASSERT_EQ(count, sizeof(kCxxFields) / sizeof(kCxxFields[0]));
    for (unsigned long i = 0; i < count; ++i) {
        SCOPED_TRACE(kCxxFields[i].name);
        EXPECT_EQ(std::string(c[i].name), kCxxFields[i].name);
        EXPECT_EQ(c[i].offset, kCxxFields[i].offset);
        EXPECT_EQ(c[i].size, kCxxFields[i].size);
    }
}

TEST(VmapLayout, CAndCxxAgreeOnRecordSizes) {
    unsigned long count = 0;
    const unsigned long* c = ka_vmap_sizes_c(&count);
    ASSERT_EQ(count, sizeof(kCxxSizes) / sizeof(kCxxSizes[0]));
    for (unsigned long i = 0; i < count; ++i) {
        SCOPED_TRACE(kCxxSizes[i].name);
        EXPECT_EQ(c[i], kCxxSizes[i].size);
    }
}

TEST(VmapLayout, CAndCxxAgreeOnConstants) {
    const unsigned long kCxx[] = {
        TIME_OFFSET_NONE,
        TIME_OFFSET_CLOCK,
        TIME_OFFSET_PERCENT,
        TIME_OFFSET_START_END,
        TIME_OFFSET_POSITION,
        1,
        2,
        4,
        8,
        16,
        0x44000001,
        0x44000002,
        0x44000003,
        0x44000004,
        0x9100100b,
        0x91001000,
        0x90000001,
    };
    unsigned long count = 0;
    const unsigned long* c = ka_vmap_constants_c(&count);
    ASSERT_EQ(count, sizeof(kCxx) / sizeof(kCxx[0]));
    for (unsigned long i = 0; i < count; ++i) EXPECT_EQ(c[i], kCxx[i]) << i;
}

#if defined(__LP64__)
TEST(VmapLayout, Lp64OffsetsAndWidths) {
    for (const Field& f : kCxxFields) {
        SCOPED_TRACE(f.name);
        EXPECT_EQ(f.offset, f.expectedOffset);
        EXPECT_EQ(f.size, f.expectedSize);
    }
    for (const Size& s : kCxxSizes) {
        SCOPED_TRACE(s.name);
        EXPECT_EQ(s.size, s.expected);
    }
}
#endif

TEST(VmapLayout, SignedAndUnsignedFieldsAsDeclared) {
    EXPECT_TRUE(std::is_unsigned<decltype(AdInfo::adBreakCount)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdBreak::timeOffsetType)>::value);
    EXPECT_TRUE(std::is_signed<decltype(AdBreak::timeOffset)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdBreak::linearDuration)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdBreak::breakType)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdBreak::repeatAfter)>::value);
    EXPECT_TRUE(std::is_signed<decltype(AdSource::id)>::value);
    EXPECT_TRUE((std::is_same<decltype(AdSource::allowMultipleAds), KA_BOOL>::value));
    EXPECT_TRUE((std::is_same<decltype(AdSource::followRedirects), KA_BOOL>::value));
    EXPECT_TRUE((std::is_same<decltype(AdSource::vastAdData), VastAdData*>::value));
}

}  // namespace
