#include "xml/text_helpers.h"

#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <string>
#include <vector>

#include "ka/result_codes.h"

namespace {

// ---- parse_cdata -------------------------------------------------------------------------------

struct CDataCase {
    const char* name;
    const char* source;
    int size;
    const char* expected;
    unsigned int result;
};

const CDataCase kCDataCases[] = {
    {"plain", "![CDATA[abc]]", 32, "abc", KA_OK},
    {"inner_blanks_trimmed_entity_kept", "![CDATA[  a?x=1&amp;y=2  ]]", 64, "a?x=1&amp;y=2", KA_OK},
    {"empty", "![CDATA[]]", 16, "", KA_OK},
    {"only_blanks", "![CDATA[   ]]", 16, "", KA_OK},
    {"all_six_blanks", "![CDATA[ \t\n\v\f\rx \t\n\v\f\r]]", 32, "x", KA_OK},
    {"inner_blanks_kept", "![CDATA[ a  b ]]", 32, "a  b", KA_OK},
    {"high_bytes_not_blank", "![CDATA[\xC2\xA0x\xA0]]", 32, "\xC2\xA0x\xA0", KA_OK},
    {"content_ending_in_brackets", "![CDATA[a]]]]", 32, "a]]", KA_OK},
    {"exact_fit", "![CDATA[abc]]", 4, "abc", KA_OK},
    {"content_too_long", "![CDATA[abcdef]]", 4, "abc", KA_ERR_LOAD_FAILED},
    {"size_one", "![CDATA[abc]]", 1, "", KA_ERR_LOAD_FAILED},
    {"no_closing", "![CDATA[abc", 32, "![CDATA[abc", KA_ERR_LOAD_FAILED},
    {"half_closing", "![CDATA[abc]", 32, "![CDATA[abc]", KA_ERR_LOAD_FAILED},
    {"opening_only", "![CDATA[", 32, "![CDATA[", KA_ERR_LOAD_FAILED},
    {"no_opening", "abc]]", 32, "abc]]", KA_ERR_LOAD_FAILED},
    {"lower_case_opening", "![cdata[abc]]", 32, "![cdata[abc]]", KA_ERR_LOAD_FAILED},
    {"plain_text", "hello", 32, "hello", KA_ERR_LOAD_FAILED},
    {"plain_text_cut", "hello world", 6, "hello", KA_ERR_LOAD_FAILED},
    {"empty_source", "", 8, "", KA_ERR_LOAD_FAILED},
};

class ParseCDataTest : public ::testing::TestWithParam<CDataCase> {};

TEST_P(ParseCDataTest, ExtractsContent) {
    const CDataCase& c = GetParam();
    std::vector<char> dst(static_cast<size_t>(c.size) + 8, 'Z');
    EXPECT_EQ(parse_cdata(dst.data(), c.source, c.size), c.result);
    EXPECT_STREQ(dst.data(), c.expected);
    // Nothing past the destination's size is written.
    for (size_t i = static_cast<size_t>(c.size); i < dst.size(); ++i) EXPECT_EQ(dst[i], 'Z') << i;
}

INSTANTIATE_TEST_SUITE_P(Table, ParseCDataTest, ::testing::ValuesIn(kCDataCases),
                         [](const auto& info) { return std::string(info.param.name); });

TEST(ParseCData, NullSourceLeavesDestinationUntouched) {
    char dst[8];
    memset(dst, 'Z', sizeof(dst));
    EXPECT_EQ(parse_cdata(dst, nullptr, sizeof(dst)), KA_ERR_LOAD_FAILED);
    for (char c : dst) EXPECT_EQ(c, 'Z');
}

TEST(ParseCData, ShortNonSectionIsPaddedWithNul) {
    char dst[8];
    memset(dst, 'Z', sizeof(dst));
    EXPECT_EQ(parse_cdata(dst, "ab", sizeof(dst)), KA_ERR_LOAD_FAILED);
    EXPECT_STREQ(dst, "ab");
    for (size_t i = 2; i < sizeof(dst); ++i) EXPECT_EQ(dst[i], '\0') << i;
}

TEST(ParseCData, NoRoomAtAllWritesNothing) {
    char dst[4];
    memset(dst, 'Z', sizeof(dst));
    EXPECT_EQ(parse_cdata(dst, "![CDATA[a]]", 0), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(parse_cdata(dst, "![CDATA[a]]", -3), KA_ERR_LOAD_FAILED);
    for (char c : dst) EXPECT_EQ(c, 'Z');
}

// ---- unescape_amp ------------------------------------------------------------------------------

struct AmpCase {
    const char* input;
    const char* expected;
};

const AmpCase kAmpCases[] = {
    {"&amp;", "&"},
    {"&amp;amp;", "&amp;"},
    {"a&amp", "a&amp"},
    {"", ""},
    {"&am", "&am"},
    {"&amp", "&amp"},
    {"a?x=1&amp;y=2", "a?x=1&y=2"},
    {"&amp;&amp;&amp;", "&&&"},
    {"&&amp;", "&&"},
    {"&amp;&", "&&"},
    {"x&amp;", "x&"},
    {"&lt;&amp;gt;&#38;", "&lt;&gt;&#38;"},
    {"&AMP;", "&AMP;"},
    {"&amp ;", "&amp ;"},
    {"no entity here", "no entity here"},
};

class UnescapeAmpTest : public ::testing::TestWithParam<AmpCase> {};

TEST_P(UnescapeAmpTest, DecodesEachOccurrenceOnce) {
    std::string text = GetParam().input;
    EXPECT_EQ(unescape_amp(text.data()), 0);
    EXPECT_STREQ(text.c_str(), GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(Table, UnescapeAmpTest, ::testing::ValuesIn(kAmpCases));

TEST(UnescapeAmp, NullIsAccepted) { EXPECT_EQ(unescape_amp(nullptr), 0); }

// The decoding as stated: scan positions 0 to n-5 of the shrinking string, moving the tail left
// by four at every "&amp;". Quadratic, but obviously right.
std::string ReferenceUnescape(std::string text) {
    std::vector<char> s(text.begin(), text.end());
    s.push_back('\0');
    const size_t n = text.size();
    if (n < 5) return text;
    for (size_t i = 0; i + 5 <= n; ++i) {
        if (s[i] == '\0') break;
        if (strncmp(&s[i], "&amp;", 5) == 0) memmove(&s[i + 1], &s[i + 5], strlen(&s[i + 5]) + 1);
    }
    return std::string(s.data());
}

TEST(UnescapeAmp, MatchesTheInPlaceDefinitionOnRandomStrings) {
    std::mt19937 random(12345);
    const char alphabet[] = "&amp;x";
    for (int round = 0; round < 5000; ++round) {
        std::string text;
        const int length = static_cast<int>(random() % 40);
        for (int i = 0; i < length; ++i) text += alphabet[random() % (sizeof(alphabet) - 1)];
        if (random() % 2) text.insert(random() % (text.size() + 1), "&amp;amp;");
        std::string decoded = text;
        unescape_amp(decoded.data());
        ASSERT_EQ(std::string(decoded.c_str()), ReferenceUnescape(text)) << text;
    }
}

TEST(UnescapeAmp, ManyOccurrencesInOneString) {
    std::string text;
    for (int i = 0; i < 200000; ++i) text += "&amp;";
    unescape_amp(text.data());
    EXPECT_EQ(std::string(text.c_str()), std::string(200000, '&'));
}

// ---- string2time -------------------------------------------------------------------------------

struct TimeCase {
    const char* text;
    unsigned int expected;
};

const TimeCase kTimeCases[] = {
    {"00:00:30", 30000u},
    {"01:02:03.004", 3723004u},
    {"00:00:01.5", 1005u},
    {"00:00:01.5000", 1500u},
    {"12:34", 45240000u},
    {"00:00:00.000", 0u},
    {"1:2:3.4", 3723004u},
    {"99:99:99.999", 362439999u},
    {"+1:00:00", 3600000u},
    {"-1:00:00", 0u - 3600000u},
    {"00:-1:00", 0u - 60000u},
    // The sign takes one of the two places: "+0" is read, then ':' does not match '1'.
    {"+01:00:00", 0u},
    {"00:00:30.-5", 29995u},
    {" 00:00:05", 5000u},
    {"123:00:00", 43200000u},
    {"01", 3600000u},
    {"01:", 3600000u},
    {"01-02", 3600000u},
    {"abc", 0u},
    {"", 0u},
    {"00:01:00,500", 60000u},
};

class String2TimeTest : public ::testing::TestWithParam<TimeCase> {};

TEST_P(String2TimeTest, Milliseconds) {
    const TimeCase& c = GetParam();
    EXPECT_EQ(string2time(c.text, static_cast<int>(strlen(c.text)) + 1), c.expected) << c.text;
}

INSTANTIATE_TEST_SUITE_P(Table, String2TimeTest, ::testing::ValuesIn(kTimeCases));

TEST(String2Time, NullOrNoLengthIsZero) {
    EXPECT_EQ(string2time(nullptr, 8), 0u);
    EXPECT_EQ(string2time("00:00:30", 0), 0u);
    EXPECT_EQ(string2time("00:00:30", -1), 0u);
}

TEST(String2Time, LengthOnlyGuardsAgainstEmpty) {
    EXPECT_EQ(string2time("00:00:30", 1), 30000u);
    EXPECT_EQ(string2time("00:00:30", 1000), 30000u);
}

}  // namespace
