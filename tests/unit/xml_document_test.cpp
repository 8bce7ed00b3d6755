// CXMLDocument over the real XML parser module, loaded from the modules folder through
// libkadl.so: what it answers without a module, and one handle reading another's nodes. What
// element texts read into is shown by the document cases (documents/vmap/element_texts.xml).
#include "xml/xml_document.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "platform/limits.h"

namespace {

// SetWorkPath keeps the pointer, so the paths live as long as the program.
char gModulesDir[] = KA_MODULES_DIR;
char gMissingDir[] = "/nonexistent-ka-modules/";
// Outputs start as these, so a call that must not touch them can be seen to.
void* const kSentinel = reinterpret_cast<void*>(0x1234);
char gUntouched[] = "untouched";

// The buffer is gone once the load returns: nothing may point into it.
unsigned int Load(CXMLDocument& document, const std::string& text) {
    std::vector<char> buffer(text.begin(), text.end());
    return document.LoadXML(buffer.data(), static_cast<int>(buffer.size()), ka::kXmlLoadMode);
}

TEST(XmlDocument, WithoutModuleOperationsAnswerNotLoaded) {
    for (char* workPath : {static_cast<char*>(nullptr), gMissingDir, gModulesDir}) {
        SCOPED_TRACE(workPath != nullptr ? workPath : "never initialised");
        CXMLDocument document;
        if (workPath != nullptr) {
            document.SetWorkPath(workPath);
            EXPECT_EQ(document.InitXMLParser(),
                      workPath == gModulesDir ? KA_OK : KA_ERR_MODULE_NOT_LOADED);
            EXPECT_EQ(document.UninitXMLParser(), KA_OK);  // the released module, last
        }
        EXPECT_EQ(document.mXMLHandle, nullptr);
        EXPECT_EQ(document.mLibHandle, nullptr);
        void* node = kSentinel;
        char* text = gUntouched;
        int length = 77;
        char name[] = "a";
        EXPECT_EQ(document.LoadXML(name, 1, ka::kXmlLoadMode), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetFirstChild(nullptr, &node), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetChildByName(nullptr, name, &node), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetTagValue(nullptr, &text, length), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(document.GetAttributeValue(nullptr, name, &text, length),
                  KA_ERR_MODULE_NOT_LOADED);
        EXPECT_TRUE(node == kSentinel && text == gUntouched && length == 77);
        // Init works again after any of these.
        document.SetWorkPath(gModulesDir);
        ASSERT_EQ(document.InitXMLParser(), KA_OK);
        EXPECT_EQ(Load(document, "<a/>"), KA_OK);
    }
}

// The VAST parser reads nodes of the VMAP parser's document through its own handle; what the
// owner lent stays valid while the other handle loads a document of its own.
TEST(XmlDocument, ReadsNodesThroughAnotherHandle) {
    CXMLDocument owner, d;
    for (CXMLDocument* document : {&owner, &d}) {
        document->SetWorkPath(gModulesDir);
        ASSERT_EQ(document->InitXMLParser(), KA_OK);
    }
    ASSERT_NE(owner.mXMLHandle, d.mXMLHandle);
    ASSERT_EQ(Load(owner, "<r a=\"v\">t<b/><c><![CDATA[ z ]]></c></r>"), KA_OK);
    void *root = kSentinel, *b = kSentinel, *c = kSentinel, *byName = kSentinel;
    d.GetFirstChild(nullptr, &root);
    EXPECT_EQ(root, nullptr);  // d has loaded nothing
    owner.GetFirstChild(nullptr, &root);
    ASSERT_NE(root, nullptr);
    d.GetFirstChild(root, &b);
    d.GetNextSibling(b, &c);
    char cName[] = "c", aName[] = "a";
    d.GetChildByName(root, cName, &byName);
    ASSERT_NE(c, nullptr);
    EXPECT_EQ(byName, c);
    char *name = nullptr, *value = nullptr, *lent = nullptr;
    int length = 0;
    d.GetTagName(c, &name, length);
    d.GetAttributeValue(root, aName, &value, length);
    owner.GetTagValue(c, &lent, length);
    ASSERT_TRUE(name != nullptr && value != nullptr && lent != nullptr);

    // IsElementCData: 0 only for a CDATA section, whose raw text it gives; length 0 and no text
    // for an element without one.
    auto cdata = [&](void* node) {
        char* text = gUntouched;
        length = 77;
        const unsigned int result = d.IsElementCData(node, &text, length);
        return std::to_string(result) + " " + (text ? text : "<null>") + " " +
               std::to_string(length);
    };
    const std::string failed = std::to_string(KA_ERR_LOAD_FAILED);
    EXPECT_EQ(cdata(c), "0 ![CDATA[ z ]] 13");
    EXPECT_EQ(cdata(root), failed + " t 1");
    EXPECT_EQ(cdata(b), failed + " <null> 0");

    ASSERT_EQ(Load(d, "<other/>"), KA_OK);
    EXPECT_STREQ(name, "c");
    EXPECT_STREQ(value, "v");
    EXPECT_STREQ(lent, "![CDATA[ z ]]");
}

}  // namespace
