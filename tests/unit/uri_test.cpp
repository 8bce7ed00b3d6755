// URL joining and resolution; the cases are in tests/data/uri_cases.txt.
#include "ka/uri.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "case_file.h"

namespace {

constexpr size_t kUrlSize = 2048;
using Strings = std::vector<std::string>;

// A buffer of 2048 bytes, or as many as a longer text takes, holding the text and followed by
// guard bytes that nothing may write.
struct Buf {
    explicit Buf(const std::string& text = "")
        : bytes(std::max(kUrlSize, text.size() + 1) + 8, '\0') {
        std::copy(text.begin(), text.end(), bytes.begin());
        std::fill(bytes.end() - 8, bytes.end(), 'G');
    }
    char* operator*() { return bytes.data(); }
    bool Guarded() const { return std::string(bytes.end() - 8, bytes.end()) == "GGGGGGGG"; }
    std::vector<char> bytes;
};

TEST(Uri, Cases) {
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "uri_cases.txt");
    for (const Strings& f : rows) {
        SCOPED_TRACE(testing::PrintToString(f));
        std::vector<Buf> in(f.begin() + 1, f.end());
        Buf out("garbage to be replaced"), s, a, p, q, h;
        uint32_t result = 0;
        Strings got;
        auto arg = [&](size_t i) { return f[i + 1] == "<null>" ? nullptr : *in[i]; };
        if (f[0] == "split") {
            result = GetComponentOfURI(*s, *a, *p, *q, *h, arg(0));
            got = {*s, *a, *p, *q, *h};
        } else {
            if (f[0] == "combine") result = CombineURL(*out, arg(0), arg(1));
            if (f[0] == "resolve") result = ResolveURI(*out, arg(0), arg(1));
            if (f[0] == "dots") result = RemoveDotSegments(arg(0), arg(1));
            if (f[0] == "dots") out = in[0];
            if (f[0] == "merge") result = MergeURIPath(*out, arg(0), arg(1), arg(2));
            if (f[0] == "generate")
                result = GeneateURI(arg(0), arg(1), arg(2), arg(3), arg(4), *out);
            got = {*out};
        }
        EXPECT_EQ(0u, result);
        EXPECT_EQ(Strings(f.end() - static_cast<long>(got.size()), f.end()), got);
        for (const Buf* b : {&out, &s, &a, &p, &q, &h, &in[0]}) EXPECT_TRUE(b->Guarded());
    }
    EXPECT_GT(rows.size(), 100u);
}

// Null outputs are skipped; a null or empty URI leaves the components alone. (Null inputs are
// rows of the case file.)
TEST(Uri, NullAndEmptyArguments) {
    Buf text("x"), base("http://a/b?q#f"), empty, scheme("s"), query;
    EXPECT_EQ(0u, CombineURL(nullptr, *text, *text) + ResolveURI(nullptr, *text, *base) +
                      RemoveDotSegments(nullptr, *text) +
                      MergeURIPath(nullptr, *text, *text, *text) +
                      GeneateURI(*text, *text, *text, *text, *text, nullptr));
    EXPECT_EQ(0u, GetComponentOfURI(*scheme, nullptr, nullptr, *query, nullptr, *empty) +
                      GetComponentOfURI(*scheme, nullptr, nullptr, *query, nullptr, nullptr));
    EXPECT_STREQ("s", *scheme);
    EXPECT_STREQ("", *query);
    GetComponentOfURI(nullptr, nullptr, nullptr, *query, nullptr, *base);
    EXPECT_STREQ("q", *query);
}

}  // namespace
