// CXMLDocument over the real XML parser module, loaded from the modules folder through
// libkadl.so: what the parsers rely on of it, and what it answers without a module.
#include "xml/xml_document.h"

#include <gtest/gtest.h>

#include <cstring>
#include <fstream>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "platform/limits.h"

namespace {

using Strings = std::vector<std::string>;

// SetWorkPath keeps the pointer, so the paths live as long as the program.
char gModulesDir[] = KA_MODULES_DIR;
char gMissingDir[] = "/nonexistent-ka-modules/";

// Outputs start as these, so a call that must not touch them can be seen to.
void* const kSentinel = reinterpret_cast<void*>(0x1234);
char gUntouched[] = "untouched";
constexpr int kLengthSentinel = 77;
const char* const kNull = "<null>";

// A string output as the tests compare it; the length must agree with the string.
std::string Shown(const char* text, int length) {
    EXPECT_EQ(length, text == nullptr ? 0 : static_cast<int>(strlen(text)));
    return text == nullptr ? kNull : text;
}

class XmlDocumentTest : public ::testing::Test {
protected:
    void SetUp() override { mStartObjects = CSDKObject::g_kaSDKObjectNum; }
    void TearDown() override {
        mDocuments.clear();
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, mStartObjects);
    }

    CXMLDocument& NewDocument(char* workPath = nullptr) {
        mDocuments.push_back(std::make_unique<CXMLDocument>());
        if (workPath != nullptr) mDocuments.back()->SetWorkPath(workPath);
        return *mDocuments.back();
    }
    CXMLDocument& OpenDocument() {
        CXMLDocument& document = NewDocument(gModulesDir);
        EXPECT_EQ(document.InitXMLParser(), KA_OK);
        EXPECT_NE(document.mXMLHandle, nullptr);
        return document;
    }

    // The buffer is gone once the load returns: nothing may point into it.
    static unsigned int Load(CXMLDocument& document, const std::string& text) {
        std::vector<char> buffer(text.begin(), text.end());
        return document.LoadXML(buffer.data(), static_cast<int>(buffer.size()), ka::kXmlLoadMode);
    }

    static void* Root(CXMLDocument& d) {
        void* root = kSentinel;
        d.GetFirstChild(nullptr, &root);
        return root;
    }
    static void* ChildByName(CXMLDocument& d, void* node, std::string name) {
        void* child = kSentinel;
        d.GetChildByName(node, name.data(), &child);
        return child;
    }
    // A string lookup started from sentinels, as Shown gives it.
    template <class Lookup>
    static std::string Looked(Lookup lookup) {
        char* string = gUntouched;
        int length = kLengthSentinel;
        lookup(&string, length);
        return Shown(string, length);
    }
    static std::string Name(CXMLDocument& d, void* node) {
        return Looked([&](char** s, int& n) { d.GetTagName(node, s, n); });
    }
    static std::string Text(CXMLDocument& d, void* node) {
        return Looked([&](char** s, int& n) { d.GetTagValue(node, s, n); });
    }
    static std::string Attribute(CXMLDocument& d, void* node, std::string name) {
        return Looked([&](char** s, int& n) { d.GetAttributeValue(node, name.data(), s, n); });
    }

    // Element children through GetFirstChild and GetNextSibling, each of which must write.
    static std::vector<void*> Children(CXMLDocument& d, void* node) {
        std::vector<void*> children;
        void* child = kSentinel;
        EXPECT_EQ(d.GetFirstChild(node, &child), KA_OK);
        while (child != kSentinel && child != nullptr) {
            children.push_back(child);
            child = kSentinel;
            EXPECT_EQ(d.GetNextSibling(children.back(), &child), KA_OK);
        }
        EXPECT_NE(child, kSentinel);
        return children;
    }
    static Strings ChildNames(CXMLDocument& d, void* node) {
        Strings names;
        for (void* child : Children(d, node)) names.push_back(Name(d, child));
        return names;
    }

    std::vector<std::unique_ptr<CXMLDocument>> mDocuments;
    int mStartObjects = 0;
};

TEST_F(XmlDocumentTest, WithoutModuleOperationsAnswerNotLoaded) {
    for (char* workPath : {static_cast<char*>(nullptr), gMissingDir, gModulesDir}) {
        SCOPED_TRACE(workPath != nullptr ? workPath : "never initialised");
        CXMLDocument& document = NewDocument(workPath);
        if (workPath != nullptr) {
            EXPECT_EQ(document.InitXMLParser(),
                      workPath == gModulesDir ? KA_OK : KA_ERR_MODULE_NOT_LOADED);
            EXPECT_EQ(document.UninitXMLParser(), KA_OK);  // the released module, last
        }
        EXPECT_EQ(document.mXMLHandle, nullptr);
        EXPECT_EQ(document.mLibHandle, nullptr);
        void* node = kSentinel;
        char* text = gUntouched;
        int length = kLengthSentinel;
        char name[] = "a";
        EXPECT_EQ(document.LoadXML(name, 1, ka::kXmlLoadMode), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetFirstChild(nullptr, &node), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetChildByName(nullptr, name, &node), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetTagValue(nullptr, &text, length), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetAttributeValue(nullptr, name, &text, length),
                  KA_ERR_MODULE_NOT_LOADED);
        EXPECT_TRUE(node == kSentinel && text == gUntouched && length == kLengthSentinel);
        // Init works again after any of these.
        document.SetWorkPath(gModulesDir);
        ASSERT_EQ(document.InitXMLParser(), KA_OK);
        EXPECT_EQ(Load(document, "<a/>"), KA_OK);
    }
}

// The VAST parser reads nodes of the VMAP parser's document through its own handle: the
// playlist, loaded by one handle, is read through another, and what it lent stays valid.
TEST_F(XmlDocumentTest, ReadsThePlaylistThroughAnotherHandle) {
    CXMLDocument& owner = OpenDocument();
    CXMLDocument& d = OpenDocument();
    ASSERT_NE(owner.mXMLHandle, d.mXMLHandle);
    std::ifstream file(KA_TEST_DATA_DIR "xml/playlist.xml", std::ios::binary);
    std::ostringstream playlist;
    playlist << file.rdbuf();
    ASSERT_EQ(Load(owner, playlist.str()), KA_OK);
    EXPECT_EQ(Root(d), nullptr);
    void* root = Root(owner);
    ASSERT_NE(root, nullptr);
    void* source = ChildByName(d, ChildByName(d, root, "vmap:AdBreak"), "vmap:AdSource");
    void* uri = ChildByName(d, source, "vmap:AdTagURI");
    ASSERT_NE(uri, nullptr);
    char *name = nullptr, *text = nullptr, *value = nullptr;
    int length = 0;
    char attribute[] = "templateType";
    d.GetTagName(uri, &name, length);
    owner.GetTagValue(uri, &text, length);
    d.GetAttributeValue(uri, attribute, &value, length);
    ASSERT_TRUE(name != nullptr && text != nullptr && value != nullptr);

    EXPECT_EQ(Name(d, root), "vmap:VMAP");
    // Only element children, with their prefixes and case as written.
    EXPECT_EQ(ChildNames(d, root),
              (Strings{"vmap:AdBreak", "vmap:adbreak", "vmap:AdBreak", "vmap:Extensions"}));
    std::vector<void*> breaks = Children(d, root);
    ASSERT_EQ(breaks.size(), 4u);
    EXPECT_EQ(ChildNames(d, breaks[0]), (Strings{"vmap:AdSource", "vmap:TrackingEvents"}));
    EXPECT_TRUE(Children(d, breaks[1]).empty());
    // Names match exactly, among direct children only; the first of equal names wins.
    const std::pair<const char*, void*> lookups[] = {
        {"vmap:AdBreak", breaks[0]},    {"vmap:adbreak", breaks[1]},
        {"vmap:Extensions", breaks[3]}, {"AdBreak", nullptr},
        {"vmap:ADBREAK", nullptr},      {"vmap:AdBreak ", nullptr},
        {"vmap:AdSource", nullptr},     {"", nullptr}};
    for (const auto& [name, node] : lookups) EXPECT_EQ(ChildByName(d, root, name), node) << name;
    // Attribute values raw as written; names are case-sensitive.
    const std::pair<const char*, const char*> attributes[] = {{"timeOffset", "start"},
                                                              {"breakId", "pre&amp;roll"},
                                                              {"timeoffset", kNull},
                                                              {"missing", kNull}};
    for (const auto& [name, value] : attributes) EXPECT_EQ(Attribute(d, breaks[0], name), value);
    EXPECT_EQ(Attribute(d, root, "xmlns:vmap"), "http://www.iab.net/videosuite/vmap");
    void* tracking =
        ChildByName(d, ChildByName(d, breaks[0], "vmap:TrackingEvents"), "vmap:Tracking");
    EXPECT_EQ(Text(d, root), "leading text");
    EXPECT_EQ(Text(d, tracking), "https://track.example/start?x=1&amp;y=2");
    EXPECT_EQ(Text(d, ChildByName(d, breaks[3], "vmap:Extension")), "![CDATA[]]");
    EXPECT_EQ(Text(d, source), kNull);

    // Neither those lookups nor the other handle's loads touch the owner's strings.
    ASSERT_EQ(Load(d, "<other/>"), KA_OK);
    EXPECT_STREQ(name, "vmap:AdTagURI");
    EXPECT_STREQ(text, "![CDATA[  https://ads.example/tag?a=1&amp;b=2  ]]");
    EXPECT_STREQ(value, "vast3");
    EXPECT_EQ(Name(d, Root(d)), "other");
}

// The module's raw text is the first text or CDATA child, trimmed; record fields get it decoded.
TEST_F(XmlDocumentTest, ElementTexts) {
    struct {
        const char* xml;
        const char* raw;      // what the module gives, kNull for no text
        const char* decoded;  // what GetElementText stores in an empty field
    } const cases[] = {
        {"<a>\n\t x \v\f\r</a>", "x", "x"},
        {"<a>  spaced  out  </a>", "spaced  out", "spaced  out"},
        {"<a>\xC2\xA0t\xA0</a>", "\xC2\xA0t\xA0", "\xC2\xA0t\xA0"},
        {"<a> \v </a>", kNull, kNull},
        {"<a/>", kNull, kNull},
        {"<a><b>inner</b></a>", kNull, kNull},
        {"<a><b/> tail </a>", "tail", "tail"},
        {"<a><!--c--> t <?pi?></a>", "t", "t"},
        {"<a>x<![CDATA[z]]></a>", "x", "x"},
        {"<a><![CDATA[z]]>x</a>", "![CDATA[z]]", "z"},
        {"<a>  <![CDATA[z]]>  </a>", "![CDATA[z]]", "z"},
        {"<a><![CDATA[  a?x=1&amp;y=2  ]]></a>", "![CDATA[  a?x=1&amp;y=2  ]]", "a?x=1&amp;y=2"},
        {"<a>a?x=1&amp;y=2</a>", "a?x=1&amp;y=2", "a?x=1&y=2"},
        {"<a><![CDATA[]]></a>", "![CDATA[]]", ""},
        {"<a>![CDATA[abc</a>", "![CDATA[abc", "![CDATA[abc"},
        {"<a> ![CDATA[ &amp; ]]</a>", "![CDATA[ &amp; ]]", "&amp;"},
        {"<a>&amp;&lt;&#38;&#x26;</a>", "&amp;&lt;&#38;&#x26;", "&&lt;&#38;&#x26;"},
        {"<a>&amp;amp;</a>", "&amp;amp;", "&amp;"},
    };
    auto shown = [](const char* field) { return std::string(field ? field : kNull); };
    CXMLDocument& document = OpenDocument();
    for (const auto& c : cases) {
        SCOPED_TRACE(c.xml);
        ASSERT_EQ(Load(document, c.xml), KA_OK);
        void* root = Root(document);
        EXPECT_EQ(Text(document, root), c.raw);
        char* field = nullptr;
        document.GetElementText(root, field);
        EXPECT_EQ(shown(field), c.decoded);
        delete[] field;
        // A field that holds a string keeps that very string when there is no text.
        char* const old = strcpy(new char[4], "old");
        field = old;
        document.GetElementText(root, field);
        if (c.raw == kNull) {
            EXPECT_EQ(field, old);
        }
        EXPECT_EQ(shown(field), c.raw == kNull ? "old" : c.decoded);
        delete[] field;

        const bool cdata = strncmp(c.raw, "![CDATA[", 8) == 0;
        EXPECT_EQ(Looked([&](char** s, int& n) {
                      EXPECT_EQ(document.IsElementCData(root, s, n),
                                cdata ? KA_OK : KA_ERR_LOAD_FAILED);
                  }),
                  c.raw);
    }
}

}  // namespace
