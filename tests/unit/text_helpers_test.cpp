#include "xml/text.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <string>
#include <vector>

#include "ka/result_codes.h"

namespace {

TEST(ParseCData, ExtractsContent) {
    constexpr unsigned int kOk = KA_OK, kFail = KA_ERR_LOAD_FAILED;
    struct {
        const char* source;
        int size;
        const char* expected;  // null: the destination must stay untouched
        unsigned int result;
    } const cases[] = {
        // clang-format off
        {"![CDATA[  a?x=1&amp;y=2  ]]", 64, "a?x=1&amp;y=2", kOk}, {"![CDATA[]]", 16, "", kOk},
        {"![CDATA[   ]]", 16, "", kOk}, {"![CDATA[ \t\n\v\f\rx \t\n\v\f\r]]", 32, "x", kOk},
        {"![CDATA[ a  b ]]", 32, "a  b", kOk}, {"![CDATA[a]]]]", 32, "a]]", kOk},
        {"![CDATA[\xC2\xA0x\xA0]]", 32, "\xC2\xA0x\xA0", kOk}, {"![CDATA[abc]]", 4, "abc", kOk},
        {"![CDATA[abcdef]]", 4, "abc", kFail}, {"![CDATA[abc]]", 1, "", kFail},
        {"![CDATA[abc", 32, "![CDATA[abc", kFail}, {"![CDATA[abc]", 32, "![CDATA[abc]", kFail},
        {"abc]]", 32, "abc]]", kFail}, {"![cdata[abc]]", 32, "![cdata[abc]]", kFail},
        {"hello world", 6, "hello", kFail}, {"", 8, "", kFail}, {nullptr, 8, nullptr, kFail},
        {"![CDATA[a]]", 0, nullptr, kFail}, {"![CDATA[a]]", -3, nullptr, kFail},
        // clang-format on
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(::testing::Message() << (c.source ? c.source : "null") << ", " << c.size);
        std::vector<char> dst(static_cast<size_t>(std::max(c.size, 0)) + 8, 'Z');
        EXPECT_EQ(parse_cdata(dst.data(), c.source, c.size), c.result);
        if (c.expected == nullptr) {
            EXPECT_EQ(std::count(dst.begin(), dst.end(), 'Z'), std::ptrdiff_t(dst.size()));
            continue;
        }
        EXPECT_STREQ(dst.data(), c.expected);
        // A failed copy pads the destination with NUL; nothing past its size is written.
        for (size_t i = strlen(c.expected); i < dst.size(); ++i) {
            const bool inside = i < static_cast<size_t>(c.size);
            if (inside && c.result == KA_OK) continue;
            EXPECT_EQ(dst[i], inside ? '\0' : 'Z') << i;
        }
    }
}

TEST(UnescapeAmp, DecodesEachOccurrenceOnce) {
    const std::pair<const char*, const char*> cases[] = {
        // clang-format off
        {"&amp;", "&"}, {"&amp;amp;", "&amp;"}, {"&amp;amp;amp;", "&amp;amp;"}, {"a&amp", "a&amp"},
        {"", ""}, {"a?x=1&amp;y=2", "a?x=1&y=2"}, {"&amp;&amp;&amp;", "&&&"},
        {"a&amp;amp;b&amp;", "a&amp;b&"}, {"&&amp;", "&&"}, {"&amp;&", "&&"},
        {"&lt;&amp;gt;&#38;", "&lt;&gt;&#38;"}, {"&AMP;", "&AMP;"}, {"&amp ;", "&amp ;"},
        // clang-format on
    };
    for (const auto& [input, expected] : cases) {
        std::string text = input;
        EXPECT_EQ(unescape_amp(text.data()), 0);
        EXPECT_STREQ(text.c_str(), expected) << input;
    }
    EXPECT_EQ(unescape_amp(nullptr), 0);
    // A decoding that moved the whole tail at every occurrence would not finish here.
    std::string many;
    for (int i = 0; i < 200000; ++i) many += "&amp;";
    unescape_amp(many.data());
    EXPECT_EQ(std::string(many.c_str()), std::string(200000, '&'));
}

TEST(String2Time, Milliseconds) {
    const std::pair<const char*, unsigned int> cases[] = {
        // clang-format off
        {"00:00:30", 30000u}, {"01:02:03.004", 3723004u}, {"00:00:01.5", 1005u},
        {"00:00:01.5000", 1500u}, {"12:34", 45240000u}, {"1:2:3.4", 3723004u},
        {"99:99:99.999", 362439999u}, {"+1:00:00", 3600000u}, {"-1:00:00", 0u - 3600000u},
        // The sign takes one of the two places: "+0" is read, then ':' does not match '1'.
        {"+01:00:00", 0u}, {" 00:00:05", 5000u}, {"123:00:00", 43200000u}, {"01", 3600000u},
        {"00:01:00,500", 60000u}, {"abc", 0u}, {"", 0u},
        // clang-format on
    };
    for (const auto& [text, expected] : cases) {
        EXPECT_EQ(string2time(text, static_cast<int>(strlen(text)) + 1), expected) << text;
    }
    // The length only guards against nothing.
    EXPECT_EQ(string2time(nullptr, 8), 0u);
    EXPECT_EQ(string2time("00:00:30", 0), 0u);
    EXPECT_EQ(string2time("00:00:30", -1), 0u);
    EXPECT_EQ(string2time("00:00:30", 1), 30000u);
}

}  // namespace
