// CVASTParser over the stand-in XML module: documents, ads, InLine and Wrapper bodies, texts,
// Process and its failures, extension parsers.
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "ka/vast_extension.h"
#include "vast_test_util.h"

namespace {

using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;
using vasttest::Urls;
using vasttest::VastParserTest;
using Strings = std::vector<std::string>;

// ---- Whole documents -------------------------------------------------------------------------

// How each text is read is pinned down by the text table below; these are the structures.
TEST_F(VastParserTest, InLineAndWrapperAdsOfAFullDocument) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    EXPECT_EQ(Data().adCount, 2u);
    EXPECT_EQ(Data().depth, 0u);
    EXPECT_EQ(Str(Data().errorUrl), "https://err.example.com/root-last");  // last non-empty
    EXPECT_EQ(Str(Ad(0)->id), "ad-1");
    EXPECT_EQ(Ad(0)->sequence, 3);
    AdInLine* inLine = InLine(0);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(Str(inLine->adTitle), "Title One");
    EXPECT_EQ(Str(inLine->advertiser), "Advertiser & Sons");
    EXPECT_EQ(inLine->impressionCount, 4u);  // the empty one is counted, not stored
    EXPECT_EQ(Urls(inLine->impressions),
              (Strings{"https://imp.example.com/1?a=1&amp;b=2", "https://imp.example.com/2?a=1&b=2",
                       "https://imp.example.com/4"}));
    EXPECT_EQ(inLine->extensions, nullptr);  // no extension parser installed
    EXPECT_EQ(inLine->creativeCount, 3u);
    EXPECT_EQ(Str(Ad(1)->id), "ad-2");
    AdWrapper* wrapper = Wrapper(1);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_EQ(Length(wrapper->impressions), 2u);
    EXPECT_EQ(Length(wrapper->creatives), 1u);  // only <Creative> children become creatives
    EXPECT_EQ(wrapper->nestedParser, nullptr);
}

TEST_F(VastParserTest, WrapperAdReadWithAllItsData) {
    ASSERT_EQ(Parse(vasttest::DataFile("wrapper_only.xml")), 0u);
    ASSERT_EQ(Data().adCount, 1u);
    EXPECT_EQ(Ad(0)->sequence, 1);
    // The later <InLine> and the unknown child change nothing.
    AdWrapper* wrapper = Wrapper(0);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_EQ(Str(wrapper->adSystem), "Wrap &amp; Co");
    // Last non-empty wins for the URI and the error.
    EXPECT_EQ(Str(wrapper->vastAdTagUri), "https://wrap.example.com/second.xml?s=1&amp;t=2");
    EXPECT_EQ(Str(wrapper->error), "https://err.example.com/last?a=1&b=2");
    EXPECT_EQ(Urls(wrapper->impressions),
              (Strings{"https://imp.example.com/w1", "https://imp.example.com/w2?a=1&amp;b=2"}));
    ASSERT_EQ(Length(wrapper->creatives), 2u);
    AdCreative* first = wrapper->creatives;
    EXPECT_EQ(Str(first->adId), "wa1");
    EXPECT_EQ(first->kind, AD_CREATIVE_LINEAR);
    EXPECT_EQ(Urls(first->content.trackingEvents),
              (Strings{"https://track.example.com/w-start", "https://track.example.com/w-half"}));
    EXPECT_EQ(Str(first->content.videoClicks->clickTrackings->id), "wt");
    EXPECT_EQ(first->next->kind, AD_CREATIVE_NONE);
}

TEST_F(VastParserTest, RootOfAnyNameAndCaseSensitiveNames) {
    ASSERT_EQ(Parse("<Playlist><Error>e</Error><ad><InLine/></ad><AD/>"
                    "<Ad><inline/><WRAPPER/></Ad></Playlist>"),
              0u);
    EXPECT_EQ(Str(Data().errorUrl), "e");
    ASSERT_EQ(Data().adCount, 1u);
    // Unknown children mark the ad InLine but give it no body.
    EXPECT_EQ(Ad(0)->type, AD_TYPE_INLINE);
    EXPECT_EQ(Ad(0)->body, nullptr);
}

// ---- <Ad>: type, body, attributes ------------------------------------------------------------

TEST_F(VastParserTest, AdTypeAndBody) {
    const std::string i = "<InLine><AdSystem>I</AdSystem></InLine>";
    const std::string w = "<Wrapper><AdSystem>W</AdSystem></Wrapper>";
    const struct {
        std::string content;  // of <Ad>
        uint32_t type;
        const char* adSystem;  // of the body that was read; null: no body
    } kCases[] = {
        {"", AD_TYPE_UNKNOWN, nullptr},
        {"text", AD_TYPE_UNKNOWN, nullptr},
        {"<Something/>", AD_TYPE_INLINE, nullptr},
        {"<InLine/>", AD_TYPE_INLINE, "<null>"},
        {w, AD_TYPE_WRAPPER, "W"},
        {i + w, AD_TYPE_INLINE, "I"},
        {w + i, AD_TYPE_WRAPPER, "W"},
        {w + "<Other/>", AD_TYPE_WRAPPER, "W"},
        {"<Other/>" + w, AD_TYPE_WRAPPER, "W"},
        {i + "<InLine><AdSystem>2</AdSystem></InLine>", AD_TYPE_INLINE, "I"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.content);
        ASSERT_EQ(Fresh("<VAST><Ad>" + c.content + "</Ad></VAST>"), 0u);
        ASSERT_EQ(Data().adCount, 1u);
        EXPECT_EQ(Ad(0)->type, c.type);
        ASSERT_EQ(Ad(0)->body != nullptr, c.adSystem != nullptr);
        if (c.adSystem == nullptr) continue;
        EXPECT_EQ(Str(c.type == AD_TYPE_INLINE ? InLine(0)->adSystem : Wrapper(0)->adSystem),
                  c.adSystem);
    }
}

TEST_F(VastParserTest, AdIdAndSequence) {
    const struct {
        const char* attributes;
        const char* id;
        int32_t sequence;
    } kCases[] = {
        {"", "<null>", 0},
        {"id=\"\" sequence=\"\"", "<null>", 0},
        {"id=\"x\" sequence=\"7\"", "x", 7},
        {"sequence=\"abc\"", "<null>", 0},
        {"sequence=\"12th\"", "<null>", 12},
        {"sequence=\"-2\"", "<null>", -2},
        {"ID=\"upper\"", "<null>", 0},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.attributes);
        ASSERT_EQ(Fresh(std::string("<VAST><Ad ") + c.attributes + "><InLine/></Ad></VAST>"), 0u);
        EXPECT_EQ(Str(Ad(0)->id), c.id);
        EXPECT_EQ(Ad(0)->sequence, c.sequence);
    }
}

// ---- Texts: raw text with CDATA unwrapping against element text ------------------------------

template <typename T>
const char* FirstUrl(const T* list) {
    return list == nullptr ? nullptr : list->url;
}

// Raw text keeps "&amp;"; element text decodes it outside CDATA; Survey decodes it everywhere.
enum Reading { kRaw, kElement, kSurvey };

TEST_F(VastParserTest, EveryTextKindTreatsCDataAndEntitiesAsItShould) {
    const struct {
        const char* text;
        const char* expected[3];  // by Reading; null: the field stays null
    } kInputs[] = {
        {"plain/a?b=1", {"plain/a?b=1", "plain/a?b=1", "plain/a?b=1"}},
        {"a?x=1&amp;y=2", {"a?x=1&amp;y=2", "a?x=1&y=2", "a?x=1&y=2"}},
        {"<![CDATA[  a?x=1&amp;y=2  ]]>", {"a?x=1&amp;y=2", "a?x=1&amp;y=2", "a?x=1&y=2"}},
        {"\n   <![CDATA[\n  https://x.example.com/c  \n]]>\n  ",
         {"https://x.example.com/c", "https://x.example.com/c", "https://x.example.com/c"}},
        {"a&amp;amp;b", {"a&amp;amp;b", "a&amp;b", "a&amp;b"}},  // decoded once
        {"   spaced out   ", {"spaced out", "spaced out", "spaced out"}},
        {"", {nullptr, nullptr, nullptr}},
        {"<![CDATA[   ]]>", {"", "", ""}},
    };
    for (const auto& input : kInputs) {
        SCOPED_TRACE(std::string("'") + input.text + "'");
        // The same text in every element that holds one.
        std::string in;
        for (const char* name : {"AdSystem", "AdTitle", "Description", "Advertiser", "Survey",
                                 "Error", "Impression"}) {
            in += std::string("<") + name + ">" + input.text + "</" + name + ">";
        }
        const std::string t = input.text;
        in += "<Creatives><Creative><Linear><MediaFiles><MediaFile>" + t +
              "</MediaFile></MediaFiles><VideoClicks><ClickThrough>" + t +
              "</ClickThrough></VideoClicks><TrackingEvents><Tracking>" + t +
              "</Tracking></TrackingEvents></Linear></Creative></Creatives>";
        ASSERT_EQ(Fresh("<VAST><Error>" + t + "</Error><Ad><InLine>" + in +
                        "</InLine></Ad><Ad><Wrapper><VASTAdTagURI>" + t +
                        "</VASTAdTagURI></Wrapper></Ad></VAST>"),
                  0u);
        const AdInLine* inLine = InLine(0);
        ASSERT_NE(inLine, nullptr);
        const AdLinear& linear = inLine->creatives->content;
        const struct {
            const char* name;
            const char* value;
            Reading reading;
        } kFields[] = {
            {"AdSystem", inLine->adSystem, kRaw},
            {"AdTitle", inLine->adTitle, kRaw},
            {"Description", inLine->description, kRaw},
            {"Advertiser", inLine->advertiser, kRaw},
            {"Survey", inLine->survey, kSurvey},
            {"InLine Error", inLine->error, kElement},
            {"root Error", Data().errorUrl, kElement},
            {"VASTAdTagURI", Wrapper(1)->vastAdTagUri, kElement},
            {"MediaFile", FirstUrl(linear.mediaFiles), kElement},
            {"ClickThrough", FirstUrl(linear.videoClicks->clickThroughs), kElement},
            {"Tracking", FirstUrl(linear.trackingEvents), kElement},
        };
        for (const auto& field : kFields) {
            EXPECT_EQ(Str(field.value), Str(input.expected[field.reading])) << field.name;
        }
        // An impression is always counted, but a node is never made for an empty text.
        EXPECT_EQ(inLine->impressionCount, 1u);
        const char* impression = input.expected[kElement];
        if (impression != nullptr && *impression == '\0') impression = nullptr;
        EXPECT_EQ(Str(FirstUrl(inLine->impressions)), Str(impression));
    }
}

TEST_F(VastParserTest, LaterEmptyTextKeepsEarlierValue) {
    ASSERT_EQ(Parse(vasttest::InLineDocument("<AdSystem>one</AdSystem><AdSystem/>"
                                             "<Error>e1</Error><Error>  </Error>"
                                             "<Survey>s1</Survey><Survey>s2&amp;amp;</Survey>"
                                             "<Survey></Survey>")),
              0u);
    EXPECT_EQ(Str(InLine(0)->adSystem), "one");
    EXPECT_EQ(Str(InLine(0)->error), "e1");
    // "&amp;amp;" is decoded once, even when a later empty Survey follows.
    EXPECT_EQ(Str(InLine(0)->survey), "s2&amp;");
}

TEST_F(VastParserTest, ManySiblingsKeepDocumentOrder) {
    // Appending must stay in order, and fast enough that a long document cannot stall a player.
    const int kCount = 100000;
    std::string impressions, trackings;
    for (int i = 0; i < kCount; ++i) {
        const std::string n = std::to_string(i);
        impressions += "<Impression>i" + n + "</Impression>";
        trackings += "<Tracking>t" + n + "</Tracking>";
    }
    std::string document = "<VAST>";
    for (int i = 0; i < 1000; ++i) document += "<Ad/>";
    document += "<Ad><InLine>" + impressions + "<Creatives><Creative><Linear><TrackingEvents>" +
                trackings +
                "</TrackingEvents></Linear></Creative></Creatives></InLine></Ad></VAST>";
    const auto started = std::chrono::steady_clock::now();
    ASSERT_EQ(Parse(document), 0u);
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(15));
    EXPECT_EQ(Data().adCount, 1001u);
    AdInLine* inLine = InLine(1000);
    ASSERT_NE(inLine, nullptr);
    const Strings urls = Urls(inLine->impressions);
    ASSERT_EQ(urls.size(), static_cast<size_t>(kCount));
    for (int i = 0; i < kCount; ++i) ASSERT_EQ(urls[i], "i" + std::to_string(i));
    AdLinear& linear = inLine->creatives->content;
    EXPECT_EQ(Str(Nth(linear.trackingEvents, kCount - 1)->url), "t" + std::to_string(kCount - 1));
}

// ---- Process and its lifecycle ---------------------------------------------------------------

TEST_F(VastParserTest, RejectedBufferFailsAndLeavesContainerEmpty) {
    for (const char* bad :
         {"", "not xml at all <", "<VAST><Ad></VAST>", "<?xml version=\"1.0\"?>"}) {
        SCOPED_TRACE(bad);
        EXPECT_EQ(Reparse(bad), KA_ERR_LOAD_FAILED);
        EXPECT_EQ(Data().adCount, 0u);
        EXPECT_EQ(Data().firstAd, nullptr);
    }
    EXPECT_EQ(mParser->Process(nullptr, 10, 1, nullptr), KA_ERR_LOAD_FAILED);
}

TEST_F(VastParserTest, ProcessStoresItsFlagsEvenWhenItFails) {
    KA_BOOL stop = 0;
    std::string bad = "<";
    EXPECT_EQ(mParser->Process(&bad[0], 1, 0, &stop), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->mMergeWrappers, 0);
    EXPECT_EQ(mParser->mStopFlag, &stop);
}

TEST_F(VastParserTest, ProcessNeedsAnOpenParser) {
    const std::string document = vasttest::InLineDocument("<AdSystem>s</AdSystem>");
    ASSERT_EQ(Parse(document), 0u);
    EXPECT_EQ(Parse(document), KA_ERR_LOAD_FAILED);  // the first Process closed it
    EXPECT_EQ(Data().adCount, 1u);
    CVASTParser fresh;
    std::string buffer = document;
    EXPECT_EQ(fresh.Process(&buffer[0], static_cast<unsigned int>(buffer.size()), 1, nullptr),
              KA_ERR_LOAD_FAILED);
    EXPECT_EQ(fresh.mVastAdData.firstAd, nullptr);
}

TEST_F(VastParserTest, OpenWithoutModulesFails) {
    CVASTParser fresh;
    static char kNowhere[] = "/nonexistent-ka-modules/";
    EXPECT_EQ(fresh.Open(kNowhere), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(fresh.mWorkPath, kNowhere);
}

TEST_F(VastParserTest, LaterDocumentsAppendToTheContainer) {
    ASSERT_EQ(Parse("<VAST><Ad id=\"1\"><InLine/></Ad><Error>first</Error></VAST>"), 0u);
    ASSERT_EQ(Reparse("<VAST><Ad id=\"2\"><Wrapper/></Ad><Ad id=\"3\"/></VAST>"), 0u);
    EXPECT_EQ(Data().adCount, 3u);
    EXPECT_EQ(Str(Ad(2)->id), "3");
    EXPECT_EQ(Str(Data().errorUrl), "first");
    ASSERT_EQ(Fresh("<VAST><Ad id=\"4\"/><Ad id=\"5\"/></VAST>"), 0u);
    EXPECT_EQ(Data().adCount, 2u);
    EXPECT_EQ(Str(Ad(1)->id), "5");
}

TEST_F(VastParserTest, ParamsOtherThanTheExtensionParserAreIgnored) {
    int dummy = 0;
    EXPECT_EQ(mParser->SetParam(0x45000002u, &dummy), 0u);
    EXPECT_EQ(mParser->mExtensionParser, nullptr);
    void* out = &dummy;
    EXPECT_EQ(mParser->GetParam(KA_PID_VAST_EXTENSION_PARSER, &out), 0u);
    EXPECT_EQ(out, &dummy);
}

// ---- Extension parsers -----------------------------------------------------------------------

struct ExtensionLog {
    int parsed = 0, built = 0, destroyed = 0, parserDestroyed = 0;
};

class TestExtensions : public CAdExtensions {
public:
    TestExtensions(ExtensionLog* log, int serial) : mLog(log), mSerial(serial) {}
    ~TestExtensions() override { mLog->destroyed++; }
    ExtensionLog* mLog;
    int mSerial;
};

class TestExtensionParser : public CExtensionParser {
public:
    TestExtensionParser(CVASTParser* owner, ExtensionLog* log, uint32_t result)
        : mOwner(owner), mLog(log), mResult(result) {}
    ~TestExtensionParser() override { mLog->parserDestroyed++; }
    uint32_t Parse(void* node) override {
        char* name = nullptr;
        int length = 0;
        mOwner->GetTagName(node, &name, length);
        // Handed the <Extensions> element itself.
        if (name != nullptr && std::string(name, length) == "Extensions") mLog->parsed++;
        return mResult;
    }
    CAdExtensions* GetResult() override { return new TestExtensions(mLog, ++mLog->built); }
    CVASTParser* mOwner;
    ExtensionLog* mLog;
    uint32_t mResult;
};

// The log outlives TearDown, where the last records and parsers are destroyed.
class VastExtensionTest : public VastParserTest {
protected:
    void Install(uint32_t result) {
        mParser->SetParam(KA_PID_VAST_EXTENSION_PARSER,
                          new TestExtensionParser(mParser, &mLog, result));
    }
    static int Serial(CAdExtensions* e) { return e ? static_cast<TestExtensions*>(e)->mSerial : 0; }
    ExtensionLog mLog;
};

TEST_F(VastExtensionTest, OneObjectPerAdOwnedByTheAd) {
    Install(0);
    ASSERT_EQ(Parse("<VAST><Ad><InLine><Extensions/><Extensions/></InLine></Ad>"
                    "<Ad><Wrapper><Extensions/></Wrapper></Ad></VAST>"),
              0u);
    EXPECT_EQ(mLog.parsed, 3);
    // Process closes the parser, and with it the extension parser.
    EXPECT_EQ(mLog.parserDestroyed, 1);
    EXPECT_EQ(mParser->mExtensionParser, nullptr);
    // A second <Extensions> replaces the object of the first.
    EXPECT_EQ(mLog.destroyed, 1);
    EXPECT_EQ(Serial(InLine(0)->extensions), 2);
    EXPECT_EQ(Serial(Wrapper(1)->extensions), 3);
    mParser->ReleaseAdData(Ad(0));
    EXPECT_EQ(mLog.destroyed, 2);
    mParser->ReleaseVastAdData(&Data());
    EXPECT_EQ(mLog.destroyed, 3);
    {
        CVASTParser other;  // the destructor destroys an installed parser too
        other.SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(&other, &mLog, 0));
    }
    EXPECT_EQ(mLog.parserDestroyed, 2);
}

TEST_F(VastExtensionTest, FailedParseStoresNothing) {
    Install(7);
    ASSERT_EQ(Parse(vasttest::InLineDocument("<Extensions/>")), 0u);
    EXPECT_EQ(mLog.parsed, 1);
    EXPECT_EQ(mLog.built, 0);
    EXPECT_EQ(InLine(0)->extensions, nullptr);
}

// ---- Handlers given nothing ------------------------------------------------------------------

TEST_F(VastParserTest, HandlersIgnoreNullArguments) {
    typedef unsigned int (CVASTParser::*Handler)(void*, void*, char*, unsigned int);
    const Handler kHandlers[] = {
        &CVASTParser::LoadVASTTag,        &CVASTParser::LoadAdTag,
        &CVASTParser::LoadInLineTag,      &CVASTParser::LoadCreativesTag,
        &CVASTParser::LoadWrapperTag,     &CVASTParser::LoadCreativeTag,
        &CVASTParser::LoadLinearTag,      &CVASTParser::LoadMediaFilesTag,
        &CVASTParser::LoadVideoClicksTag, &CVASTParser::LoadTrackingEventsTag,
        &CVASTParser::LoadIgnoredTag,
    };
    AdData ad = AdData();
    char name[] = "InLine";
    int dummyNode = 0;
    CVASTParser& p = *mParser;
    for (Handler h : kHandlers) {
        EXPECT_EQ((p.*h)(nullptr, &ad, name, 6), 0u);
        EXPECT_EQ((p.*h)(&dummyNode, nullptr, name, 6), 0u);
        EXPECT_EQ((p.*h)(&dummyNode, &ad, nullptr, 6), 0u);
    }
    EXPECT_EQ(ad.body, nullptr);
    EXPECT_EQ(ad.type, AD_TYPE_UNKNOWN);
    AdCreative* list = nullptr;
    char creative[] = "Creative";
    EXPECT_EQ(mParser->LoadCreative(nullptr, &list, creative, 8), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->LoadCreative(&dummyNode, nullptr, creative, 8), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->LoadCreative(&dummyNode, &list, nullptr, 8), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(list, nullptr);
    EXPECT_EQ(mParser->LoadTag(nullptr, &ad, &CVASTParser::LoadAdTag), 0u);
    EXPECT_EQ(mParser->LoadAdAttributes(nullptr, &ad), 0u);
    EXPECT_EQ(mParser->LoadCreativeAttributes(nullptr, nullptr), 0u);
    EXPECT_EQ(mParser->LoadSkipOffset(nullptr, nullptr), 0u);
    EXPECT_EQ(mParser->LoadMediaFileAttributes(nullptr, nullptr), 0u);
    EXPECT_EQ(mParser->LoadTrackingAttributes(nullptr, nullptr), 0u);
}

TEST_F(VastParserTest, EveryVastExampleParses) {
    int seen = 0;
    for (const auto& entry : std::filesystem::directory_iterator(KA_EXAMPLES_DIR)) {
        const std::string file = entry.path().filename().string();
        if (file.rfind("vast-", 0) != 0 || entry.path().extension() != ".xml") continue;
        SCOPED_TRACE(file);
        ++seen;
        ASSERT_EQ(Fresh(vasttest::ReadFile(entry.path().string())), 0u);
        ASSERT_GE(Data().adCount, 1u);
        for (AdData* ad = Data().firstAd; ad != nullptr; ad = ad->next)
            EXPECT_NE(ad->body, nullptr);
    }
    EXPECT_GE(seen, 3);
}

}  // namespace
