// URL joining and resolution: CombineURL, ResolveURI and its component functions.
#include "ka/uri.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>

namespace {

constexpr size_t kUrlSize = 2048;

// A zero-filled 2048-byte buffer holding text.
struct UrlBuffer {
    explicit UrlBuffer(const std::string& text = "") {
        memset(bytes, 0, sizeof(bytes));
        memcpy(bytes, text.data(), std::min(text.size(), sizeof(bytes) - 1));
    }
    char bytes[kUrlSize];
};

struct Case {
    const char* ref;
    const char* base;
    const char* expected;
};

std::string Combine(const std::string& ref, const std::string& base) {
    UrlBuffer out, r(ref), b(base);
    EXPECT_EQ(0u, CombineURL(out.bytes, r.bytes, b.bytes));
    return out.bytes;
}

std::string Resolve(const std::string& ref, const std::string& base) {
    UrlBuffer out("garbage that must be replaced"), r(ref), b(base);
    EXPECT_EQ(0u, ResolveURI(out.bytes, r.bytes, b.bytes));
    return out.bytes;
}

TEST(CombineUrl, JoinsReferenceToBase) {
    const Case cases[] = {
        // clang-format off
        {"c.xml", "http://host/a/b.xml", "http://host/a/c.xml"},
        // The "/" inside the query does not count as the directory.
        {"c.xml", "http://host/a/b?u=x/y", "http://host/a/c.xml"},
        {"c.xml", "https://host/", "https://host/c.xml"},
        {"/z", "https://host/a/b", "https://host/z"}, {"/z", "https://host", "https://host/z"},
        {"", "http://host/a/b", "http://host/a/"},
        // A scheme of the table anywhere in the reference keeps the reference alone.
        {"go?to=http://x", "http://host/a/b", "go?to=http://x"},
        // File path bases keep their directory, whichever separator they use.
        {"c.xml", "C:\\x\\y.xml", "C:\\x\\c.xml"}, {"c.xml", "/data/ads/y.xml", "/data/ads/c.xml"},
        {"c.xml", "nodirectory", "c.xml"},
        // Two absolute file paths: the reference alone.
        {"/other/c.xml", "/data/y.xml", "/other/c.xml"},
        // clang-format on
    };
    for (const Case& c : cases) {
        EXPECT_EQ(c.expected, Combine(c.ref, c.base)) << c.ref << " from " << c.base;
    }
    for (const char* scheme :
         {"http://", "https://", "iprm://", "vrkp://", "vrkps://", "smdrm://", "tivocrypt://"}) {
        EXPECT_EQ(std::string(scheme) + "k", Combine(std::string(scheme) + "k", "/dir/file"));
        EXPECT_EQ(std::string(scheme) + "k", Combine(std::string(scheme) + "k", "http://h/a/b"));
    }
}

constexpr const char* kRfcBase = "http://a/b/c/d;p?q";

// The normal examples of RFC 3986 section 5.4.1, as reference and result.
TEST(ResolveUri, RfcNormalExamples) {
    const char* const cases[][2] = {
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
    for (const auto& c : cases) EXPECT_EQ(c[1], Resolve(c[0], kRfcBase)) << c[0];
}

TEST(ResolveUri, LibraryCases) {
    const Case cases[] = {
        // clang-format off
        {"../c", "http://a/b/d/e", "http://a/b/c"}, {"?y", "http://a/b/d/e", "http://a/b/d/e?y"},
        {"../c", "", "../c"}, {"../../../g", kRfcBase, "http://a/g"},
        {"g", "http://a", "http://a/g"}, {"https://x/./y/../z?q#f", kRfcBase, "https://x/z?q#f"},
        // The first "//" anywhere in a reference without a scheme starts an authority; RFC 3986
        // would read "a/b//c" as a relative path (http://a/b/c/a/b//c).
        {"a/b//c", kRfcBase, "http://c"},
        // A "?" before the first "/" of the authority stays inside it, so "/../y" is a path
        // here; RFC 3986 would end the authority at the "?" (http://h?x=/../y).
        {"//h?x=/../y", kRfcBase, "http://h?x=/y"},
        // clang-format on
    };
    for (const Case& c : cases) {
        EXPECT_EQ(c.expected, Resolve(c.ref, c.base)) << c.ref << " from " << c.base;
    }
}

// Components as "scheme|authority|path|query|fragment".
TEST(ComponentOfUri, Splits) {
    const char* const cases[][2] = {
        // clang-format off
        {"http://host:80/p/q?x=1#f", "http|host:80|/p/q|x=1|f"}, {"p/q", "||p/q||"},
        {"x:", "x||||"}, {"http://host?x#f", "http|host||x|f"}, {"http://host#f", "http|host|||f"},
        {"mailto:a@b", "mailto||a@b||"}, {"//g", "|g|||"}, {"?y", "|||y|"}, {"#s", "||||s"},
        {"a/b:c", "||a/b:c||"},
        // A "#" before the "?" does not end the path: the first "?" does; RFC 3986 would give
        // the path /p and the fragment f?q.
        {"/p#f?q", "||/p#f|q|"},
        // A "?" inside the authority stays there; RFC 3986 would end the authority at it.
        {"http://h?x=/y", "http|h?x=|/y||"},
        // clang-format on
    };
    for (const auto& c : cases) {
        UrlBuffer scheme, authority, path, query, fragment, uri(c[0]);
        EXPECT_EQ(0u, GetComponentOfURI(scheme.bytes, authority.bytes, path.bytes, query.bytes,
                                        fragment.bytes, uri.bytes));
        EXPECT_EQ(c[1], std::string(scheme.bytes) + "|" + authority.bytes + "|" + path.bytes + "|" +
                            query.bytes + "|" + fragment.bytes)
            << c[0];
    }
}

TEST(DotSegments, Removes) {
    const char* const cases[][2] = {
        // clang-format off
        {"/a/b/c/./../../g", "/a/g"}, {"mid/content=5/../6", "mid/6"}, {"/.x", "/.x"},
        {"/..x", "/..x"}, {"/a/.x/..y/z", "/a/.x/..y/z"}, {"./a", "a"}, {"../a", "a"}, {".", ""},
        {"..", ""}, {"/.", "/"}, {"/a/..", "/"}, {"/../../x", "/x"}, {"a/", "a/"}, {"", ""},
        // clang-format on
    };
    for (const auto& c : cases) {
        UrlBuffer out, in(c[0]);
        EXPECT_EQ(0u, RemoveDotSegments(out.bytes, in.bytes));
        EXPECT_STREQ(c[1], out.bytes) << c[0];
    }
    // The result is appended to what out already holds.
    UrlBuffer out("/base"), in("/x/./y");
    RemoveDotSegments(out.bytes, in.bytes);
    EXPECT_STREQ("/base/x/y", out.bytes);
}

TEST(MergePath, Cases) {
    // Base authority, base path, reference path, merged path.
    const char* const cases[][4] = {
        // clang-format off
        {"a", "", "g", "/g"}, {"a", "/b/c/d;p", "g", "/b/c/g"}, {"", "nodir", "g", "g"},
        {"", "x/y", "g", "x/g"},
        // clang-format on
    };
    for (const auto& c : cases) {
        UrlBuffer out("old"), authority(c[0]), basePath(c[1]), ref(c[2]);
        EXPECT_EQ(0u, MergeURIPath(out.bytes, authority.bytes, basePath.bytes, ref.bytes));
        EXPECT_STREQ(c[3], out.bytes) << c[1] << " + " << c[2];
    }
}

TEST(GenerateUri, Cases) {
    // Scheme, authority, path, query, fragment, URI.
    const char* const cases[][6] = {
        // clang-format off
        {"http", "h", "/p", "q", "f", "http://h/p?q#f"}, {"", "", "p/q", "", "", "p/q"},
        {"", "", "p", "q", "f", "p?q#f"}, {"g", "", "h", "", "", "g:h"},
        {"http", "h", "", "", "", "http://h"},
        // clang-format on
    };
    for (const auto& c : cases) {
        UrlBuffer out("old"), s(c[0]), a(c[1]), p(c[2]), q(c[3]), f(c[4]);
        EXPECT_EQ(0u, GeneateURI(s.bytes, a.bytes, p.bytes, q.bytes, f.bytes, out.bytes));
        EXPECT_STREQ(c[5], out.bytes);
    }
}

// Null arguments are skipped; a null or empty base or URI leaves things alone.
TEST(Uri, NullAndEmptyArguments) {
    UrlBuffer out("unchanged"), text("x"), ref("../c"), base("http://a/b?q#f"), empty;
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

    UrlBuffer scheme("s"), query;
    GetComponentOfURI(scheme.bytes, nullptr, nullptr, query.bytes, nullptr, empty.bytes);
    GetComponentOfURI(scheme.bytes, nullptr, nullptr, query.bytes, nullptr, nullptr);
    EXPECT_STREQ("s", scheme.bytes);
    EXPECT_STREQ("", query.bytes);
    GetComponentOfURI(nullptr, nullptr, nullptr, query.bytes, nullptr, base.bytes);
    EXPECT_STREQ("q", query.bytes);

    UrlBuffer path("/p"), generated;
    GeneateURI(nullptr, nullptr, path.bytes, nullptr, nullptr, generated.bytes);
    EXPECT_STREQ("/p", generated.bytes);
}

// Inputs beyond the buffers are cut to 2047 characters, never written past.
TEST(Uri, OverlongInputsAreCut) {
    std::string base = "http://host/" + std::string(3000, 'd') + "/b.xml";
    std::string ref(5000, 'r');
    UrlBuffer out;
    CombineURL(out.bytes, &ref[0], &base[0]);
    EXPECT_EQ(kUrlSize - 1, strlen(out.bytes));
    EXPECT_EQ(0, strncmp(out.bytes, "http://host/ddd", 15));

    ref = "../" + std::string(6000, 'g') + "?" + std::string(6000, 'q');
    base = "http://a/" + std::string(6000, 'b') + "/c";
    UrlBuffer resolved;
    EXPECT_EQ(0u, ResolveURI(resolved.bytes, &ref[0], &base[0]));
    EXPECT_LE(strlen(resolved.bytes), kUrlSize - 1);
    // The base path was cut before its last "/", so the reference lands in its first directory.
    EXPECT_EQ(0, strncmp(resolved.bytes, "http://a/ggg", 12));

    std::string uri = "http://" + std::string(4000, 'h') + "/" + std::string(4000, 'p');
    UrlBuffer authority, path;
    GetComponentOfURI(nullptr, authority.bytes, path.bytes, nullptr, nullptr, &uri[0]);
    EXPECT_EQ(kUrlSize - 1, strlen(authority.bytes));
    EXPECT_EQ(kUrlSize - 1, strlen(path.bytes));
    EXPECT_EQ('/', path.bytes[0]);

    std::string segments;
    while (segments.size() < 3000) segments += "/a";
    UrlBuffer dotFree;
    RemoveDotSegments(dotFree.bytes, &segments[0]);
    EXPECT_EQ(kUrlSize - 1, strlen(dotFree.bytes));
}

}  // namespace
