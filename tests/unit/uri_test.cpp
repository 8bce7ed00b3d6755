// URL joining and resolution: CombineURL, ResolveURI and its component functions.
#include "ka/uri.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace {

constexpr size_t kUrlSize = 2048;
constexpr const char* kRfcBase = "http://a/b/c/d;p?q";

// A zero-filled 2048-byte buffer holding text.
struct Buf {
    explicit Buf(const std::string& text = "") {
        memset(bytes, 0, sizeof(bytes));
        memcpy(bytes, text.data(), std::min(text.size(), sizeof(bytes) - 1));
    }
    char bytes[kUrlSize];
};

// ResolveURI (into a buffer holding text it must replace) or CombineURL.
std::string Join(bool resolve, const std::string& ref, const std::string& base) {
    Buf out(resolve ? "garbage to be replaced" : ""), r(ref), b(base);
    EXPECT_EQ(0u, resolve ? ResolveURI(out.bytes, r.bytes, b.bytes)
                          : CombineURL(out.bytes, r.bytes, b.bytes));
    return out.bytes;
}

TEST(Uri, CombineAndResolve) {
    const struct {
        bool resolve;  // ResolveURI, else CombineURL
        const char *ref, *base, *expected;
    } cases[] = {
        // clang-format off
        {false, "c.xml", "http://host/a/b.xml", "http://host/a/c.xml"},
        // The "/" inside the query does not count as the directory.
        {false, "c.xml", "http://host/a/b?u=x/y", "http://host/a/c.xml"},
        {false, "c.xml", "https://host/", "https://host/c.xml"},
        {false, "/z", "https://host/a/b", "https://host/z"},
        {false, "/z", "https://host", "https://host/z"},
        {false, "", "http://host/a/b", "http://host/a/"},
        // A scheme of the table anywhere in the reference keeps the reference alone.
        {false, "go?to=http://x", "http://host/a/b", "go?to=http://x"},
        // File path bases keep their directory, whichever separator; with two absolute paths the
        // reference stands alone.
        {false, "c.xml", "C:\\x\\y.xml", "C:\\x\\c.xml"},
        {false, "c.xml", "/data/ads/y.xml", "/data/ads/c.xml"},
        {false, "c.xml", "nodirectory", "c.xml"},
        {false, "/other/c.xml", "/data/y.xml", "/other/c.xml"},
        {true, "../c", "http://a/b/d/e", "http://a/b/c"},
        {true, "?y", "http://a/b/d/e", "http://a/b/d/e?y"},
        {true, "../c", "", "../c"}, {true, "g", "http://a", "http://a/g"},
        {true, "../../../g", kRfcBase, "http://a/g"},
        {true, "https://x/./y/../z?q#f", kRfcBase, "https://x/z?q#f"},
        // The library's own readings: the first "//" anywhere in a reference without a scheme
        // starts an authority, and a "?" before the authority's first "/" stays inside it.
        {true, "a/b//c", kRfcBase, "http://c"}, {true, "//h?x=/../y", kRfcBase, "http://h?x=/y"},
        // clang-format on
    };
    for (const auto& c : cases) {
        EXPECT_EQ(c.expected, Join(c.resolve, c.ref, c.base)) << c.ref << " from " << c.base;
    }
    // The normal examples of RFC 3986 section 5.4.1.
    const char* const rfc[][2] = {
        // clang-format off
        {"g:h", "g:h"}, {"g", "http://a/b/c/g"}, {"./g", "http://a/b/c/g"},
        {"g/", "http://a/b/c/g/"}, {"/g", "http://a/g"}, {"//g", "http://g"},
        {"?y", "http://a/b/c/d;p?y"}, {"g?y", "http://a/b/c/g?y"}, {"#s", "http://a/b/c/d;p?q#s"},
        {"g#s", "http://a/b/c/g#s"}, {"g?y#s", "http://a/b/c/g?y#s"}, {";x", "http://a/b/c/;x"},
        {"g;x", "http://a/b/c/g;x"}, {"g;x?y#s", "http://a/b/c/g;x?y#s"},
        {"", "http://a/b/c/d;p?q"}, {".", "http://a/b/c/"}, {"./", "http://a/b/c/"},
        {"..", "http://a/b/"}, {"../", "http://a/b/"}, {"../g", "http://a/b/g"},
        {"../..", "http://a/"}, {"../../", "http://a/"}, {"../../g", "http://a/g"},
        // clang-format on
    };
    for (const auto& c : rfc) EXPECT_EQ(c[1], Join(true, c[0], kRfcBase)) << c[0];
    for (const std::string ref : {"http://k", "https://k", "iprm://k", "vrkp://k", "vrkps://k",
                                  "smdrm://k", "tivocrypt://k"}) {
        EXPECT_EQ(ref, Join(false, ref, "/dir/file"));
        EXPECT_EQ(ref, Join(false, ref, "http://h/a/b"));
    }
}

TEST(Uri, Components) {
    // As "scheme|authority|path|query|fragment". The first "?" ends the path even after a "#",
    // and a "?" inside the authority stays there.
    const char* const split[][2] = {
        // clang-format off
        {"http://host:80/p/q?x=1#f", "http|host:80|/p/q|x=1|f"}, {"p/q", "||p/q||"},
        {"x:", "x||||"}, {"http://host?x#f", "http|host||x|f"}, {"http://host#f", "http|host|||f"},
        {"mailto:a@b", "mailto||a@b||"}, {"//g", "|g|||"}, {"?y", "|||y|"}, {"#s", "||||s"},
        {"a/b:c", "||a/b:c||"}, {"/p#f?q", "||/p#f|q|"}, {"http://h?x=/y", "http|h?x=|/y||"},
        // clang-format on
    };
    for (const auto& c : split) {
        Buf s, a, p, q, f, uri(c[0]);
        EXPECT_EQ(0u, GetComponentOfURI(s.bytes, a.bytes, p.bytes, q.bytes, f.bytes, uri.bytes));
        EXPECT_EQ(c[1], std::string(s.bytes) + "|" + a.bytes + "|" + p.bytes + "|" + q.bytes + "|" +
                            f.bytes);
    }
    const char* const dots[][2] = {
        // clang-format off
        {"/a/b/c/./../../g", "/a/g"}, {"mid/content=5/../6", "mid/6"}, {"/.x", "/.x"},
        {"/..x", "/..x"}, {"/a/.x/..y/z", "/a/.x/..y/z"}, {"./a", "a"}, {"../a", "a"}, {".", ""},
        {"..", ""}, {"/.", "/"}, {"/a/..", "/"}, {"/../../x", "/x"}, {"a/", "a/"}, {"", ""},
        // clang-format on
    };
    for (const auto& c : dots) {
        Buf out, in(c[0]);
        EXPECT_EQ(0u, RemoveDotSegments(out.bytes, in.bytes));
        EXPECT_STREQ(c[1], out.bytes) << c[0];
    }
    // The result is appended to what out already holds.
    Buf out("/base"), in("/x/./y");
    RemoveDotSegments(out.bytes, in.bytes);
    EXPECT_STREQ("/base/x/y", out.bytes);
    // Base authority, base path, reference path, merged path.
    const char* const merges[][4] = {{"a", "", "g", "/g"},
                                     {"a", "/b/c/d;p", "g", "/b/c/g"},
                                     {"", "nodir", "g", "g"},
                                     {"", "x/y", "g", "x/g"}};
    for (const auto& c : merges) {
        Buf out("old"), authority(c[0]), basePath(c[1]), ref(c[2]);
        EXPECT_EQ(0u, MergeURIPath(out.bytes, authority.bytes, basePath.bytes, ref.bytes));
        EXPECT_STREQ(c[3], out.bytes) << c[1] << " + " << c[2];
    }
    // Scheme, authority, path, query, fragment, URI.
    const char* const parts[][6] = {{"http", "h", "/p", "q", "f", "http://h/p?q#f"},
                                    {"", "", "p/q", "", "", "p/q"},
                                    {"", "", "p", "q", "f", "p?q#f"},
                                    {"g", "", "h", "", "", "g:h"},
                                    {"http", "h", "", "", "", "http://h"}};
    for (const auto& c : parts) {
        Buf out("old"), s(c[0]), a(c[1]), p(c[2]), q(c[3]), f(c[4]);
        EXPECT_EQ(0u, GeneateURI(s.bytes, a.bytes, p.bytes, q.bytes, f.bytes, out.bytes));
        EXPECT_STREQ(c[5], out.bytes);
    }
}

// Null arguments are skipped; a null or empty base or URI leaves things alone.
TEST(Uri, NullAndEmptyArguments) {
    Buf out("unchanged"), text("x"), ref("../c"), base("http://a/b?q#f"), empty;
    EXPECT_EQ(0u, CombineURL(nullptr, text.bytes, text.bytes));
    EXPECT_EQ(0u, CombineURL(out.bytes, nullptr, text.bytes));
    EXPECT_EQ(0u, CombineURL(out.bytes, text.bytes, nullptr));
    EXPECT_STREQ("unchanged", out.bytes);
    EXPECT_EQ(0u, ResolveURI(nullptr, ref.bytes, base.bytes));
    EXPECT_EQ(0u, ResolveURI(out.bytes, ref.bytes, nullptr));
    EXPECT_STREQ("../c", out.bytes);
    // A null reference resolves to the base without its fragment.
    EXPECT_EQ(0u, ResolveURI(out.bytes, nullptr, base.bytes));
    EXPECT_STREQ("http://a/b?q", out.bytes);

    Buf scheme("s"), query, path("/p"), generated;
    GetComponentOfURI(scheme.bytes, nullptr, nullptr, query.bytes, nullptr, empty.bytes);
    GetComponentOfURI(scheme.bytes, nullptr, nullptr, query.bytes, nullptr, nullptr);
    EXPECT_STREQ("s", scheme.bytes);
    EXPECT_STREQ("", query.bytes);
    GetComponentOfURI(nullptr, nullptr, nullptr, query.bytes, nullptr, base.bytes);
    EXPECT_STREQ("q", query.bytes);
    GeneateURI(nullptr, nullptr, path.bytes, nullptr, nullptr, generated.bytes);
    EXPECT_STREQ("/p", generated.bytes);
}

// Inputs beyond the buffers are cut to 2047 characters, never written past.
TEST(Uri, OverlongInputsAreCut) {
    std::string base = "http://host/" + std::string(3000, 'd') + "/b.xml", ref(5000, 'r');
    Buf out;
    CombineURL(out.bytes, &ref[0], &base[0]);
    EXPECT_EQ(kUrlSize - 1, strlen(out.bytes));
    EXPECT_EQ(0, strncmp(out.bytes, "http://host/ddd", 15));

    ref = "../" + std::string(6000, 'g') + "?" + std::string(6000, 'q');
    base = "http://a/" + std::string(6000, 'b') + "/c";
    Buf resolved;
    EXPECT_EQ(0u, ResolveURI(resolved.bytes, &ref[0], &base[0]));
    EXPECT_LE(strlen(resolved.bytes), kUrlSize - 1);
    // The base path was cut before its last "/", so the reference lands in its first directory.
    EXPECT_EQ(0, strncmp(resolved.bytes, "http://a/ggg", 12));

    std::string uri = "http://" + std::string(4000, 'h') + "/" + std::string(4000, 'p');
    Buf authority, path, dotFree;
    GetComponentOfURI(nullptr, authority.bytes, path.bytes, nullptr, nullptr, &uri[0]);
    EXPECT_EQ(kUrlSize - 1, strlen(authority.bytes));
    EXPECT_EQ(kUrlSize - 1, strlen(path.bytes));
    EXPECT_EQ('/', path.bytes[0]);
    std::string segments;
    while (segments.size() < 3000) segments += "/a";
    RemoveDotSegments(dotFree.bytes, &segments[0]);
    EXPECT_EQ(kUrlSize - 1, strlen(dotFree.bytes));
}

}  // namespace
