// CXMLDocument over the real XML parser module, loaded from the modules folder through libkadl.so.
#include "xml/xml_document.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstring>
#include <fstream>
#include <functional>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "../fakes/recording_xmlparser/recording_xmlparser.h"
#include "ka/result_codes.h"
#include "platform/limits.h"

namespace {

// SetWorkPath keeps the pointer, so the paths live as long as the program.
char gModulesDir[] = KA_MODULES_DIR;
char gMissingDir[] = "/nonexistent-ka-modules/";
char gRecordingDir[] = KA_FAKES_DIR "recording_xmlparser/";
char gNoEntryDir[] = KA_FAKES_DIR "xmlparser_without_entry/";

// Marks an output the call must not touch, or must overwrite.
void* const kNodeSentinel = reinterpret_cast<void*>(0x1234);
char gSentinelText[] = "untouched";
constexpr int kLengthSentinel = 77;
// How the helpers below show a null string.
const char* const kNull = "<null>";

std::string ReadDataFile(const std::string& name) {
    std::ifstream in(std::string(KA_TEST_DATA_DIR) + name, std::ios::binary);
    std::ostringstream content;
    content << in.rdbuf();
    return content.str();
}

int FilledSlots(const XMLParserAPI& api) {
    const bool slots[] = {
        api.Init != nullptr,
        api.Uninit != nullptr,
        api.LoadXML != nullptr,
        api.GetFirstChild != nullptr,
        api.GetNextSibling != nullptr,
        api.GetChildByName != nullptr,
        api.GetAttributeValue != nullptr,
        api.GetNextAttribute != nullptr,
        api.GetTagValue != nullptr,
        api.GetTagName != nullptr,
        api.SetParam != nullptr,
        api.GetParam != nullptr,
        api.Reserved12 != nullptr,
    };
    int filled = 0;
    for (bool slot : slots) filled += slot ? 1 : 0;
    return filled;
}

// A string output as the tests compare it; the length must agree with the string.
std::string Shown(const char* text, int length) {
    if (text == nullptr) {
        EXPECT_EQ(length, 0);
        return kNull;
    }
    EXPECT_EQ(length, static_cast<int>(strlen(text)));
    return text;
}

class XmlDocumentTest : public ::testing::Test {
  protected:
    void SetUp() override { mStartObjects = CSDKObject::g_kaSDKObjectNum; }

    void TearDown() override {
        mDocuments.clear();
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, mStartObjects);
    }

    CXMLDocument& NewDocument() {
        mDocuments.push_back(std::make_unique<CXMLDocument>());
        return *mDocuments.back();
    }

    CXMLDocument& OpenDocument() {
        CXMLDocument& document = NewDocument();
        document.SetWorkPath(gModulesDir);
        EXPECT_EQ(document.InitXMLParser(), KA_OK);
        EXPECT_NE(document.mXMLHandle, nullptr);
        return document;
    }

    // The buffer is gone once the load returns: nothing may point into it.
    static unsigned int Load(CXMLDocument& document, const std::string& text) {
        std::vector<char> buffer(text.begin(), text.end());
        return document.LoadXML(buffer.data(), static_cast<int>(buffer.size()), ka::kXmlLoadMode);
    }

    static void* Root(CXMLDocument& document) {
        void* root = kNodeSentinel;
        document.GetFirstChild(nullptr, &root);
        return root;
    }

    static void* FirstChild(CXMLDocument& document, void* node) {
        void* child = kNodeSentinel;
        EXPECT_EQ(document.GetFirstChild(node, &child), KA_OK);
        return child;
    }

    static void* ChildByName(CXMLDocument& document, void* node, const char* name) {
        void* child = kNodeSentinel;
        std::string copy = name;
        document.GetChildByName(node, copy.data(), &child);
        return child;
    }

    static std::string Name(CXMLDocument& document, void* node) {
        char* name = gSentinelText;
        int length = kLengthSentinel;
        document.GetTagName(node, &name, length);
        return Shown(name, length);
    }

    static std::string Text(CXMLDocument& document, void* node) {
        char* text = gSentinelText;
        int length = kLengthSentinel;
        document.GetTagValue(node, &text, length);
        return Shown(text, length);
    }

    static std::string Attribute(CXMLDocument& document, void* node, const char* name) {
        char* value = gSentinelText;
        int length = kLengthSentinel;
        std::string copy = name;
        document.GetAttributeValue(node, copy.data(), &value, length);
        return Shown(value, length);
    }

    static std::vector<void*> Children(CXMLDocument& document, void* node) {
        std::vector<void*> children;
        for (void* child = FirstChild(document, node); child != nullptr;) {
            children.push_back(child);
            void* next = kNodeSentinel;
            EXPECT_EQ(document.GetNextSibling(child, &next), KA_OK);
            EXPECT_NE(next, kNodeSentinel);
            child = next;
        }
        return children;
    }

    static std::vector<std::string> ChildNames(CXMLDocument& document, void* node) {
        std::vector<std::string> names;
        for (void* child : Children(document, node)) names.push_back(Name(document, child));
        return names;
    }

    std::vector<std::unique_ptr<CXMLDocument>> mDocuments;
    int mStartObjects = 0;
};

// ---- Life cycle --------------------------------------------------------------------------------

TEST_F(XmlDocumentTest, ConstructedDocumentHasNoModule) {
    CXMLDocument& document = NewDocument();
    EXPECT_EQ(document.mXMLHandle, nullptr);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 0);
    EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, mStartObjects + 1);
}

TEST_F(XmlDocumentTest, ForwardersBeforeInitLeaveOutputsUntouched) {
    CXMLDocument& document = NewDocument();
    char name[] = "a";
    char buffer[] = "<a/>";

    EXPECT_EQ(document.LoadXML(buffer, 4, ka::kXmlLoadMode), KA_ERR_MODULE_NOT_LOADED);

    void* node = kNodeSentinel;
    EXPECT_EQ(document.GetFirstChild(nullptr, &node), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);
    EXPECT_EQ(document.GetNextSibling(kNodeSentinel, &node), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);
    EXPECT_EQ(document.GetChildByName(kNodeSentinel, name, &node), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);

    char* text = gSentinelText;
    int length = kLengthSentinel;
    EXPECT_EQ(document.GetAttributeValue(kNodeSentinel, name, &text, length),
              KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(document.GetTagValue(kNodeSentinel, &text, length), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(document.GetTagName(kNodeSentinel, &text, length), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(text, gSentinelText);
    EXPECT_EQ(length, kLengthSentinel);

    char* value = gSentinelText;
    int valueLength = kLengthSentinel;
    EXPECT_EQ(document.GetNextAttribute(kNodeSentinel, &node, nullptr, &text, length, &value,
                                        valueLength),
              KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);
    EXPECT_EQ(text, gSentinelText);
    EXPECT_EQ(value, gSentinelText);
    EXPECT_EQ(length, kLengthSentinel);
    EXPECT_EQ(valueLength, kLengthSentinel);

    EXPECT_EQ(document.SetParam(1, nullptr), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(document.GetParam(1, &node), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);
    int a = 5;
    int b = 6;
    EXPECT_EQ(document.Reserved12(name, kNodeSentinel, a, b), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(a, 5);
    EXPECT_EQ(b, 6);
}

TEST_F(XmlDocumentTest, UninitOnNeverLoadedDocumentReturnsZero) {
    CXMLDocument& document = NewDocument();
    EXPECT_EQ(document.UninitXMLParser(), KA_OK);
    EXPECT_EQ(document.UninitXMLParser(), KA_OK);
    EXPECT_EQ(document.mXMLHandle, nullptr);
    EXPECT_EQ(document.mLibHandle, nullptr);
}

TEST_F(XmlDocumentTest, MissingModuleFailsInit) {
    CXMLDocument& document = NewDocument();
    document.SetWorkPath(gMissingDir);
    EXPECT_EQ(document.InitXMLParser(), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(document.mXMLHandle, nullptr);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 0);
    void* node = kNodeSentinel;
    EXPECT_EQ(document.GetFirstChild(nullptr, &node), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);
}

TEST_F(XmlDocumentTest, InitLoadsTheModuleAndFillsEverySlot) {
    CXMLDocument& document = OpenDocument();
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 13);
    EXPECT_NE(document.mLibHandle, nullptr);
    EXPECT_STREQ(document.mEntryName, "kaXMLGetParserAPI");
    EXPECT_EQ(std::string(document.mLibName), std::string(KA_MODULES_DIR) + "libkaXMLParser.so");
}

TEST_F(XmlDocumentTest, InitTwiceStartsAFreshHandle) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, "<a/>"), KA_OK);
    ASSERT_NE(Root(document), nullptr);

    EXPECT_EQ(document.InitXMLParser(), KA_OK);
    EXPECT_NE(document.mXMLHandle, nullptr);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 13);
    // The new handle holds no document yet.
    EXPECT_EQ(Root(document), nullptr);
    ASSERT_EQ(Load(document, "<b/>"), KA_OK);
    EXPECT_EQ(Name(document, Root(document)), "b");
}

TEST_F(XmlDocumentTest, UninitReturnsToTheConstructedState) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, "<a/>"), KA_OK);
    EXPECT_EQ(document.UninitXMLParser(), KA_OK);
    EXPECT_EQ(document.mXMLHandle, nullptr);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 0);
    EXPECT_EQ(document.mLibHandle, nullptr);
    void* node = kNodeSentinel;
    EXPECT_EQ(document.GetFirstChild(nullptr, &node), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(node, kNodeSentinel);
    // And it can be opened again.
    EXPECT_EQ(document.InitXMLParser(), KA_OK);
    EXPECT_EQ(Load(document, "<a/>"), KA_OK);
}

// ---- Walks and names ---------------------------------------------------------------------------

TEST_F(XmlDocumentTest, WalksElementChildrenOnlyWithPrefixedNames) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, ReadDataFile("xml/playlist.xml")), KA_OK);
    void* root = Root(document);
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(Name(document, root), "vmap:VMAP");
    EXPECT_EQ(ChildNames(document, root),
              (std::vector<std::string>{"vmap:AdBreak", "vmap:adbreak", "vmap:AdBreak",
                                        "vmap:Extensions"}));

    std::vector<void*> breaks = Children(document, root);
    ASSERT_EQ(breaks.size(), 4u);
    EXPECT_EQ(ChildNames(document, breaks[0]),
              (std::vector<std::string>{"vmap:AdSource", "vmap:TrackingEvents"}));
    // A leaf element has no child, and the walk writes null to say so.
    EXPECT_EQ(FirstChild(document, breaks[1]), nullptr);
    void* next = kNodeSentinel;
    EXPECT_EQ(document.GetNextSibling(breaks[3], &next), KA_OK);
    EXPECT_EQ(next, nullptr);
}

TEST_F(XmlDocumentTest, ChildByNameIsExactAndCaseSensitive) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, ReadDataFile("xml/playlist.xml")), KA_OK);
    void* root = Root(document);
    std::vector<void*> children = Children(document, root);
    ASSERT_EQ(children.size(), 4u);

    EXPECT_EQ(ChildByName(document, root, "vmap:AdBreak"), children[0]);
    EXPECT_EQ(ChildByName(document, root, "vmap:adbreak"), children[1]);
    EXPECT_EQ(ChildByName(document, root, "vmap:Extensions"), children[3]);
    for (const char* missing : {"AdBreak", "vmap:ADBREAK", "vmap:AdBreak ", "vmap:AdSource", ""}) {
        SCOPED_TRACE(missing);
        EXPECT_EQ(ChildByName(document, root, missing), nullptr);
    }
}

// ---- Attributes --------------------------------------------------------------------------------

TEST_F(XmlDocumentTest, AttributeValuesAreRaw) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, ReadDataFile("xml/playlist.xml")), KA_OK);
    void* root = Root(document);
    void* adBreak = ChildByName(document, root, "vmap:AdBreak");
    EXPECT_EQ(Attribute(document, root, "xmlns:vmap"), "http://www.iab.net/videosuite/vmap");
    EXPECT_EQ(Attribute(document, adBreak, "timeOffset"), "start");
    EXPECT_EQ(Attribute(document, adBreak, "breakId"), "pre&amp;roll");
    EXPECT_EQ(Attribute(document, adBreak, "timeoffset"), kNull);
    EXPECT_EQ(Attribute(document, adBreak, "missing"), kNull);

    ASSERT_EQ(Load(document, "<a e=\"\" ws=\"  x  \" ref=\"1&#10;2&lt;\" raw='x\r\ny\tz' q='\"'/>"),
              KA_OK);
    root = Root(document);
    EXPECT_EQ(Attribute(document, root, "e"), "");
    EXPECT_EQ(Attribute(document, root, "ws"), "  x  ");
    EXPECT_EQ(Attribute(document, root, "ref"), "1&#10;2&lt;");
    EXPECT_EQ(Attribute(document, root, "raw"), "x\r\ny\tz");
    EXPECT_EQ(Attribute(document, root, "q"), "\"");
}

TEST_F(XmlDocumentTest, NextAttributeWalksInDocumentOrder) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, "<a one=\"1\" two=\"&amp;\" three=\"\"/>"), KA_OK);
    void* root = Root(document);
    std::vector<std::string> seen;
    void* current = nullptr;
    for (int guard = 0; guard < 10; ++guard) {
        void* next = kNodeSentinel;
        char* name = gSentinelText;
        char* value = gSentinelText;
        int nameLength = kLengthSentinel;
        int valueLength = kLengthSentinel;
        EXPECT_EQ(
            document.GetNextAttribute(root, &next, current, &name, nameLength, &value, valueLength),
            KA_OK);
        if (next == nullptr) {
            EXPECT_EQ(Shown(name, nameLength), kNull);
            EXPECT_EQ(Shown(value, valueLength), kNull);
            break;
        }
        seen.push_back(Shown(name, nameLength) + "=" + Shown(value, valueLength));
        current = next;
    }
    EXPECT_EQ(seen, (std::vector<std::string>{"one=1", "two=&amp;", "three="}));
}

// ---- Texts -------------------------------------------------------------------------------------

struct TextCase {
    const char* xml;
    const char* text;  // kNull when the element has none
};

const TextCase kTextCases[] = {
    {"<a>  hi  </a>", "hi"},
    {"<a>\n\t x \v\f\r</a>", "x"},
    {"<a> \v </a>", kNull},
    {"<a>   </a>", kNull},
    {"<a/>", kNull},
    {"<a></a>", kNull},
    {"<a><![CDATA[ y ]]></a>", "![CDATA[ y ]]"},
    {"<a>  <![CDATA[z]]>  </a>", "![CDATA[z]]"},
    {"<a> \f <![CDATA[z]]></a>", "![CDATA[z]]"},
    {"<a><![CDATA[]]></a>", "![CDATA[]]"},
    {"<a><![CDATA[<b>&amp;</b>]]></a>", "![CDATA[<b>&amp;</b>]]"},
    {"<a>x<![CDATA[z]]></a>", "x"},
    {"<a><![CDATA[z]]>x</a>", "![CDATA[z]]"},
    {"<a>&amp;&lt;&#38;&#x26;</a>", "&amp;&lt;&#38;&#x26;"},
    {"<a><b>inner</b></a>", kNull},
    {"<a><b/> tail </a>", "tail"},
    {"<a><!--c--> t <?pi?></a>", "t"},
    {"<a>line1\r\nline2</a>", "line1\r\nline2"},
    {"<a>\xC2\xA0t\xA0</a>", "\xC2\xA0t\xA0"},
    {"<a>![CDATA[abc</a>", "![CDATA[abc"},
};

TEST_F(XmlDocumentTest, TextIsTheFirstTextOrCDataChildTrimmed) {
    CXMLDocument& document = OpenDocument();
    for (const TextCase& c : kTextCases) {
        SCOPED_TRACE(c.xml);
        ASSERT_EQ(Load(document, c.xml), KA_OK);
        EXPECT_EQ(Text(document, Root(document)), c.text);
    }
}

TEST_F(XmlDocumentTest, PlaylistTexts) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, ReadDataFile("xml/playlist.xml")), KA_OK);
    void* root = Root(document);
    void* adBreak = ChildByName(document, root, "vmap:AdBreak");
    void* source = ChildByName(document, adBreak, "vmap:AdSource");
    void* uri = ChildByName(document, source, "vmap:AdTagURI");
    void* events = ChildByName(document, adBreak, "vmap:TrackingEvents");
    void* tracking = ChildByName(document, events, "vmap:Tracking");
    void* extension =
        ChildByName(document, ChildByName(document, root, "vmap:Extensions"), "vmap:Extension");

    EXPECT_EQ(Text(document, root), "leading text");
    EXPECT_EQ(Text(document, uri), "![CDATA[  https://ads.example/tag?a=1&amp;b=2  ]]");
    EXPECT_EQ(Text(document, tracking), "https://track.example/start?x=1&amp;y=2");
    EXPECT_EQ(Text(document, extension), "![CDATA[]]");
    EXPECT_EQ(Text(document, source), kNull);
}

// ---- Loads -------------------------------------------------------------------------------------

const std::string kMalformed[] = {
    "",
    " \n ",
    "just text",
    "<a>",
    "<a></b>",
    "<a/><b/>",
    "text<a/>",
    "<a/>text",
    "<a/>\v",
    "<![CDATA[x]]><a/>",
    "<a b=1/>",
    "<a b='1/>",
    "<a><![CDATA[x</a>",
    "<a><!-- x</a>",
    "<?xml version='1.0'?>",
    "<!DOCTYPE a><a/>",
    "<!DOCTYPE a [<!ENTITY e 'x'>]><a>&e;</a>",
    "<!DOCTYPE a SYSTEM \"file:///etc/passwd\"><a/>",
    std::string("<a>x\0y</a>", 10),
    std::string("<a/>\0<b>", 8),
    std::string("\0<a/>", 5),
};

TEST_F(XmlDocumentTest, MalformedBufferFailsTheLoadAndDropsTheDocument) {
    CXMLDocument& document = OpenDocument();
    for (const std::string& xml : kMalformed) {
        SCOPED_TRACE(::testing::PrintToString(xml));
        ASSERT_EQ(Load(document, "<good/>"), KA_OK);
        EXPECT_NE(Load(document, xml), KA_OK);
        EXPECT_EQ(Root(document), nullptr);
    }
}

TEST_F(XmlDocumentTest, NullEmptyOrNegativeBufferFailsTheLoad) {
    CXMLDocument& document = OpenDocument();
    char buffer[] = "<a/>";
    EXPECT_NE(document.LoadXML(nullptr, 4, ka::kXmlLoadMode), KA_OK);
    EXPECT_NE(document.LoadXML(buffer, 0, ka::kXmlLoadMode), KA_OK);
    EXPECT_NE(document.LoadXML(buffer, -1, ka::kXmlLoadMode), KA_OK);
    EXPECT_EQ(Root(document), nullptr);
    // Only the given size is read.
    EXPECT_NE(document.LoadXML(buffer, 3, ka::kXmlLoadMode), KA_OK);
    EXPECT_EQ(document.LoadXML(buffer, 4, ka::kXmlLoadMode), KA_OK);
}

TEST_F(XmlDocumentTest, DeclarationCommentsBomAndTerminatorAreAccepted) {
    CXMLDocument& document = OpenDocument();
    const std::string accepted[] = {
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!-- before -->\n<a/>\n<!-- after -->\n",
        "\xEF\xBB\xBF<a/>",
        std::string("<a/>\0", 5),
        "\n\t <a/> \r\n",
    };
    for (const std::string& xml : accepted) {
        SCOPED_TRACE(::testing::PrintToString(xml));
        ASSERT_EQ(Load(document, xml), KA_OK);
        EXPECT_EQ(Name(document, Root(document)), "a");
    }
}

TEST_F(XmlDocumentTest, SecondLoadReplacesTheDocument) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, "<first><x/></first>"), KA_OK);
    EXPECT_EQ(ChildNames(document, Root(document)), std::vector<std::string>{"x"});
    ASSERT_EQ(Load(document, "<second>t</second>"), KA_OK);
    EXPECT_EQ(Name(document, Root(document)), "second");
    EXPECT_EQ(Text(document, Root(document)), "t");
    EXPECT_TRUE(ChildNames(document, Root(document)).empty());
}

TEST_F(XmlDocumentTest, DeepNestingLoadsAndWalks) {
    constexpr int kDepth = 100000;
    std::string xml;
    for (int i = 0; i < kDepth; ++i) xml += "<d>";
    xml += "<![CDATA[bottom]]>";
    for (int i = 0; i < kDepth; ++i) xml += "</d>";

    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, xml), KA_OK);
    void* node = Root(document);
    int depth = 1;
    for (void* child = FirstChild(document, node); child != nullptr;
         child = FirstChild(document, node)) {
        node = child;
        ++depth;
    }
    EXPECT_EQ(depth, kDepth);
    EXPECT_EQ(Text(document, node), "![CDATA[bottom]]");
}

TEST_F(XmlDocumentTest, StringsStayValidUntilTheNextLoad) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, ReadDataFile("xml/playlist.xml")), KA_OK);
    void* root = Root(document);
    void* uri = ChildByName(
        document,
        ChildByName(document, ChildByName(document, root, "vmap:AdBreak"), "vmap:AdSource"),
        "vmap:AdTagURI");
    char* name = nullptr;
    char* text = nullptr;
    char* value = nullptr;
    int length = 0;
    char attribute[] = "templateType";
    document.GetTagName(uri, &name, length);
    document.GetTagValue(uri, &text, length);
    document.GetAttributeValue(uri, attribute, &value, length);
    const std::string nameCopy = name;
    const std::string textCopy = text;
    const std::string valueCopy = value;

    // Many more lookups, including the same ones again.
    for (int i = 0; i < 100; ++i) {
        Text(document, uri);
        ChildNames(document, root);
    }
    EXPECT_EQ(name, nameCopy);
    EXPECT_EQ(text, textCopy);
    EXPECT_EQ(value, valueCopy);
}

// ---- Nodes shared between handles ---------------------------------------------------------------

TEST_F(XmlDocumentTest, NodesOfOneHandleWorkWithAnother) {
    CXMLDocument& owner = OpenDocument();
    CXMLDocument& reader = OpenDocument();
    ASSERT_NE(owner.mXMLHandle, reader.mXMLHandle);
    ASSERT_EQ(Load(owner, ReadDataFile("xml/playlist.xml")), KA_OK);
    EXPECT_EQ(Root(reader), nullptr);

    void* root = Root(owner);
    EXPECT_EQ(ChildNames(reader, root), ChildNames(owner, root));
    void* adBreak = ChildByName(reader, root, "vmap:AdBreak");
    EXPECT_EQ(adBreak, ChildByName(owner, root, "vmap:AdBreak"));
    EXPECT_EQ(Attribute(reader, adBreak, "breakId"), "pre&amp;roll");
    void* uri = ChildByName(reader, ChildByName(reader, adBreak, "vmap:AdSource"), "vmap:AdTagURI");
    ASSERT_NE(uri, nullptr);

    char* text = nullptr;
    int length = 0;
    reader.GetTagValue(uri, &text, length);
    ASSERT_NE(text, nullptr);
    const std::string expected = "![CDATA[  https://ads.example/tag?a=1&amp;b=2  ]]";
    EXPECT_EQ(text, expected);
    // The reader's own loads do not touch what belongs to the owner's document.
    ASSERT_EQ(Load(reader, "<other/>"), KA_OK);
    EXPECT_EQ(text, expected);
    EXPECT_EQ(Text(owner, uri), expected);
    EXPECT_EQ(Name(reader, Root(reader)), "other");
}

// ---- Arguments the module refuses ---------------------------------------------------------------

TEST_F(XmlDocumentTest, NullArgumentsGiveNullOutputs) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, "<a b='1'><c/></a>"), KA_OK);
    void* root = Root(document);

    void* node = kNodeSentinel;
    EXPECT_NE(document.GetNextSibling(nullptr, &node), KA_OK);
    EXPECT_EQ(node, nullptr);
    node = kNodeSentinel;
    EXPECT_NE(document.GetChildByName(root, nullptr, &node), KA_OK);
    EXPECT_EQ(node, nullptr);
    node = kNodeSentinel;
    EXPECT_NE(document.mXMLAPI.GetFirstChild(nullptr, root, &node), KA_OK);
    EXPECT_EQ(node, nullptr);

    char* text = gSentinelText;
    int length = kLengthSentinel;
    EXPECT_NE(document.GetTagName(nullptr, &text, length), KA_OK);
    EXPECT_EQ(Shown(text, length), kNull);
    text = gSentinelText;
    length = kLengthSentinel;
    EXPECT_NE(document.GetTagValue(nullptr, &text, length), KA_OK);
    EXPECT_EQ(Shown(text, length), kNull);
    text = gSentinelText;
    length = kLengthSentinel;
    EXPECT_NE(document.GetAttributeValue(root, nullptr, &text, length), KA_OK);
    EXPECT_EQ(Shown(text, length), kNull);

    EXPECT_NE(document.mXMLAPI.Init(nullptr, nullptr), KA_OK);
    EXPECT_NE(document.mXMLAPI.LoadXML(nullptr, nullptr, 0, ka::kXmlLoadMode), KA_OK);
    EXPECT_NE(document.mXMLAPI.Uninit(nullptr), KA_OK);
}

TEST_F(XmlDocumentTest, UnusedSlotsAnswerWithoutEffect) {
    CXMLDocument& document = OpenDocument();
    ASSERT_EQ(Load(document, "<a/>"), KA_OK);
    void* value = kNodeSentinel;
    EXPECT_NE(document.SetParam(1, nullptr), KA_OK);
    EXPECT_NE(document.GetParam(1, &value), KA_OK);
    int a = 5;
    int b = 6;
    char text[] = "a";
    EXPECT_NE(document.Reserved12(text, Root(document), a, b), KA_OK);
    EXPECT_EQ(a, 0);
    EXPECT_EQ(b, 0);
    EXPECT_EQ(Name(document, Root(document)), "a");
}

// ---- Element texts for record fields ------------------------------------------------------------

char* NewString(const char* text) {
    if (text == nullptr) return nullptr;
    char* copy = new char[strlen(text) + 1];
    memcpy(copy, text, strlen(text) + 1);
    return copy;
}

struct ElementTextCase {
    const char* xml;
    const char* before;  // the field's string before the call, or null
    const char* after;   // the field's string after it, or null
};

const ElementTextCase kElementTextCases[] = {
    {"<a><![CDATA[  a?x=1&amp;y=2  ]]></a>", nullptr, "a?x=1&amp;y=2"},
    {"<a>a?x=1&amp;y=2</a>", nullptr, "a?x=1&y=2"},
    {"<a><![CDATA[]]></a>", "x", ""},
    {"<a><![CDATA[   ]]></a>", nullptr, ""},
    {"<a>![CDATA[abc</a>", nullptr, "![CDATA[abc"},
    {"<a>![CDATA[ &amp; ]]</a>", nullptr, "&amp;"},
    {"<a><![CDATA[&lt;tag&gt;]]></a>", nullptr, "&lt;tag&gt;"},
    {"<a>  spaced  out  </a>", nullptr, "spaced  out"},
    {"<a>&amp;amp;</a>", nullptr, "&amp;"},
    {"<a>new</a>", "old", "new"},
    {"<a/>", "x", "x"},
    {"<a>   </a>", "x", "x"},
    {"<a><b>t</b></a>", "x", "x"},
    {"<a/>", nullptr, nullptr},
};

TEST_F(XmlDocumentTest, GetElementTextStoresTheDecodedText) {
    CXMLDocument& document = OpenDocument();
    for (const ElementTextCase& c : kElementTextCases) {
        SCOPED_TRACE(c.xml);
        ASSERT_EQ(Load(document, c.xml), KA_OK);
        char* field = NewString(c.before);
        char* const original = field;
        document.GetElementText(Root(document), field);
        if (c.after == nullptr) {
            EXPECT_EQ(field, nullptr);
        } else {
            ASSERT_NE(field, nullptr);
            EXPECT_STREQ(field, c.after);
        }
        // Untouched means the very same string, not a copy of it.
        if (c.before != nullptr && c.after != nullptr && strcmp(c.before, c.after) == 0) {
            EXPECT_EQ(field, original);
        }
        delete[] field;
    }
}

TEST_F(XmlDocumentTest, GetElementTextWithoutModuleLeavesTheField) {
    CXMLDocument& document = NewDocument();
    char* field = NewString("keep");
    char* const original = field;
    document.GetElementText(kNodeSentinel, field);
    EXPECT_EQ(field, original);
    EXPECT_STREQ(field, "keep");
    delete[] field;
}

TEST_F(XmlDocumentTest, IsElementCData) {
    CXMLDocument& document = OpenDocument();
    struct {
        const char* xml;
        unsigned int result;
        const char* text;
    } const cases[] = {
        {"<a><![CDATA[ x ]]></a>", KA_OK, "![CDATA[ x ]]"},
        {"<a>  ![CDATA[y]]</a>", KA_OK, "![CDATA[y]]"},
        {"<a>plain</a>", KA_ERR_LOAD_FAILED, "plain"},
        {"<a/>", KA_ERR_LOAD_FAILED, kNull},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.xml);
        ASSERT_EQ(Load(document, c.xml), KA_OK);
        char* text = gSentinelText;
        int length = kLengthSentinel;
        EXPECT_EQ(document.IsElementCData(Root(document), &text, length), c.result);
        EXPECT_EQ(Shown(text, length), c.text);
    }
}

// ---- What the document asks of a module (recording fake) ---------------------------------------

class XmlDocumentCallsTest : public ::testing::Test {
  protected:
    void SetUp() override {
        mStartObjects = CSDKObject::g_kaSDKObjectNum;
        // Held open by the test, so the document loads this very instance and its record
        // outlives the document's own unloading.
        mFake = dlopen(KA_FAKES_DIR "recording_xmlparser/libkaXMLParser.so", RTLD_NOW);
        ASSERT_NE(mFake, nullptr) << dlerror();
        auto state = reinterpret_cast<FakeXmlStateFn>(dlsym(mFake, "fake_xml_state"));
        ASSERT_NE(state, nullptr);
        mState = state();
        *mState = FakeXmlState{};
    }

    void TearDown() override {
        mDocument.reset();
        if (mFake != nullptr) dlclose(mFake);
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, mStartObjects);
    }

    CXMLDocument& Document(char* workPath = gRecordingDir) {
        mDocument = std::make_unique<CXMLDocument>();
        mDocument->SetWorkPath(workPath);
        return *mDocument;
    }

    std::unique_ptr<CXMLDocument> mDocument;
    void* mFake = nullptr;
    FakeXmlState* mState = nullptr;
    int mStartObjects = 0;
};

TEST_F(XmlDocumentCallsTest, InitHandsOverTheDocumentAndAnswersInitsResult) {
    CXMLDocument& document = Document();
    EXPECT_EQ(document.InitXMLParser(), KA_OK);
    EXPECT_EQ(mState->initCalls, 1);
    EXPECT_EQ(mState->uninitCalls, 0);
    EXPECT_EQ(mState->lastInit.reserved0, nullptr);
    EXPECT_EQ(mState->lastInit.reserved1, nullptr);
    EXPECT_EQ(mState->lastInit.owner, static_cast<void*>(&document));
    EXPECT_NE(document.mXMLHandle, nullptr);
}

TEST_F(XmlDocumentCallsTest, InitTwiceUninitsTheFirstHandleOnce) {
    CXMLDocument& document = Document();
    ASSERT_EQ(document.InitXMLParser(), KA_OK);
    void* first = document.mXMLHandle;
    ASSERT_EQ(document.InitXMLParser(), KA_OK);
    EXPECT_EQ(mState->initCalls, 2);
    EXPECT_EQ(mState->uninitCalls, 1);
    EXPECT_EQ(mState->lastUninitHandle, first);
    EXPECT_NE(document.mXMLHandle, first);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 13);
}

TEST_F(XmlDocumentCallsTest, FailedInitReturnsItsCodeAndKeepsWhatItWrote) {
    mState->initResult = 0x1234u;
    mState->initHandle = kNodeSentinel;
    CXMLDocument& document = Document();
    EXPECT_EQ(document.InitXMLParser(), 0x1234u);
    EXPECT_EQ(document.mXMLHandle, kNodeSentinel);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 13);
    // The destructor closes whatever handle Init left.
    mDocument.reset();
    EXPECT_EQ(mState->uninitCalls, 1);
    EXPECT_EQ(mState->lastUninitHandle, kNodeSentinel);
}

TEST_F(XmlDocumentCallsTest, UninitAndDestructorCloseTheHandleOnce) {
    CXMLDocument& document = Document();
    ASSERT_EQ(document.InitXMLParser(), KA_OK);
    void* handle = document.mXMLHandle;
    EXPECT_EQ(document.UninitXMLParser(), KA_OK);
    EXPECT_EQ(mState->uninitCalls, 1);
    EXPECT_EQ(mState->lastUninitHandle, handle);
    EXPECT_EQ(document.mXMLHandle, nullptr);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 0);
    EXPECT_EQ(document.UninitXMLParser(), KA_OK);
    EXPECT_EQ(mState->uninitCalls, 1);

    CXMLDocument& second = Document();
    ASSERT_EQ(second.InitXMLParser(), KA_OK);
    handle = second.mXMLHandle;
    mDocument.reset();
    EXPECT_EQ(mState->uninitCalls, 2);
    EXPECT_EQ(mState->lastUninitHandle, handle);
}

TEST_F(XmlDocumentCallsTest, MissingEntryFailsInit) {
    CXMLDocument& document = Document(gNoEntryDir);
    EXPECT_EQ(document.InitXMLParser(), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(document.mXMLHandle, nullptr);
    EXPECT_EQ(FilledSlots(document.mXMLAPI), 0);
}

intptr_t Arg(const void* p) { return reinterpret_cast<intptr_t>(p); }

TEST_F(XmlDocumentCallsTest, ForwardersPassTheHandleAndArgumentsUnchanged) {
    CXMLDocument& document = Document();
    ASSERT_EQ(document.InitXMLParser(), KA_OK);
    void* const node = kNodeSentinel;
    char text[] = "text";
    void* out = nullptr;
    char* string = nullptr;
    char* other = nullptr;
    int a = 0;
    int b = 0;

    struct Call {
        int slot;
        std::function<unsigned int()> call;
        std::vector<intptr_t> args;
    };
    CXMLDocument& d = document;
    const Call calls[] = {
        {2, [&] { return d.LoadXML(text, 4, ka::kXmlLoadMode); }, {Arg(text), 4, 160}},
        {3, [&] { return d.GetFirstChild(node, &out); }, {Arg(node), Arg(&out)}},
        {4, [&] { return d.GetNextSibling(node, &out); }, {Arg(node), Arg(&out)}},
        {5, [&] { return d.GetChildByName(node, text, &out); }, {Arg(node), Arg(text), Arg(&out)}},
        {6,
         [&] { return d.GetAttributeValue(node, text, &string, a); },
         {Arg(node), Arg(text), Arg(&string), Arg(&a)}},
        {7,
         [&] { return d.GetNextAttribute(node, &out, text, &string, a, &other, b); },
         {Arg(node), Arg(&out), Arg(text), Arg(&string), Arg(&a), Arg(&other), Arg(&b)}},
        {8, [&] { return d.GetTagValue(node, &string, a); }, {Arg(node), Arg(&string), Arg(&a)}},
        {9, [&] { return d.GetTagName(node, &string, b); }, {Arg(node), Arg(&string), Arg(&b)}},
        {10, [&] { return d.SetParam(0x44u, text); }, {0x44, Arg(text)}},
        {11, [&] { return d.GetParam(0x45u, &out); }, {0x45, Arg(&out)}},
        {12,
         [&] { return d.Reserved12(text, node, a, b); },
         {Arg(text), Arg(node), Arg(&a), Arg(&b)}},
    };
    for (const Call& call : calls) {
        SCOPED_TRACE(call.slot);
        *mState = FakeXmlState{};
        EXPECT_EQ(call.call(), kFakeXmlResultBase + static_cast<unsigned int>(call.slot));
        EXPECT_EQ(mState->lastSlot, call.slot);
        EXPECT_EQ(mState->lastHandle, document.mXMLHandle);
        for (size_t i = 0; i < 7; ++i) {
            EXPECT_EQ(mState->lastArgs[i], i < call.args.size() ? call.args[i] : 0) << i;
        }
    }
}

}  // namespace
