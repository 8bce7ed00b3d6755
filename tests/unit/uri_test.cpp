// URL joining and resolution: CombineURL, ResolveURI and its component functions.
#include "ka/uri.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

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

std::string Combine(const std::string& ref, const std::string& base) {
    UrlBuffer out;
    UrlBuffer r(ref);
    UrlBuffer b(base);
    EXPECT_EQ(0u, CombineURL(out.bytes, r.bytes, b.bytes));
    return out.bytes;
}

std::string Resolve(const std::string& ref, const std::string& base) {
    UrlBuffer out("garbage that must be replaced");
    UrlBuffer r(ref);
    UrlBuffer b(base);
    EXPECT_EQ(0u, ResolveURI(out.bytes, r.bytes, b.bytes));
    return out.bytes;
}

struct Case {
    const char* ref;
    const char* base;
    const char* expected;
};

// ---- CombineURL ----

class CombineUrlTest : public ::testing::TestWithParam<Case> {};

TEST_P(CombineUrlTest, JoinsReferenceToBase) {
    const Case& c = GetParam();
    EXPECT_EQ(c.expected, Combine(c.ref, c.base)) << "ref " << c.ref << " base " << c.base;
}

INSTANTIATE_TEST_SUITE_P(
    Cases, CombineUrlTest,
    ::testing::Values(
        Case{"c.xml", "http://host/a/b.xml", "http://host/a/c.xml"},
        // The "/" inside the query does not count as the directory.
        Case{"c.xml", "http://host/a/b?u=x/y", "http://host/a/c.xml"},
        Case{"c.xml", "http://host/a/b?u=1", "http://host/a/c.xml"},
        Case{"/z", "https://host/a/b", "https://host/z"},
        Case{"/z", "http://host/a/b", "http://host/z"},
        Case{"/z", "https://host", "https://host/z"},
        Case{"c.xml", "https://host/", "https://host/c.xml"},
        // Any scheme of the table anywhere in the reference keeps the reference alone.
        Case{"http://other/x", "http://host/a/b", "http://other/x"},
        Case{"https://other/x", "C:\\x\\y.xml", "https://other/x"},
        Case{"iprm://k", "http://host/a/b", "iprm://k"},
        Case{"vrkp://k", "http://host/a/b", "vrkp://k"},
        Case{"vrkps://k", "/dir/file", "vrkps://k"},
        Case{"smdrm://k", "http://host/a/b", "smdrm://k"},
        Case{"tivocrypt://k", "http://host/a/b", "tivocrypt://k"},
        Case{"go?to=http://x", "http://host/a/b", "go?to=http://x"},
        // File path bases keep their directory, whichever separator they use.
        Case{"c.xml", "C:\\x\\y.xml", "C:\\x\\c.xml"},
        Case{"c.xml", "/data/ads/y.xml", "/data/ads/c.xml"}, Case{"c.xml", "nodirectory", "c.xml"},
        // Two absolute file paths: the reference alone.
        Case{"/other/c.xml", "/data/y.xml", "/other/c.xml"},
        Case{"", "http://host/a/b", "http://host/a/"}));

TEST(CombineUrl, NullArgumentsWriteNothing) {
    UrlBuffer out("unchanged");
    UrlBuffer text("x");
    EXPECT_EQ(0u, CombineURL(nullptr, text.bytes, text.bytes));
    EXPECT_EQ(0u, CombineURL(out.bytes, nullptr, text.bytes));
    EXPECT_EQ(0u, CombineURL(out.bytes, text.bytes, nullptr));
    EXPECT_STREQ("unchanged", out.bytes);
}

TEST(CombineUrl, OverlongInputsAreCut) {
    std::string base = "http://host/" + std::string(3000, 'd') + "/b.xml";
    std::vector<char> ref(5000, 'r');
    ref.back() = '\0';
    std::vector<char> longBase(base.begin(), base.end());
    longBase.push_back('\0');
    UrlBuffer out;
    CombineURL(out.bytes, ref.data(), longBase.data());
    EXPECT_EQ(kUrlSize - 1, strlen(out.bytes));
    EXPECT_EQ(0, strncmp(out.bytes, "http://host/ddd", 15));
}

// ---- ResolveURI ----

class ResolveUriTest : public ::testing::TestWithParam<Case> {};

TEST_P(ResolveUriTest, ResolvesAgainstBase) {
    const Case& c = GetParam();
    EXPECT_EQ(c.expected, Resolve(c.ref, c.base)) << "ref " << c.ref << " base " << c.base;
}

constexpr const char* kRfcBase = "http://a/b/c/d;p?q";

// The normal examples of RFC 3986 section 5.4.1.
INSTANTIATE_TEST_SUITE_P(
    RfcNormal, ResolveUriTest,
    ::testing::Values(
        Case{"g:h", kRfcBase, "g:h"}, Case{"g", kRfcBase, "http://a/b/c/g"},
        Case{"./g", kRfcBase, "http://a/b/c/g"}, Case{"g/", kRfcBase, "http://a/b/c/g/"},
        Case{"/g", kRfcBase, "http://a/g"}, Case{"//g", kRfcBase, "http://g"},
        Case{"?y", kRfcBase, "http://a/b/c/d;p?y"}, Case{"g?y", kRfcBase, "http://a/b/c/g?y"},
        Case{"#s", kRfcBase, "http://a/b/c/d;p?q#s"}, Case{"g#s", kRfcBase, "http://a/b/c/g#s"},
        Case{"g?y#s", kRfcBase, "http://a/b/c/g?y#s"}, Case{";x", kRfcBase, "http://a/b/c/;x"},
        Case{"g;x", kRfcBase, "http://a/b/c/g;x"},
        Case{"g;x?y#s", kRfcBase, "http://a/b/c/g;x?y#s"}, Case{"", kRfcBase, "http://a/b/c/d;p?q"},
        Case{".", kRfcBase, "http://a/b/c/"}, Case{"./", kRfcBase, "http://a/b/c/"},
        Case{"..", kRfcBase, "http://a/b/"}, Case{"../", kRfcBase, "http://a/b/"},
        Case{"../g", kRfcBase, "http://a/b/g"}, Case{"../..", kRfcBase, "http://a/"},
        Case{"../../", kRfcBase, "http://a/"}, Case{"../../g", kRfcBase, "http://a/g"}));

INSTANTIATE_TEST_SUITE_P(
    Library, ResolveUriTest,
    ::testing::Values(
        Case{"../c", "http://a/b/d/e", "http://a/b/c"},
        Case{"?y", "http://a/b/d/e", "http://a/b/d/e?y"}, Case{"../c", "", "../c"},
        Case{"../../../g", kRfcBase, "http://a/g"}, Case{"g", "http://a", "http://a/g"},
        Case{"https://x/./y/../z?q#f", kRfcBase, "https://x/z?q#f"},
        // The first "//" anywhere in a reference without a scheme starts an authority; RFC 3986
        // would read "a/b//c" as a relative path (http://a/b/c/a/b//c).
        Case{"a/b//c", kRfcBase, "http://c"},
        // A "?" before the first "/" of the authority stays inside it, so "/../y" is a path
        // here; RFC 3986 would end the authority at the "?" (http://h?x=/../y).
        Case{"//h?x=/../y", kRfcBase, "http://h?x=/y"}));

TEST(ResolveUri, NullBaseCopiesReference) {
    UrlBuffer out;
    UrlBuffer ref("../c");
    EXPECT_EQ(0u, ResolveURI(out.bytes, ref.bytes, nullptr));
    EXPECT_STREQ("../c", out.bytes);
}

TEST(ResolveUri, NullOutIsIgnored) {
    UrlBuffer ref("g");
    UrlBuffer base(kRfcBase);
    EXPECT_EQ(0u, ResolveURI(nullptr, ref.bytes, base.bytes));
}

TEST(ResolveUri, NullReferenceResolvesToBaseWithoutFragment) {
    UrlBuffer out;
    UrlBuffer base("http://a/b?q#f");
    EXPECT_EQ(0u, ResolveURI(out.bytes, nullptr, base.bytes));
    EXPECT_STREQ("http://a/b?q", out.bytes);
}

TEST(ResolveUri, OverlongInputsAreCut) {
    const std::string ref = "../" + std::string(6000, 'g') + "?" + std::string(6000, 'q');
    const std::string base = "http://a/" + std::string(6000, 'b') + "/c";
    std::vector<char> r(ref.begin(), ref.end());
    std::vector<char> b(base.begin(), base.end());
    r.push_back('\0');
    b.push_back('\0');
    UrlBuffer out;
    EXPECT_EQ(0u, ResolveURI(out.bytes, r.data(), b.data()));
    EXPECT_LE(strlen(out.bytes), kUrlSize - 1);
    // The base path was cut before its last "/", so the reference lands in its first directory.
    EXPECT_EQ(0, strncmp(out.bytes, "http://a/ggg", 12));
}

// ---- GetComponentOfURI ----

struct Components {
    const char* uri;
    const char* scheme;
    const char* authority;
    const char* path;
    const char* query;
    const char* fragment;
};

class ComponentTest : public ::testing::TestWithParam<Components> {};

TEST_P(ComponentTest, Splits) {
    const Components& c = GetParam();
    UrlBuffer scheme, authority, path, query, fragment;
    UrlBuffer uri(c.uri);
    EXPECT_EQ(0u, GetComponentOfURI(scheme.bytes, authority.bytes, path.bytes, query.bytes,
                                    fragment.bytes, uri.bytes));
    EXPECT_STREQ(c.scheme, scheme.bytes) << c.uri;
    EXPECT_STREQ(c.authority, authority.bytes) << c.uri;
    EXPECT_STREQ(c.path, path.bytes) << c.uri;
    EXPECT_STREQ(c.query, query.bytes) << c.uri;
    EXPECT_STREQ(c.fragment, fragment.bytes) << c.uri;
}

INSTANTIATE_TEST_SUITE_P(
    Cases, ComponentTest,
    ::testing::Values(
        Components{"http://host:80/p/q?x=1#f", "http", "host:80", "/p/q", "x=1", "f"},
        Components{"p/q", "", "", "p/q", "", ""}, Components{"x:", "x", "", "", "", ""},
        Components{"http://host", "http", "host", "", "", ""},
        Components{"http://host?x#f", "http", "host", "", "x", "f"},
        Components{"http://host#f", "http", "host", "", "", "f"},
        Components{"mailto:a@b", "mailto", "", "a@b", "", ""},
        Components{"//g", "", "g", "", "", ""}, Components{"?y", "", "", "", "y", ""},
        Components{"#s", "", "", "", "", "s"}, Components{"a/b:c", "", "", "a/b:c", "", ""},
        // A "#" before the "?" does not end the path: the first "?" does; RFC 3986 would give
        // the path /p and the fragment f?q.
        Components{"/p#f?q", "", "", "/p#f", "q", ""},
        // A "?" inside the authority stays there; RFC 3986 would end the authority at it.
        Components{"http://h?x=/y", "http", "h?x=", "/y", "", ""}));

TEST(ComponentOfUri, EmptyUriLeavesOutputsUntouched) {
    UrlBuffer scheme("s");
    UrlBuffer path("p");
    UrlBuffer empty;
    GetComponentOfURI(scheme.bytes, nullptr, path.bytes, nullptr, nullptr, empty.bytes);
    GetComponentOfURI(scheme.bytes, nullptr, path.bytes, nullptr, nullptr, nullptr);
    EXPECT_STREQ("s", scheme.bytes);
    EXPECT_STREQ("p", path.bytes);
}

TEST(ComponentOfUri, NullOutputsAreSkipped) {
    UrlBuffer query;
    UrlBuffer uri("http://h/p?q#f");
    GetComponentOfURI(nullptr, nullptr, nullptr, query.bytes, nullptr, uri.bytes);
    EXPECT_STREQ("q", query.bytes);
}

TEST(ComponentOfUri, OverlongComponentsAreCut) {
    const std::string text = "http://" + std::string(4000, 'h') + "/" + std::string(4000, 'p');
    std::vector<char> uri(text.begin(), text.end());
    uri.push_back('\0');
    UrlBuffer authority, path;
    GetComponentOfURI(nullptr, authority.bytes, path.bytes, nullptr, nullptr, uri.data());
    EXPECT_EQ(kUrlSize - 1, strlen(authority.bytes));
    EXPECT_EQ(kUrlSize - 1, strlen(path.bytes));
    EXPECT_EQ('/', path.bytes[0]);
}

// ---- RemoveDotSegments, MergeURIPath, GeneateURI ----

struct PathCase {
    const char* in;
    const char* out;
};

class DotSegmentTest : public ::testing::TestWithParam<PathCase> {};

TEST_P(DotSegmentTest, Removes) {
    UrlBuffer out;
    UrlBuffer in(GetParam().in);
    EXPECT_EQ(0u, RemoveDotSegments(out.bytes, in.bytes));
    EXPECT_STREQ(GetParam().out, out.bytes) << GetParam().in;
}

INSTANTIATE_TEST_SUITE_P(
    Cases, DotSegmentTest,
    ::testing::Values(PathCase{"/a/b/c/./../../g", "/a/g"}, PathCase{"mid/content=5/../6", "mid/6"},
                      PathCase{"/.x", "/.x"}, PathCase{"/..x", "/..x"},
                      PathCase{"/a/.x/..y/z", "/a/.x/..y/z"}, PathCase{"./a", "a"},
                      PathCase{"../a", "a"}, PathCase{".", ""}, PathCase{"..", ""},
                      PathCase{"/.", "/"}, PathCase{"/a/..", "/"}, PathCase{"/../../x", "/x"},
                      PathCase{"a/", "a/"}, PathCase{"", ""}));

TEST(DotSegments, AppendsToOutput) {
    UrlBuffer out("/base");
    UrlBuffer in("/x/./y");
    RemoveDotSegments(out.bytes, in.bytes);
    EXPECT_STREQ("/base/x/y", out.bytes);
}

TEST(DotSegments, OverlongPathIsCut) {
    std::string text;
    while (text.size() < 3000) text += "/a";
    std::vector<char> in(text.begin(), text.end());
    in.push_back('\0');
    UrlBuffer out;
    RemoveDotSegments(out.bytes, in.data());
    EXPECT_EQ(kUrlSize - 1, strlen(out.bytes));
    EXPECT_EQ(0, strncmp(out.bytes, "/a/a/a", 6));
}

TEST(MergePath, Cases) {
    struct MergeCase {
        const char* authority;
        const char* basePath;
        const char* ref;
        const char* out;
    } cases[] = {
        {"a", "", "g", "/g"},
        {"a", "/b/c/d;p", "g", "/b/c/g"},
        {"", "nodir", "g", "g"},
        {"", "x/y", "g", "x/g"},
    };
    for (const MergeCase& c : cases) {
        UrlBuffer out("old");
        UrlBuffer authority(c.authority), basePath(c.basePath), ref(c.ref);
        EXPECT_EQ(0u, MergeURIPath(out.bytes, authority.bytes, basePath.bytes, ref.bytes));
        EXPECT_STREQ(c.out, out.bytes) << c.basePath << " + " << c.ref;
    }
}

TEST(GenerateUri, Cases) {
    struct GenerateCase {
        const char* scheme;
        const char* authority;
        const char* path;
        const char* query;
        const char* fragment;
        const char* out;
    } cases[] = {
        {"http", "h", "/p", "q", "f", "http://h/p?q#f"},
        {"", "", "p/q", "", "", "p/q"},
        {"", "", "p", "q", "f", "p?q#f"},
        {"g", "", "h", "", "", "g:h"},
        {"http", "h", "", "", "", "http://h"},
    };
    for (const GenerateCase& c : cases) {
        UrlBuffer out("old");
        UrlBuffer s(c.scheme), a(c.authority), p(c.path), q(c.query), f(c.fragment);
        EXPECT_EQ(0u, GeneateURI(s.bytes, a.bytes, p.bytes, q.bytes, f.bytes, out.bytes));
        EXPECT_STREQ(c.out, out.bytes);
    }
}

TEST(GenerateUri, NullComponentsAreAbsent) {
    UrlBuffer out;
    UrlBuffer path("/p");
    GeneateURI(nullptr, nullptr, path.bytes, nullptr, nullptr, out.bytes);
    EXPECT_STREQ("/p", out.bytes);
}

}  // namespace
