// CDATA unwrapping, "&amp;" decoding and clock times; the cases are in tests/data/text_cases.txt.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "case_file.h"
#include "ka/result_codes.h"
#include "xml/text.h"

namespace {

TEST(TextHelpers, Cases) {
    auto rows = katest::ReadCases(KA_TEST_DATA_DIR "text_cases.txt");
    for (auto& f : rows) {
        SCOPED_TRACE(testing::PrintToString(f));
        if (f[0] == "cdata") {
            const size_t size = std::stoul(f[2]);
            std::vector<char> dst(size + 8, 'Z');
            EXPECT_EQ(f[3] == "ok" ? KA_OK : KA_ERR_LOAD_FAILED,
                      parse_cdata(dst.data(), f[1].c_str(), int(size)));
            EXPECT_EQ(f[4], dst.data());
            // A failed copy pads the destination with NUL; nothing past its size is written.
            for (size_t i = f[4].size(); i < dst.size(); ++i) {
                if (i < size && f[3] == "ok") continue;
                EXPECT_EQ(i < size ? '\0' : 'Z', dst[i]) << i;
            }
        } else if (f[0] == "amp") {
            std::vector<char> copy(f[1].size() + 1, 'Z');
            EXPECT_EQ(f[2].size(), ka::CopyDecodingAmp(copy.data(), f[1].data(), f[1].size()));
            EXPECT_EQ(f[2], copy.data());
            EXPECT_EQ(0, unescape_amp(&f[1][0]));
            EXPECT_EQ(f[2], f[1].c_str());
        } else if (f[0] == "atoi") {
            EXPECT_EQ(std::stoi(f[2]), ka::Atoi(f[1].c_str()));
            EXPECT_EQ(std::stoi(f[2]), atoi(f[1].c_str()));
            // As an attribute's value, with its length.
            EXPECT_EQ(std::stoi(f[2]), ka::Atoi(f[1].c_str(), static_cast<int>(f[1].size())));
        } else {
            EXPECT_EQ(
                std::stoul(f[2]),
                string2time(f[1].c_str(), f.size() > 3 ? std::stoi(f[3]) : int(f[1].size()) + 1));
        }
    }
    EXPECT_GT(rows.size(), 40u);
}

TEST(TextHelpers, NullAndEdgeArguments) {
    char dst[8];
    memset(dst, 'Z', sizeof(dst));
    for (const auto& [source, size] :
         {std::pair<const char*, int>{nullptr, 8}, {"![CDATA[a]]", 0}, {"![CDATA[a]]", -3}}) {
        EXPECT_EQ(KA_ERR_LOAD_FAILED, parse_cdata(dst, source, size));
    }
    EXPECT_EQ(std::string(8, 'Z'), std::string(dst, 8));
    EXPECT_EQ(0, unescape_amp(nullptr));
    EXPECT_EQ(0u, string2time(nullptr, 8));
    // Decoding that moved the whole tail at every occurrence would not finish here.
    std::string many;
    for (int i = 0; i < 200000; ++i) many += "&amp;";
    unescape_amp(many.data());
    EXPECT_EQ(std::string(200000, '&'), many.c_str());
}

}  // namespace
