// URL joining and resolution; the cases are in tests/data/uri_cases.txt.
#include "ka/uri.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "case_file.h"

namespace {

constexpr size_t kUrlSize = 2048;
using Strings = std::vector<std::string>;

// A 2048-byte buffer holding text, followed by guard bytes that nothing may write.
struct Buf {
    explicit Buf(const std::string& text = "") {
        memset(bytes, 0, kUrlSize);
        memset(bytes + kUrlSize, 'G', sizeof(bytes) - kUrlSize);
        memcpy(bytes, text.data(), std::min(text.size(), kUrlSize - 1));
    }
    bool Guarded() const { return std::string(bytes + kUrlSize, 8) == "GGGGGGGG"; }
    char bytes[kUrlSize + 8];
};

TEST(Uri, Cases) {
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "uri_cases.txt");
    for (const Strings& f : rows) {
        SCOPED_TRACE(testing::PrintToString(f));
        std::vector<Buf> in(f.begin() + 1, f.end());
        Buf out("garbage to be replaced"), s, a, p, q, h;
        uint32_t result = 0;
        Strings got;
        if (f[0] == "split") {
            result = GetComponentOfURI(s.bytes, a.bytes, p.bytes, q.bytes, h.bytes, in[0].bytes);
            got = {s.bytes, a.bytes, p.bytes, q.bytes, h.bytes};
        } else {
            if (f[0] == "combine") result = CombineURL(out.bytes, in[0].bytes, in[1].bytes);
            if (f[0] == "resolve") result = ResolveURI(out.bytes, in[0].bytes, in[1].bytes);
            if (f[0] == "dots") result = RemoveDotSegments(in[0].bytes, in[1].bytes);
            if (f[0] == "dots") out = in[0];
            if (f[0] == "merge") {
                result = MergeURIPath(out.bytes, in[0].bytes, in[1].bytes, in[2].bytes);
            }
            if (f[0] == "generate") {
                result = GeneateURI(in[0].bytes, in[1].bytes, in[2].bytes, in[3].bytes, in[4].bytes,
                                    out.bytes);
            }
            got = {out.bytes};
        }
        EXPECT_EQ(0u, result);
        EXPECT_EQ(Strings(f.end() - static_cast<long>(got.size()), f.end()), got);
    }
    EXPECT_GT(rows.size(), 80u);
}

// Null arguments are skipped; a null or empty base or URI leaves things alone.
TEST(Uri, NullAndEmptyArguments) {
    Buf out("unchanged"), text("x"), ref("../c"), base("http://a/b?q#f"), empty;
    EXPECT_EQ(0u, CombineURL(nullptr, text.bytes, text.bytes) +
                      CombineURL(out.bytes, nullptr, text.bytes) +
                      CombineURL(out.bytes, text.bytes, nullptr));
    EXPECT_STREQ("unchanged", out.bytes);
    EXPECT_EQ(0u,
              ResolveURI(nullptr, ref.bytes, base.bytes) + RemoveDotSegments(nullptr, text.bytes) +
                  RemoveDotSegments(out.bytes, nullptr) +
                  MergeURIPath(nullptr, text.bytes, text.bytes, text.bytes) +
                  GeneateURI(text.bytes, text.bytes, text.bytes, text.bytes, text.bytes, nullptr));
    EXPECT_EQ(0u, ResolveURI(out.bytes, ref.bytes, nullptr));
    EXPECT_STREQ("../c", out.bytes);
    // A null reference resolves to the base without its fragment.
    EXPECT_EQ(0u, ResolveURI(out.bytes, nullptr, base.bytes));
    EXPECT_STREQ("http://a/b?q", out.bytes);

    Buf scheme("s"), query, path("/p"), generated;
    EXPECT_EQ(0u,
              GetComponentOfURI(scheme.bytes, nullptr, nullptr, query.bytes, nullptr, empty.bytes) +
                  GetComponentOfURI(scheme.bytes, nullptr, nullptr, query.bytes, nullptr, nullptr));
    EXPECT_STREQ("s", scheme.bytes);
    EXPECT_STREQ("", query.bytes);
    GetComponentOfURI(nullptr, nullptr, nullptr, query.bytes, nullptr, base.bytes);
    EXPECT_STREQ("q", query.bytes);
    GeneateURI(nullptr, nullptr, path.bytes, nullptr, nullptr, generated.bytes);
    EXPECT_STREQ("/p", generated.bytes);
}

// Results are cut to exactly 2047 characters, and nothing is written past the 2048 bytes.
TEST(Uri, LongInputsAreCutAt2047) {
    for (size_t length : {2046u, 2047u, 2048u, 5000u}) {
        SCOPED_TRACE(length);
        std::string ref(length, 'r'), base = "http://h/";
        const std::string cut = ref.substr(0, kUrlSize - 1);
        Buf copied, combined, empty;
        ResolveURI(copied.bytes, &ref[0], empty.bytes);
        EXPECT_EQ(cut, copied.bytes);
        CombineURL(combined.bytes, &ref[0], &base[0]);
        EXPECT_EQ((base + ref).substr(0, kUrlSize - 1), combined.bytes);
        EXPECT_TRUE(copied.Guarded() && combined.Guarded());

        std::string uri = "s://" + ref + "/" + ref + "?" + ref + "#" + ref, segments;
        while (segments.size() < length) segments += "/a";
        Buf s, a, p, q, h, dotFree, generated;
        GetComponentOfURI(s.bytes, a.bytes, p.bytes, q.bytes, h.bytes, &uri[0]);
        EXPECT_EQ((Strings{"s", cut, ("/" + ref).substr(0, kUrlSize - 1), cut, cut}),
                  (Strings{s.bytes, a.bytes, p.bytes, q.bytes, h.bytes}));
        RemoveDotSegments(dotFree.bytes, &segments[0]);
        EXPECT_EQ(segments.substr(0, kUrlSize - 1), dotFree.bytes);
        GeneateURI(nullptr, nullptr, a.bytes, nullptr, nullptr, generated.bytes);
        EXPECT_EQ(cut, generated.bytes);
        EXPECT_TRUE(a.Guarded() && p.Guarded() && dotFree.Guarded() && generated.Guarded());
    }
    std::string ref = "../" + std::string(6000, 'g') + "?" + std::string(6000, 'q');
    std::string base = "http://a/" + std::string(6000, 'b') + "/c";
    Buf resolved;
    EXPECT_EQ(0u, ResolveURI(resolved.bytes, &ref[0], &base[0]));
    // The base path was cut before its last "/", so the reference lands in its first directory.
    EXPECT_EQ("http://a/" + std::string(kUrlSize - 10, 'g'), resolved.bytes);
}

}  // namespace
