// CVASTParser over the stand-in XML module: documents, ads, InLine and Wrapper bodies, texts,
// Process and its failures, extension parsers.
#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "ka/vast_extension.h"
#include "vast_test_util.h"

namespace {

using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;
using vasttest::VastParserTest;

// ---- Whole documents -------------------------------------------------------------------------

TEST_F(VastParserTest, InLineAdEveryField) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    VastAdData& data = Data();
    EXPECT_EQ(data.adCount, 2u);
    EXPECT_EQ(data.depth, 0u);
    // The last non-empty root <Error> wins.
    EXPECT_EQ(Str(data.errorUrl), "https://err.example.com/root-last");

    AdData* ad = Ad(0);
    ASSERT_NE(ad, nullptr);
    EXPECT_EQ(Str(ad->id), "ad-1");
    EXPECT_EQ(ad->sequence, 3);
    EXPECT_EQ(ad->type, AD_TYPE_INLINE);
    AdInLine* inLine = InLine(0);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(Str(inLine->adSystem), "Sys &amp; Co");  // raw text keeps entities
    EXPECT_EQ(Str(inLine->adTitle), "Title One");
    EXPECT_EQ(inLine->impressionCount, 4u);  // the empty one is counted, not stored
    ASSERT_EQ(Length(inLine->impressions), 3u);
    EXPECT_EQ(Str(Nth(inLine->impressions, 0)->url), "https://imp.example.com/1?a=1&amp;b=2");
    EXPECT_EQ(Str(Nth(inLine->impressions, 1)->url), "https://imp.example.com/2?a=1&b=2");
    EXPECT_EQ(Str(Nth(inLine->impressions, 2)->url), "https://imp.example.com/4");
    EXPECT_EQ(Str(inLine->description), "A description");
    EXPECT_EQ(Str(inLine->advertiser), "Advertiser & Sons");
    EXPECT_EQ(Str(inLine->survey), "https://survey.example.com/s?x=1&y=2");
    EXPECT_EQ(Str(inLine->error), "https://err.example.com/inline?e=1&f=2");
    EXPECT_EQ(inLine->extensions, nullptr);  // no extension parser installed
    EXPECT_EQ(inLine->creativeCount, 3u);
    EXPECT_EQ(Str(Nth(inLine->creatives, 0)->id), "c1");
    EXPECT_EQ(Str(Nth(inLine->creatives, 1)->id), "c2");
    EXPECT_EQ(Str(Nth(inLine->creatives, 2)->id), "c3");
    EXPECT_EQ(ad->next, Ad(1));
    EXPECT_EQ(Ad(1)->next, nullptr);
}

TEST_F(VastParserTest, WrapperAdInTheSameDocument) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    AdData* ad = Ad(1);
    ASSERT_NE(ad, nullptr);
    EXPECT_EQ(Str(ad->id), "ad-2");
    EXPECT_EQ(ad->sequence, 0);
    EXPECT_EQ(ad->type, AD_TYPE_WRAPPER);
    AdWrapper* wrapper = Wrapper(1);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_EQ(Str(wrapper->adSystem), "Wrap System");
    EXPECT_EQ(Str(wrapper->vastAdTagUri), "https://wrap.example.com/vast.xml?a=1&amp;b=2");
    EXPECT_EQ(Str(wrapper->error), "https://err.example.com/wrapper");
    ASSERT_EQ(Length(wrapper->impressions), 2u);
    EXPECT_EQ(Str(wrapper->impressions->url), "https://imp.example.com/w1");
    EXPECT_EQ(Str(wrapper->impressions->next->url), "https://imp.example.com/w2?x=1&y=2");
    // Only <Creative> children become creatives.
    ASSERT_EQ(Length(wrapper->creatives), 1u);
    AdCreative* creative = wrapper->creatives;
    EXPECT_EQ(Str(creative->id), "wc1");
    EXPECT_EQ(creative->kind, AD_CREATIVE_LINEAR);
    EXPECT_EQ(creative->content.skipOffset, -1);
    ASSERT_EQ(creative->content.trackingCount, 1u);
    EXPECT_EQ(Str(creative->content.trackingEvents->url), "https://track.example.com/w-q1");
    ASSERT_NE(creative->content.videoClicks, nullptr);
    EXPECT_EQ(creative->content.videoClicks->clickTrackingCount, 1u);
    EXPECT_EQ(wrapper->extensions, nullptr);
    EXPECT_EQ(wrapper->nestedParser, nullptr);
}

TEST_F(VastParserTest, WrapperAdReadWithAllItsData) {
    ASSERT_EQ(Parse(vasttest::DataFile("wrapper_only.xml")), 0u);
    ASSERT_EQ(Data().adCount, 1u);
    AdData* ad = Ad(0);
    EXPECT_EQ(Str(ad->id), "wrap-1");
    EXPECT_EQ(ad->sequence, 1);
    // The later <InLine> and the unknown child change nothing.
    EXPECT_EQ(ad->type, AD_TYPE_WRAPPER);
    AdWrapper* wrapper = Wrapper(0);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_EQ(Str(wrapper->adSystem), "Wrap &amp; Co");
    // Last non-empty wins for the URI and the error; element text decodes "&amp;" outside CDATA.
    EXPECT_EQ(Str(wrapper->vastAdTagUri), "https://wrap.example.com/second.xml?s=1&amp;t=2");
    EXPECT_EQ(Str(wrapper->error), "https://err.example.com/last?a=1&b=2");
    ASSERT_EQ(Length(wrapper->impressions), 2u);
    EXPECT_EQ(Str(wrapper->impressions->url), "https://imp.example.com/w1");
    EXPECT_EQ(Str(wrapper->impressions->next->url), "https://imp.example.com/w2?a=1&amp;b=2");
    ASSERT_EQ(Length(wrapper->creatives), 2u);
    AdCreative* first = wrapper->creatives;
    EXPECT_EQ(Str(first->id), "wc1");
    EXPECT_EQ(first->sequence, 4);
    EXPECT_EQ(Str(first->adId), "wa1");
    EXPECT_EQ(first->kind, AD_CREATIVE_LINEAR);
    ASSERT_EQ(first->content.trackingCount, 2u);
    AdTracking* half = first->content.trackingEvents->next;
    EXPECT_EQ(Str(half->event), "progress");
    EXPECT_EQ(half->offsetKind, AD_OFFSET_PERCENT);
    EXPECT_EQ(half->offset, 50);
    AdVideoClicks* clicks = first->content.videoClicks;
    ASSERT_NE(clicks, nullptr);
    EXPECT_EQ(clicks->clickThroughCount, 0u);
    ASSERT_EQ(clicks->clickTrackingCount, 1u);
    EXPECT_EQ(Str(clicks->clickTrackings->id), "wt");
    ASSERT_EQ(clicks->customClickCount, 1u);
    EXPECT_EQ(Str(clicks->customClicks->url), "https://click.example.com/w-custom");
    AdCreative* second = first->next;
    EXPECT_EQ(Str(second->id), "wc2");
    EXPECT_EQ(second->kind, AD_CREATIVE_NONE);
    EXPECT_EQ(wrapper->nestedParser, nullptr);
}

TEST_F(VastParserTest, RootOfAnyNameIsReadAsVast) {
    ASSERT_EQ(Parse("<Playlist><Error>e</Error><Ad id=\"x\"><InLine/></Ad></Playlist>"), 0u);
    EXPECT_EQ(Data().adCount, 1u);
    EXPECT_EQ(Str(Data().errorUrl), "e");
    EXPECT_NE(InLine(0), nullptr);
}

TEST_F(VastParserTest, NamesAreCaseSensitive) {
    ASSERT_EQ(Parse("<VAST><ad><InLine/></ad><AD/><Ad><inline/><WRAPPER/></Ad></VAST>"), 0u);
    ASSERT_EQ(Data().adCount, 1u);
    // Unknown children mark the ad InLine but give it no body.
    EXPECT_EQ(Ad(0)->type, AD_TYPE_INLINE);
    EXPECT_EQ(Ad(0)->body, nullptr);
}

// ---- The type rules of <Ad> ------------------------------------------------------------------

struct AdTypeCase {
    const char* name;
    const char* ad;  // the <Ad> element
    uint32_t type;
    bool hasBody;
    const char* adSystem;  // of the body that was read, null when none
};

class VastAdTypeTest : public VastParserTest, public ::testing::WithParamInterface<AdTypeCase> {};

TEST_P(VastAdTypeTest, TypeAndBody) {
    const AdTypeCase& c = GetParam();
    ASSERT_EQ(Parse(std::string("<VAST>") + c.ad + "</VAST>"), 0u);
    ASSERT_EQ(Data().adCount, 1u);
    AdData* ad = Ad(0);
    EXPECT_EQ(ad->type, c.type);
    EXPECT_EQ(ad->body != nullptr, c.hasBody);
    if (c.adSystem != nullptr && ad->body != nullptr) {
        const char* adSystem = ad->type == AD_TYPE_INLINE
                                   ? static_cast<AdInLine*>(ad->body)->adSystem
                                   : static_cast<AdWrapper*>(ad->body)->adSystem;
        EXPECT_EQ(Str(adSystem), c.adSystem);
    }
}

const AdTypeCase kAdTypeCases[] = {
    {"EmptyAd", "<Ad/>", AD_TYPE_UNKNOWN, false, nullptr},
    {"TextOnlyAd", "<Ad>text</Ad>", AD_TYPE_UNKNOWN, false, nullptr},
    {"InLine", "<Ad><InLine><AdSystem>I</AdSystem></InLine></Ad>", AD_TYPE_INLINE, true, "I"},
    {"EmptyInLine", "<Ad><InLine/></Ad>", AD_TYPE_INLINE, true, nullptr},
    {"Wrapper", "<Ad><Wrapper><AdSystem>W</AdSystem></Wrapper></Ad>", AD_TYPE_WRAPPER, true, "W"},
    {"OtherChildOnly", "<Ad><Something/></Ad>", AD_TYPE_INLINE, false, nullptr},
    {"InLineThenWrapper",
     "<Ad><InLine><AdSystem>I</AdSystem></InLine><Wrapper><AdSystem>W</AdSystem></Wrapper></Ad>",
     AD_TYPE_INLINE, true, "I"},
    {"WrapperThenInLine",
     "<Ad><Wrapper><AdSystem>W</AdSystem></Wrapper><InLine><AdSystem>I</AdSystem></InLine></Ad>",
     AD_TYPE_WRAPPER, true, "W"},
    {"WrapperThenUnknown", "<Ad><Wrapper><AdSystem>W</AdSystem></Wrapper><Other/></Ad>",
     AD_TYPE_WRAPPER, true, "W"},
    {"UnknownThenWrapper", "<Ad><Other/><Wrapper><AdSystem>W</AdSystem></Wrapper></Ad>",
     AD_TYPE_WRAPPER, true, "W"},
    {"SecondInLineIgnored",
     "<Ad><InLine><AdSystem>1</AdSystem></InLine><InLine><AdSystem>2</AdSystem></InLine></Ad>",
     AD_TYPE_INLINE, true, "1"},
};

INSTANTIATE_TEST_SUITE_P(Ads, VastAdTypeTest, ::testing::ValuesIn(kAdTypeCases),
                         [](const ::testing::TestParamInfo<AdTypeCase>& info) {
                             return std::string(info.param.name);
                         });

// ---- Attributes of <Ad> ----------------------------------------------------------------------

struct AdAttributeCase {
    const char* attributes;
    const char* id;  // null: no id stored
    int32_t sequence;
};

class VastAdAttributeTest : public VastParserTest,
                            public ::testing::WithParamInterface<AdAttributeCase> {};

TEST_P(VastAdAttributeTest, IdAndSequence) {
    const AdAttributeCase& c = GetParam();
    ASSERT_EQ(Parse(std::string("<VAST><Ad ") + c.attributes + "><InLine/></Ad></VAST>"), 0u);
    ASSERT_NE(Ad(0), nullptr);
    if (c.id == nullptr) {
        EXPECT_EQ(Ad(0)->id, nullptr);
    } else {
        EXPECT_EQ(Str(Ad(0)->id), c.id);
    }
    EXPECT_EQ(Ad(0)->sequence, c.sequence);
}

INSTANTIATE_TEST_SUITE_P(Ads, VastAdAttributeTest,
                         ::testing::Values(AdAttributeCase{"", nullptr, 0},
                                           AdAttributeCase{"id=\"\" sequence=\"\"", nullptr, 0},
                                           AdAttributeCase{"id=\"x\" sequence=\"7\"", "x", 7},
                                           AdAttributeCase{"sequence=\"abc\"", nullptr, 0},
                                           AdAttributeCase{"sequence=\"12th\"", nullptr, 12},
                                           AdAttributeCase{"sequence=\"-2\"", nullptr, -2},
                                           AdAttributeCase{"ID=\"upper\"", nullptr, 0}));

// ---- Texts: raw text with CDATA unwrapping against element text ------------------------------

// Where one text lands, given the parsed container.
typedef std::function<const char*(CVASTParser&)> TextField;

const AdInLine* FirstInLine(CVASTParser& p) {
    AdData* ad = p.mVastAdData.firstAd;
    return ad == nullptr ? nullptr : static_cast<AdInLine*>(ad->body);
}

const AdLinear* FirstLinear(CVASTParser& p) {
    const AdInLine* inLine = FirstInLine(p);
    return inLine == nullptr || inLine->creatives == nullptr ? nullptr
                                                             : &inLine->creatives->content;
}

struct TextKind {
    const char* name;
    const char* before;  // document up to the text
    const char* after;   // document after the text
    bool raw;            // raw text with CDATA unwrapping, else element text
    bool decodesCData;   // "&amp;" decoded even inside CDATA (Survey)
    TextField field;
};

const char* InLineField(CVASTParser& p, char* AdInLine::*member) {
    const AdInLine* inLine = FirstInLine(p);
    return inLine == nullptr ? nullptr : inLine->*member;
}

const std::vector<TextKind>& TextKinds() {
    static const std::vector<TextKind> kinds = {
        {"AdSystem", "<AdSystem>", "</AdSystem>", true, false,
         [](CVASTParser& p) { return InLineField(p, &AdInLine::adSystem); }},
        {"AdTitle", "<AdTitle>", "</AdTitle>", true, false,
         [](CVASTParser& p) { return InLineField(p, &AdInLine::adTitle); }},
        {"Description", "<Description>", "</Description>", true, false,
         [](CVASTParser& p) { return InLineField(p, &AdInLine::description); }},
        {"Advertiser", "<Advertiser>", "</Advertiser>", true, false,
         [](CVASTParser& p) { return InLineField(p, &AdInLine::advertiser); }},
        {"Survey", "<Survey>", "</Survey>", true, true,
         [](CVASTParser& p) { return InLineField(p, &AdInLine::survey); }},
        {"InLineError", "<Error>", "</Error>", false, false,
         [](CVASTParser& p) { return InLineField(p, &AdInLine::error); }},
        {"InLineImpression", "<Impression>", "</Impression>", false, false,
         [](CVASTParser& p) -> const char* {
             const AdInLine* inLine = FirstInLine(p);
             return inLine == nullptr || inLine->impressions == nullptr ? nullptr
                                                                        : inLine->impressions->url;
         }},
        {"RootError", "<Error>", "</Error>", false, false,
         [](CVASTParser& p) -> const char* { return p.mVastAdData.errorUrl; }},
        {"MediaFile", "<MediaFiles><MediaFile>", "</MediaFile></MediaFiles>", false, false,
         [](CVASTParser& p) -> const char* {
             const AdLinear* l = FirstLinear(p);
             return l == nullptr || l->mediaFiles == nullptr ? nullptr : l->mediaFiles->url;
         }},
        {"ClickThrough", "<VideoClicks><ClickThrough>", "</ClickThrough></VideoClicks>", false,
         false,
         [](CVASTParser& p) -> const char* {
             const AdLinear* l = FirstLinear(p);
             return l == nullptr || l->videoClicks == nullptr ||
                            l->videoClicks->clickThroughs == nullptr
                        ? nullptr
                        : l->videoClicks->clickThroughs->url;
         }},
        {"Tracking", "<TrackingEvents><Tracking event=\"start\">", "</Tracking></TrackingEvents>",
         false, false,
         [](CVASTParser& p) -> const char* {
             const AdLinear* l = FirstLinear(p);
             return l == nullptr || l->trackingEvents == nullptr ? nullptr : l->trackingEvents->url;
         }},
        {"VASTAdTagURI", "<VASTAdTagURI>", "</VASTAdTagURI>", false, false,
         [](CVASTParser& p) -> const char* {
             AdData* ad = p.mVastAdData.firstAd;
             return ad == nullptr || ad->body == nullptr
                        ? nullptr
                        : static_cast<AdWrapper*>(ad->body)->vastAdTagUri;
         }},
    };
    return kinds;
}

// The document around one text of the given kind.
std::string TextDocument(const TextKind& kind, const std::string& text) {
    std::string name = kind.name;
    std::string inner = std::string(kind.before) + text + kind.after;
    if (name == "RootError") return "<VAST>" + inner + "<Ad><InLine/></Ad></VAST>";
    if (name == "VASTAdTagURI") return "<VAST><Ad><Wrapper>" + inner + "</Wrapper></Ad></VAST>";
    if (name == "MediaFile" || name == "ClickThrough" || name == "Tracking") {
        return "<VAST><Ad><InLine><Creatives><Creative><Linear>" + inner +
               "</Linear></Creative></Creatives></InLine></Ad></VAST>";
    }
    return "<VAST><Ad><InLine>" + inner + "</InLine></Ad></VAST>";
}

struct TextInput {
    const char* name;
    const char* text;
    const char* asRaw;      // expected for raw text (null: field stays null)
    const char* asElement;  // expected for element text
    const char* asSurvey;   // expected for Survey
};

const TextInput kTextInputs[] = {
    {"Plain", "https://x.example.com/a?b=1", "https://x.example.com/a?b=1",
     "https://x.example.com/a?b=1", "https://x.example.com/a?b=1"},
    {"EntityOutsideCData", "a?x=1&amp;y=2", "a?x=1&amp;y=2", "a?x=1&y=2", "a?x=1&y=2"},
    {"EntityInsideCData", "<![CDATA[  a?x=1&amp;y=2  ]]>", "a?x=1&amp;y=2", "a?x=1&amp;y=2",
     "a?x=1&y=2"},
    {"CDataOnOwnLines", "\n   <![CDATA[\n  https://x.example.com/c  \n]]>\n  ",
     "https://x.example.com/c", "https://x.example.com/c", "https://x.example.com/c"},
    {"DoubleEntityDecodedOnce", "a&amp;amp;b", "a&amp;amp;b", "a&amp;b", "a&amp;b"},
    {"SurroundingBlanks", "   spaced out   ", "spaced out", "spaced out", "spaced out"},
    {"EmptyElement", "", nullptr, nullptr, nullptr},
    {"BlankCData", "<![CDATA[   ]]>", "", "", ""},
};

TEST_F(VastParserTest, EveryTextKindTreatsCDataAndEntitiesAsItShould) {
    for (const TextKind& kind : TextKinds()) {
        for (const TextInput& input : kTextInputs) {
            SCOPED_TRACE(std::string(kind.name) + " / " + input.name);
            const char* expected = kind.decodesCData ? input.asSurvey
                                   : kind.raw        ? input.asRaw
                                                     : input.asElement;
            // An impression node is never made for an empty text.
            if (std::string(kind.name) == "InLineImpression" && expected != nullptr &&
                expected[0] == '\0') {
                expected = nullptr;
            }
            ASSERT_EQ(Reparse(TextDocument(kind, input.text)), 0u);
            const char* value = kind.field(*mParser);
            if (expected == nullptr) {
                EXPECT_EQ(value, nullptr) << "got '" << Str(value) << "'";
            } else {
                EXPECT_EQ(Str(value), expected);
            }
            mParser->ReleaseVastAdData(&Data());
        }
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

// ---- Impressions -----------------------------------------------------------------------------

TEST_F(VastParserTest, ImpressionCountIncludesEmptyImpressions) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Impression/><Impression>u1</Impression><Impression>   </Impression>"
                  "<Impression><![CDATA[]]></Impression><Impression>u2</Impression>")),
              0u);
    AdInLine* inLine = InLine(0);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(inLine->impressionCount, 5u);
    ASSERT_EQ(Length(inLine->impressions), 2u);
    EXPECT_EQ(Str(inLine->impressions->url), "u1");
    EXPECT_EQ(Str(inLine->impressions->next->url), "u2");
}

TEST_F(VastParserTest, ManySiblingsKeepDocumentOrder) {
    // 100,000 siblings of each list kind; appending must stay linear and in order.
    const int kCount = 100000;
    std::string impressions;
    std::string trackings;
    std::string clicks;
    for (int i = 0; i < kCount; ++i) {
        std::string n = std::to_string(i);
        impressions += "<Impression>i" + n + "</Impression>";
        trackings += "<Tracking event=\"e\">t" + n + "</Tracking>";
        // Two lists filled alternately.
        clicks += (i % 2 == 0 ? "<ClickThrough>c" : "<ClickTracking>c") + n +
                  (i % 2 == 0 ? "</ClickThrough>" : "</ClickTracking>");
    }
    std::string document;
    document += "<VAST>";
    for (int i = 0; i < 1000; ++i) document += "<Ad/>";
    document += "<Ad><InLine>" + impressions + "<Creatives><Creative><Linear><TrackingEvents>" +
                trackings + "</TrackingEvents><VideoClicks>" + clicks +
                "</VideoClicks></Linear></Creative></Creatives></InLine></Ad></VAST>";
    auto started = std::chrono::steady_clock::now();
    ASSERT_EQ(Parse(document), 0u);
    // Linear work takes well under a second even under sanitizers; walking each list from its
    // head for every append would take minutes.
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(15));
    EXPECT_EQ(Data().adCount, 1001u);
    AdInLine* inLine = InLine(1000);
    ASSERT_NE(inLine, nullptr);
    ASSERT_EQ(inLine->impressionCount, static_cast<uint32_t>(kCount));
    uint32_t i = 0;
    for (AdImpression* p = inLine->impressions; p != nullptr; p = p->next, ++i) {
        ASSERT_EQ(Str(p->url), "i" + std::to_string(i));
    }
    EXPECT_EQ(i, static_cast<uint32_t>(kCount));
    AdLinear& linear = inLine->creatives->content;
    ASSERT_EQ(linear.trackingCount, static_cast<uint32_t>(kCount));
    EXPECT_EQ(Str(Nth(linear.trackingEvents, kCount - 1)->url), "t" + std::to_string(kCount - 1));
    EXPECT_EQ(linear.videoClicks->clickThroughCount, static_cast<uint32_t>(kCount / 2));
    EXPECT_EQ(linear.videoClicks->clickTrackingCount, static_cast<uint32_t>(kCount / 2));
    EXPECT_EQ(Str(Nth(linear.videoClicks->clickTrackings, 2)->url), "c5");
}

// ---- Process and its lifecycle ---------------------------------------------------------------

TEST_F(VastParserTest, RejectedBufferFailsAndLeavesContainerEmpty) {
    const char* kBad[] = {"", "not xml at all <", "<VAST><Ad></VAST>", "<?xml version=\"1.0\"?>"};
    for (const char* bad : kBad) {
        SCOPED_TRACE(bad);
        EXPECT_EQ(Reparse(bad), KA_ERR_LOAD_FAILED);
        EXPECT_EQ(Data().adCount, 0u);
        EXPECT_EQ(Data().firstAd, nullptr);
        EXPECT_EQ(Data().errorUrl, nullptr);
    }
}

TEST_F(VastParserTest, NullBufferFails) {
    EXPECT_EQ(mParser->Process(nullptr, 10, 1, nullptr), KA_ERR_LOAD_FAILED);
}

TEST_F(VastParserTest, ProcessStoresItsFlagsEvenWhenItFails) {
    KA_BOOL stop = 0;
    EXPECT_EQ(mParser->mMergeWrappers, 1);
    std::string bad = "<";
    EXPECT_EQ(mParser->Process(&bad[0], 1, 0, &stop), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->mMergeWrappers, 0);
    EXPECT_EQ(mParser->mStopFlag, &stop);
}

TEST_F(VastParserTest, SecondProcessWithoutOpenFails) {
    const std::string document = vasttest::InLineDocument("<AdSystem>s</AdSystem>");
    ASSERT_EQ(Parse(document), 0u);
    EXPECT_EQ(Parse(document), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(Data().adCount, 1u);
}

TEST_F(VastParserTest, ProcessWithoutOpenFails) {
    CVASTParser fresh;
    std::string document = vasttest::InLineDocument("");
    EXPECT_EQ(fresh.Process(&document[0], static_cast<unsigned int>(document.size()), 1, nullptr),
              KA_ERR_LOAD_FAILED);
    EXPECT_EQ(fresh.mVastAdData.firstAd, nullptr);
}

TEST_F(VastParserTest, OpenWithoutModulesFails) {
    CVASTParser lost;
    static char kNowhere[] = "/nonexistent-ka-modules/";
    EXPECT_EQ(lost.Open(kNowhere), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(lost.mWorkPath, kNowhere);
}

TEST_F(VastParserTest, ConstructorState) {
    CVASTParser fresh;
    EXPECT_EQ(fresh.mVastAdData.adCount, 0u);
    EXPECT_EQ(fresh.mVastAdData.firstAd, nullptr);
    EXPECT_EQ(fresh.mVastAdData.errorUrl, nullptr);
    EXPECT_EQ(fresh.mVastAdData.depth, 0u);
    EXPECT_EQ(fresh.mMaxDepth, 10u);
    EXPECT_EQ(fresh.mExtensionParser, nullptr);
    EXPECT_EQ(fresh.mMergeWrappers, 1);
    EXPECT_EQ(fresh.mStopFlag, nullptr);
    EXPECT_EQ(fresh.mXMLHandle, nullptr);
}

TEST_F(VastParserTest, LaterDocumentsAppendToTheContainer) {
    ASSERT_EQ(Parse("<VAST><Ad id=\"1\"><InLine/></Ad><Error>first</Error></VAST>"), 0u);
    ASSERT_EQ(Reparse("<VAST><Ad id=\"2\"><Wrapper/></Ad><Ad id=\"3\"/></VAST>"), 0u);
    EXPECT_EQ(Data().adCount, 3u);
    EXPECT_EQ(Str(Ad(0)->id), "1");
    EXPECT_EQ(Str(Ad(1)->id), "2");
    EXPECT_EQ(Str(Ad(2)->id), "3");
    EXPECT_EQ(Str(Data().errorUrl), "first");
    // Released and parsed again: nothing of the old list is reused.
    mParser->ReleaseVastAdData(&Data());
    ASSERT_EQ(Reparse("<VAST><Ad id=\"4\"/><Ad id=\"5\"/></VAST>"), 0u);
    EXPECT_EQ(Data().adCount, 2u);
    EXPECT_EQ(Str(Ad(1)->id), "5");
}

TEST_F(VastParserTest, ParseVastNodeOfAnotherParsersDocument) {
    // The owner keeps its document loaded; this parser walks the element through its own module.
    CVASTParser owner;
    ASSERT_EQ(owner.Open(vasttest::ModulesDir()), 0u);
    std::string document =
        "<VMAP><Wrap><VAST><Ad id=\"n\"><InLine><AdTitle>t</AdTitle></InLine></Ad></VAST></Wrap>"
        "</VMAP>";
    ASSERT_EQ(owner.LoadXML(&document[0], static_cast<int>(document.size()), 160), 0u);
    void* root = nullptr;
    owner.GetFirstChild(nullptr, &root);
    void* wrap = nullptr;
    owner.GetFirstChild(root, &wrap);
    void* vast = nullptr;
    owner.GetFirstChild(wrap, &vast);
    ASSERT_NE(vast, nullptr);
    EXPECT_EQ(mParser->ParseVASTNode(vast, false, true), 0u);
    ASSERT_EQ(Data().adCount, 1u);
    EXPECT_EQ(Str(InLine(0)->adTitle), "t");
    // Not the owner of the document: still open afterwards, flags untouched.
    EXPECT_NE(mParser->mXMLHandle, nullptr);
    EXPECT_EQ(mParser->mStopFlag, nullptr);
    owner.Close();
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
    int parsed = 0;
    int built = 0;
    int destroyed = 0;
    int parserDestroyed = 0;
    std::vector<std::string> tags;
};

class TestExtensions : public CAdExtensions {
public:
    TestExtensions(ExtensionLog* log, int serial) : mLog(log), mSerial(serial) {}
    ~TestExtensions() override { mLog->destroyed++; }
    ExtensionLog* mLog;
    int mSerial;
};

// The log outlives TearDown, where the last records and parsers are destroyed.
class VastExtensionTest : public VastParserTest {
protected:
    ExtensionLog mLog;
};

class TestExtensionParser : public CExtensionParser {
public:
    TestExtensionParser(CVASTParser* owner, ExtensionLog* log, uint32_t result)
        : mOwner(owner), mLog(log), mResult(result) {}
    ~TestExtensionParser() override { mLog->parserDestroyed++; }
    uint32_t Parse(void* node) override {
        mLog->parsed++;
        char* name = nullptr;
        int length = 0;
        mOwner->GetTagName(node, &name, length);
        mLog->tags.push_back(name == nullptr ? "" : std::string(name, length));
        return mResult;
    }
    CAdExtensions* GetResult() override {
        mLog->built++;
        return new TestExtensions(mLog, mLog->built);
    }
    CVASTParser* mOwner;
    ExtensionLog* mLog;
    uint32_t mResult;
};

TEST_F(VastExtensionTest, ExtensionParserBuildsOneObjectPerAdAndTheAdDestroysIt) {
    mParser->SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(mParser, &mLog, 0));
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    EXPECT_EQ(mLog.parsed, 2);
    EXPECT_EQ(mLog.tags, (std::vector<std::string>{"Extensions", "Extensions"}));
    // Process closes the parser, and with it the extension parser.
    EXPECT_EQ(mLog.parserDestroyed, 1);
    EXPECT_EQ(mParser->mExtensionParser, nullptr);
    ASSERT_NE(InLine(0)->extensions, nullptr);
    EXPECT_EQ(static_cast<TestExtensions*>(InLine(0)->extensions)->mSerial, 1);
    ASSERT_NE(Wrapper(1)->extensions, nullptr);
    EXPECT_EQ(static_cast<TestExtensions*>(Wrapper(1)->extensions)->mSerial, 2);
    EXPECT_EQ(mLog.destroyed, 0);
    mParser->ReleaseAdData(Ad(0));
    EXPECT_EQ(mLog.destroyed, 1);
    mParser->ReleaseVastAdData(&Data());
    EXPECT_EQ(mLog.destroyed, 2);
}

TEST_F(VastExtensionTest, FailedExtensionParseStoresNothing) {
    mParser->SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(mParser, &mLog, 7));
    ASSERT_EQ(Parse(vasttest::InLineDocument("<Extensions/>")), 0u);
    EXPECT_EQ(mLog.parsed, 1);
    EXPECT_EQ(mLog.built, 0);
    EXPECT_EQ(InLine(0)->extensions, nullptr);
}

TEST_F(VastExtensionTest, SecondExtensionsReplacesTheFirstObject) {
    mParser->SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(mParser, &mLog, 0));
    ASSERT_EQ(Parse(vasttest::InLineDocument("<Extensions/><Extensions/>")), 0u);
    EXPECT_EQ(mLog.built, 2);
    EXPECT_EQ(mLog.destroyed, 1);
    ASSERT_NE(InLine(0)->extensions, nullptr);
    EXPECT_EQ(static_cast<TestExtensions*>(InLine(0)->extensions)->mSerial, 2);
}

TEST_F(VastExtensionTest, ExtensionsHandlerReturnsTheParseResult) {
    mParser->SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(mParser, &mLog, 9));
    std::string document = vasttest::InLineDocument("<Extensions/>");
    ASSERT_EQ(mParser->LoadXML(&document[0], static_cast<int>(document.size()), 160), 0u);
    void* vast = nullptr;
    mParser->GetFirstChild(nullptr, &vast);
    void* ad = nullptr;
    mParser->GetFirstChild(vast, &ad);
    void* inLineNode = nullptr;
    mParser->GetFirstChild(ad, &inLineNode);
    void* extensions = nullptr;
    mParser->GetFirstChild(inLineNode, &extensions);
    AdInLine inLine = AdInLine();
    char name[] = "Extensions";
    EXPECT_EQ(mParser->LoadInLineTag(extensions, &inLine, name, 10), 9u);
    EXPECT_EQ(inLine.extensions, nullptr);
}

TEST_F(VastExtensionTest, CloseAndDestructorDestroyTheExtensionParser) {
    mParser->SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(mParser, &mLog, 0));
    EXPECT_EQ(mParser->Close(), 0u);
    EXPECT_EQ(mLog.parserDestroyed, 1);
    EXPECT_EQ(mParser->mExtensionParser, nullptr);
    {
        CVASTParser other;
        other.SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(&other, &mLog, 0));
    }
    EXPECT_EQ(mLog.parserDestroyed, 2);
}

// ---- Handlers given nothing ------------------------------------------------------------------

TEST_F(VastParserTest, HandlersIgnoreNullArguments) {
    AdData ad = AdData();
    char name[] = "InLine";
    typedef std::function<unsigned int(void*, void*, char*)> Call;
    CVASTParser& p = *mParser;
    const Call kHandlers[] = {
        [&](void* n, void* t, char* s) { return p.LoadVASTTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadAdTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadInLineTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadCreativesTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadWrapperTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadCreativeTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadLinearTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadMediaFilesTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadVideoClicksTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadTrackingEventsTag(n, t, s, 6); },
        [&](void* n, void* t, char* s) { return p.LoadIgnoredTag(n, t, s, 6); },
    };
    int dummyNode = 0;
    for (const Call& call : kHandlers) {
        EXPECT_EQ(call(nullptr, &ad, name), 0u);
        EXPECT_EQ(call(&dummyNode, nullptr, name), 0u);
        EXPECT_EQ(call(&dummyNode, &ad, nullptr), 0u);
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

// ---- The bundled examples --------------------------------------------------------------------

TEST_F(VastParserTest, EveryVastExampleParses) {
    int seen = 0;
    for (const auto& entry : std::filesystem::directory_iterator(KA_EXAMPLES_DIR)) {
        std::string file = entry.path().filename().string();
        if (file.rfind("vast-", 0) != 0 || entry.path().extension() != ".xml") continue;
        SCOPED_TRACE(file);
        ++seen;
        ASSERT_EQ(Reparse(vasttest::ReadFile(entry.path().string())), 0u);
        ASSERT_GE(Data().adCount, 1u);
        for (AdData* ad = Data().firstAd; ad != nullptr; ad = ad->next) {
            EXPECT_NE(ad->body, nullptr);
        }
        mParser->ReleaseVastAdData(&Data());
    }
    EXPECT_GE(seen, 3);
}

}  // namespace
