// The public VAST records keep one layout for C and C++ players.
#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <type_traits>

#include "ka/vast_records.h"
#include "vast_layout_fields.h"

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

const Field kCxxFields[] = {KA_VAST_FIELDS(KA_CXX_FIELD)};

struct Size {
    const char* name;
    unsigned long size;
    unsigned long expected;
};
const Size kCxxSizes[] = {KA_VAST_SIZES(KA_CXX_SIZE)};

#define KA_CXX_TRAITS(T, size)                                                    \
    static_assert(std::is_standard_layout<T>::value && std::is_trivial<T>::value, \
                  #T " must stay a plain C record");
KA_VAST_SIZES(KA_CXX_TRAITS)

TEST(VastLayout, CAndCxxAgreeOnEveryField) {
    unsigned long count = 0;
    const KaVastFieldLayout* c = ka_vast_layout_c(&count);
    ASSERT_EQ(count, sizeof(kCxxFields) / sizeof(kCxxFields[0]));
    for (unsigned long i = 0; i < count; ++i) {
        SCOPED_TRACE(kCxxFields[i].name);
        EXPECT_EQ(std::string(c[i].name), kCxxFields[i].name);
        EXPECT_EQ(c[i].offset, kCxxFields[i].offset);
        EXPECT_EQ(c[i].size, kCxxFields[i].size);
    }
}

TEST(VastLayout, CAndCxxAgreeOnRecordSizes) {
    unsigned long count = 0;
    const unsigned long* c = ka_vast_sizes_c(&count);
    ASSERT_EQ(count, sizeof(kCxxSizes) / sizeof(kCxxSizes[0]));
    for (unsigned long i = 0; i < count; ++i) {
        SCOPED_TRACE(kCxxSizes[i].name);
        EXPECT_EQ(c[i], kCxxSizes[i].size);
    }
}

#if defined(__LP64__)
TEST(VastLayout, Lp64OffsetsAndWidths) {
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

TEST(VastLayout, SignedAndUnsignedFieldsAsDeclared) {
    EXPECT_TRUE(std::is_signed<decltype(AdLinear::skipOffset)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdLinear::duration)>::value);
    EXPECT_TRUE(std::is_signed<decltype(AdTracking::offset)>::value);
    EXPECT_TRUE(std::is_signed<decltype(AdData::sequence)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdData::type)>::value);
    EXPECT_TRUE(std::is_signed<decltype(AdMediaFile::width)>::value);
    EXPECT_TRUE(std::is_unsigned<decltype(AdMediaFile::delivery)>::value);
}

}  // namespace
