// Attribute values of a VMAP document turned into record fields.
#include "vmap/vmap_values.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstring>

#include "ka/vmap_records.h"

namespace {

int Len(const char* text) { return static_cast<int>(strlen(text)); }

struct DecimalCase {
    const char* text;
    int value;
};

TEST(VmapValues, ParseDecimalReadsLikeAtoiWithoutOverflow) {
    const DecimalCase kCases[] = {
        {"0", 0},
        {"42", 42},
        {"  7", 7},
        {"\t\n-12", -12},
        {"+5", 5},
        {"12abc", 12},
        {"abc", 0},
        {"", 0},
        {"-", 0},
        {"- 3", 0},
        {"2147483647", INT_MAX},
        {"2147483648", INT_MAX},
        {"-2147483648", INT_MIN},
        {"-99999999999999999999", INT_MIN},
        {"99999999999999999999999", INT_MAX},
        {"007", 7},
        {"1.9", 1},
    };
    for (const DecimalCase& c : kCases) EXPECT_EQ(ka::ParseDecimal(c.text), c.value) << c.text;
    EXPECT_EQ(ka::ParseDecimal(nullptr), 0);
}

struct BreakTypeCase {
    const char* value;
    uint32_t flags;
};

TEST(VmapValues, BreakTypeByWholeWords) {
    const BreakTypeCase kCases[] = {
        {"linear", BREAK_TYPE_LINEAR},
        {"nonlinear", BREAK_TYPE_NONLINEAR},
        {"linear,nonlinear", BREAK_TYPE_LINEAR | BREAK_TYPE_NONLINEAR},
        {"nonlinear,linear", BREAK_TYPE_LINEAR | BREAK_TYPE_NONLINEAR},
        {"Companion", BREAK_TYPE_COMPANION},
        {"linear;Skippable", BREAK_TYPE_LINEAR | BREAK_TYPE_SKIPPABLE},
        {"linear,Skippable,AdPods", 25},
        {" , linear , ", BREAK_TYPE_LINEAR},
        {"linear-nonlinear_Companion.Skippable/AdPods", 31},
        {"linears", 0},
        {"xlinear", 0},
        {"Linear", 0},
        {"", 0},
        {",,,", 0},
        {"display", 0},
        {"linear\xc3\xa9", 0},
        {"linear\xff"
         "AdPods",
         0},
        {"AdPods\x01linear", BREAK_TYPE_LINEAR | BREAK_TYPE_ADPODS},
    };
    for (const BreakTypeCase& c : kCases) {
        EXPECT_EQ(ka::ParseBreakType(c.value, Len(c.value)), c.flags) << c.value;
    }
    EXPECT_EQ(ka::ParseBreakType(nullptr, 0), 0u);
    // Only length characters are read.
    EXPECT_EQ(ka::ParseBreakType("linear,AdPods", 6), BREAK_TYPE_LINEAR);
}

struct OffsetCase {
    const char* value;
    bool understood;
    uint32_t type;
    int64_t offset;
};

TEST(VmapValues, TimeOffsetKinds) {
    const OffsetCase kCases[] = {
        {"00:00:10", true, TIME_OFFSET_CLOCK, 10000},
        {"00:01:30.500", true, TIME_OFFSET_CLOCK, 90500},
        {"99:59:59.999", true, TIME_OFFSET_CLOCK, 359999999},
        {"00:00:10.5", true, TIME_OFFSET_NONE, 0},
        {"5:00", true, TIME_OFFSET_NONE, 0},
        {"start:00", true, TIME_OFFSET_CLOCK, 0},
        {"%25", true, TIME_OFFSET_PERCENT, 25},
        {"%", true, TIME_OFFSET_PERCENT, 0},
        {"% -4", true, TIME_OFFSET_PERCENT, -4},
        {"70%", true, TIME_OFFSET_PERCENT, 70},
        {"100%", true, TIME_OFFSET_PERCENT, 100},
        {"0%", true, TIME_OFFSET_PERCENT, 0},
        {"7 0%", false, 0, 0},
        {"-5%", false, 0, 0},
        {"12.5%", false, 0, 0},
        {"start", true, TIME_OFFSET_START_END, 0},
        {"end", true, TIME_OFFSET_START_END, 1},
        {"ending", false, 0, 0},
        {"START", false, 0, 0},
        {"#1", true, TIME_OFFSET_POSITION, 1},
        {"#12", true, TIME_OFFSET_POSITION, 12},
        {"#0", true, TIME_OFFSET_POSITION, 1},
        {"#-3", true, TIME_OFFSET_POSITION, 1},
        {"#", true, TIME_OFFSET_POSITION, 1},
        {"10", false, 0, 0},
        {"", false, 0, 0},
    };
    for (const OffsetCase& c : kCases) {
        uint32_t type = 0;
        int64_t offset = 0;
        EXPECT_EQ(ka::ParseTimeOffset(c.value, Len(c.value), &type, &offset), c.understood)
            << c.value;
        EXPECT_EQ(type, c.type) << c.value;
        EXPECT_EQ(offset, c.offset) << c.value;
    }
}

TEST(VmapValues, UnknownTimeOffsetLeavesFieldsAlone) {
    uint32_t type = 9;
    int64_t offset = -9;
    EXPECT_FALSE(ka::ParseTimeOffset("soon", 4, &type, &offset));
    EXPECT_EQ(type, 9u);
    EXPECT_EQ(offset, -9);
    EXPECT_FALSE(ka::ParseTimeOffset(nullptr, 0, &type, &offset));
    EXPECT_EQ(type, 9u);
}

TEST(VmapValues, RepeatAfterNeedsAClockLength) {
    EXPECT_EQ(ka::ParseRepeatAfter("00:05:00", 8), 300000u);
    EXPECT_EQ(ka::ParseRepeatAfter("01:02:03.004", 12), 3723004u);
    EXPECT_EQ(ka::ParseRepeatAfter("5:00", 4), 0u);
    EXPECT_EQ(ka::ParseRepeatAfter("00:00:10.5", 10), 0u);
    // No ":" test is made: any text of a clock length goes through the clock reader.
    EXPECT_EQ(ka::ParseRepeatAfter("abcdefgh", 8), 0u);
    EXPECT_EQ(ka::ParseRepeatAfter(nullptr, 8), 0u);
}

}  // namespace
