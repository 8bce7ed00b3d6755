// CXMLDocument over the real XML parser module, loaded from the modules folder through
// libkadl.so: what it answers without a module, and CDATA sections read through another handle.
// What element texts read into is shown by the document cases (documents/vmap/element_texts.xml).
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

// IsElementCData: 0 only for a CDATA section, whose raw text it gives; length 0 and no text for
// an element without one. The nodes are read through a second handle, as the VAST parser reads
// those of the VMAP parser's document (which the document cases show at length).
TEST(XmlDocument, CDataThroughAnotherHandle) {
    CXMLDocument owner, d;
    for (CXMLDocument* document : {&owner, &d}) {
        document->SetWorkPath(gModulesDir);
        ASSERT_EQ(document->InitXMLParser(), KA_OK);
    }
    ASSERT_EQ(Load(owner, "<r>t<b/><c><![CDATA[ z ]]></c></r>"), KA_OK);
    void *root = nullptr, *b = nullptr, *c = nullptr;
    owner.GetFirstChild(nullptr, &root);
    d.GetFirstChild(root, &b);
    d.GetNextSibling(b, &c);
    ASSERT_NE(c, nullptr);
    auto cdata = [&](void* node) {
        char* text = gUntouched;
        int length = 77;
        const unsigned int result = d.IsElementCData(node, &text, length);
        return std::to_string(result) + " " + (text ? text : "<null>") + " " +
               std::to_string(length);
    };
    const std::string failed = std::to_string(KA_ERR_LOAD_FAILED);
    EXPECT_EQ(cdata(c), "0 ![CDATA[ z ]] 13");
    EXPECT_EQ(cdata(root), failed + " t 1");
    EXPECT_EQ(cdata(b), failed + " <null> 0");
}

}  // namespace
