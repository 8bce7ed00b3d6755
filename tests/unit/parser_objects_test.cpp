// What only a C++ host or the library's own objects can see: extension parsers installed on a
// VAST parser, and the version banner.
#include <gtest/gtest.h>

#include <string>

#include "ka/vast_extension.h"
#include "vast/vast_parser.h"

extern char szVerInfo[512];

namespace {

struct ExtensionLog {
    int parsed = 0, built = 0, destroyed = 0, parserDestroyed = 0;
};

struct TestExtensions : CAdExtensions {
    TestExtensions(ExtensionLog* log, int serial) : mLog(log), mSerial(serial) {}
    ~TestExtensions() override { mLog->destroyed++; }
    ExtensionLog* mLog;
    int mSerial;
};

// Counts only the <Extensions> elements themselves; Parse answers result.
struct TestExtensionParser : CExtensionParser {
    TestExtensionParser(CVASTParser* owner, ExtensionLog* log, uint32_t result)
        : mOwner(owner), mLog(log), mResult(result) {}
    ~TestExtensionParser() override { mLog->parserDestroyed++; }
    uint32_t Parse(void* node) override {
        char* name = nullptr;
        int length = 0;
        mOwner->GetTagName(node, &name, length);
        if (name != nullptr && std::string(name, length) == "Extensions") mLog->parsed++;
        return mResult;
    }
    CAdExtensions* GetResult() override { return new TestExtensions(mLog, ++mLog->built); }
    CVASTParser* mOwner;
    ExtensionLog* mLog;
    uint32_t mResult;
};

int Serial(const AdData* ad) {
    CAdExtensions* e = ad->type == AD_TYPE_INLINE ? static_cast<AdInLine*>(ad->body)->extensions
                                                  : static_cast<AdWrapper*>(ad->body)->extensions;
    return e != nullptr ? static_cast<TestExtensions*>(e)->mSerial : 0;
}

TEST(ExtensionParser, OneObjectPerAdOwnedByTheAd) {
    static char modules[] = KA_MODULES_DIR;
    ExtensionLog log;
    auto process = [&](CVASTParser& parser, uint32_t result, std::string document) {
        ASSERT_EQ(parser.Open(modules), 0u);
        EXPECT_EQ(parser.SetParam(0x45000002u, modules), 0u);  // other ids are ignored
        EXPECT_EQ(parser.mExtensionParser, nullptr);
        parser.SetParam(KA_PID_VAST_EXTENSION_PARSER,
                        new TestExtensionParser(&parser, &log, result));
        ASSERT_EQ(
            parser.Process(&document[0], static_cast<unsigned int>(document.size()), 1, nullptr),
            0u);
    };
    {
        CVASTParser parser;
        process(parser, 0,
                "<VAST><Ad><InLine><Extensions/><Extensions/></InLine></Ad>"
                "<Ad><Wrapper><Extensions/></Wrapper></Ad></VAST>");
        EXPECT_EQ(log.parsed, 3);
        // Process closes the parser, and with it the extension parser.
        EXPECT_EQ(log.parserDestroyed, 1);
        EXPECT_EQ(parser.mExtensionParser, nullptr);
        // A second <Extensions> replaces the object of the first.
        EXPECT_EQ(log.destroyed, 1);
        EXPECT_EQ(Serial(parser.mVastAdData.firstAd), 2);
        EXPECT_EQ(Serial(parser.mVastAdData.firstAd->next), 3);
        parser.ReleaseAdData(parser.mVastAdData.firstAd);
        EXPECT_EQ(log.destroyed, 2);
        parser.ReleaseVastAdData(&parser.mVastAdData);
        EXPECT_EQ(log.destroyed, 3);
        // A failed Parse stores nothing.
        process(parser, 7, "<VAST><Ad><InLine><Extensions/></InLine></Ad></VAST>");
        EXPECT_TRUE(log.parsed == 4 && log.built == 3);
        EXPECT_EQ(Serial(parser.mVastAdData.firstAd), 0);
        parser.ReleaseVastAdData(&parser.mVastAdData);
    }
    {
        CVASTParser other;  // the destructor destroys an installed parser too
        other.SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(&other, &log, 0));
    }
    EXPECT_EQ(log.parserDestroyed, 3);
}

TEST(VersionBanner, CopiedAtLoadTime) {
    EXPECT_STREQ(szVerInfo,
                 "kaAbout> kaVMAPParser - release - android - armv8 - V3.19 - r93297 - NDKr10e - "
                 "11:04:12 Aug  1 2016\n");
}

}  // namespace
