// Attribute values of a VMAP document turned into record fields. The common values are read
// from whole documents in the integration tests; here the corners a document cannot reach.
#include "vmap/vmap_values.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstring>

#include "ka/vmap_records.h"
#include "xml/text.h"

namespace {

int Len(const char* text) { return static_cast<int>(strlen(text)); }

TEST(VmapValues, ParseDecimalReadsLikeAtoiWithoutOverflow) {
    const struct {
        const char* text;
        int value;
    } kCases[] = {
        // clang-format off
        {"0", 0}, {"\t\n-12", -12}, {"+5", 5}, {"12abc", 12}, {"abc", 0}, {"", 0}, {"-", 0},
        {"- 3", 0}, {"007", 7}, {"1.9", 1}, {"2147483647", INT_MAX}, {"2147483648", INT_MAX},
        {"-2147483648", INT_MIN}, {"-99999999999999999999", INT_MIN},
        {"99999999999999999999999", INT_MAX},
        // clang-format on
    };
    for (const auto& c : kCases) EXPECT_EQ(ka::ParseDecimal(c.text), c.value) << c.text;
    EXPECT_EQ(ka::ParseDecimal(nullptr), 0);
}

TEST(VmapValues, BreakTypeSeparatorsAndBytes) {
    const struct {
        const char* value;
        uint32_t flags;
    } kCases[] = {
        // clang-format off
        {"nonlinear,linear", BREAK_TYPE_LINEAR | BREAK_TYPE_NONLINEAR},
        {" , linear , ", BREAK_TYPE_LINEAR}, {"linear-nonlinear_Companion.Skippable/AdPods", 31},
        {"linears", 0}, {"xlinear", 0}, {",,,", 0}, {"AdPods\x01linear", 17},
        {"linear\xc3\xa9", 0}, {"linear\xff" "AdPods", 0},  // bytes of a character are letters
        // clang-format on
    };
    for (const auto& c : kCases) {
        EXPECT_EQ(ka::ParseBreakType(c.value, Len(c.value)), c.flags) << c.value;
    }
    EXPECT_EQ(ka::ParseBreakType(nullptr, 0), 0u);
    EXPECT_EQ(ka::ParseBreakType("linear,AdPods", 6), BREAK_TYPE_LINEAR) << "only length read";
}

TEST(VmapValues, TimeOffsetKinds) {
    const uint32_t kNoType = 9;  // what an unknown form must leave in place
    const int64_t kNoOffset = -9;
    const struct {
        const char* value;
        uint32_t type;
        int64_t offset;
    } kCases[] = {
        // clang-format off
        {"99:59:59.999", TIME_OFFSET_CLOCK, 359999999},
        {"start:00", TIME_OFFSET_CLOCK, 0},  // length 8 goes to the clock reader
        {"% -4", TIME_OFFSET_PERCENT, -4}, {"100%", TIME_OFFSET_PERCENT, 100},
        {"0%", TIME_OFFSET_PERCENT, 0}, {"#12", TIME_OFFSET_POSITION, 12},
        {"#", TIME_OFFSET_POSITION, 1}, {"7 0%", kNoType, kNoOffset}, {"-5%", kNoType, kNoOffset},
        {"ending", kNoType, kNoOffset}, {"soon", kNoType, kNoOffset}, {"", kNoType, kNoOffset},
        // clang-format on
    };
    for (const auto& c : kCases) {
        uint32_t type = kNoType;
        int64_t offset = kNoOffset;
        EXPECT_EQ(ka::ParseTimeOffset(c.value, Len(c.value), &type, &offset), c.type != kNoType)
            << c.value;
        EXPECT_EQ(type, c.type) << c.value;
        EXPECT_EQ(offset, c.offset) << c.value;
    }
    uint32_t type = kNoType;
    int64_t offset = kNoOffset;
    EXPECT_FALSE(ka::ParseTimeOffset(nullptr, 0, &type, &offset));
    EXPECT_EQ(type, kNoType);
}

TEST(VmapValues, RepeatAfterNeedsAClockLength) {
    EXPECT_EQ(ka::ParseRepeatAfter("00:05:00", 8), 300000u);
    EXPECT_EQ(ka::ParseRepeatAfter("01:02:03.004", 12), 3723004u);
    EXPECT_EQ(ka::ParseRepeatAfter("5:00", 4), 0u);
    EXPECT_EQ(ka::ParseRepeatAfter("00:00:10.5", 10), 0u);
    EXPECT_EQ(ka::ParseRepeatAfter("abcdefgh", 8), 0u) << "no ':' test, the clock reader fails";
    EXPECT_EQ(ka::ParseRepeatAfter(nullptr, 8), 0u);
}

}  // namespace
