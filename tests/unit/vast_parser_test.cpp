// CVASTParser over the stand-in XML module: ads and their bodies, creatives and linear content,
// texts, Process and its failures, releases, extension parsers.
#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>
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

std::string DataFile(const char* name) {
    return vasttest::ReadFile(std::string(KA_TEST_DATA_DIR) + "vast/" + name);
}

// Every field of a record in one line, so a whole record is compared at once.
std::string Describe(const AdMediaFile* m) {
    std::ostringstream s;
    s << m->delivery << '|' << Str(m->type) << '|' << m->width << 'x' << m->height << '|'
      << Str(m->codec) << '|' << m->id << '|' << m->bitrate << '|' << m->minBitrate << '-'
      << m->maxBitrate << '|' << int(m->scalable) << '|' << int(m->maintainAspectRatio) << '|'
      << Str(m->url);
    return s.str();
}
std::string Describe(const AdTracking* t) {
    return Str(t->event) + "|" + std::to_string(t->offsetKind) + "|" + std::to_string(t->offset) +
           "|" + Str(t->url);
}
std::string Describe(const AdClick* c) { return Str(c->id) + "|" + Str(c->url); }
template <typename T>
Strings DescribeAll(const T* list) {
    Strings all;
    for (; list != nullptr; list = list->next) all.push_back(Describe(list));
    return all;
}

const AdLinear kZeroLinear = AdLinear();

// ---- Whole documents -------------------------------------------------------------------------

// How each text, attribute and list is read is pinned down by the tables below; here the
// structure of a real document.
TEST_F(VastParserTest, InLineAndWrapperAdsOfAFullDocument) {
    ASSERT_EQ(Parse(DataFile("inline_full.xml")), 0u);
    EXPECT_EQ(Data().adCount, 2u);
    EXPECT_EQ(Str(Data().errorUrl), "https://err.example.com/root-last");  // last non-empty
    EXPECT_EQ(Str(Ad(0)->id) + "|" + std::to_string(Ad(0)->sequence), "ad-1|3");
    AdInLine* inLine = InLine(0);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(inLine->impressionCount, 4u);  // the empty one is counted, not stored
    EXPECT_EQ(Length(inLine->impressions), 3u);
    EXPECT_EQ(inLine->extensions, nullptr);  // no extension parser installed
    ASSERT_NE(Wrapper(1), nullptr);
    EXPECT_EQ(Length(Wrapper(1)->creatives), 1u);  // only <Creative> children become creatives

    ASSERT_EQ(inLine->creativeCount, 3u);
    AdCreative* first = inLine->creatives;
    EXPECT_EQ(Str(first->id) + "|" + std::to_string(first->sequence) + "|" + Str(first->adId) +
                  "|" + std::to_string(first->kind),
              "c1|1|a-1|1");
    const AdLinear& linear = first->content;
    EXPECT_EQ(linear.duration, 30500u);
    EXPECT_EQ(linear.mediaFileCount, 2u);  // <Mezzanine> is no media file
    const AdVideoClicks* clicks = linear.videoClicks;
    ASSERT_NE(clicks, nullptr);
    EXPECT_EQ(DescribeAll(clicks->clickThroughs), Strings{"ct|https://click.example.com/through"});
    EXPECT_EQ(
        DescribeAll(clicks->clickTrackings),
        (Strings{"tr1|https://click.example.com/t1", "<null>|https://click.example.com/t2?a=1&b=2",
                 "tr3|https://click.example.com/t3?a=1&amp;b=2"}));
    EXPECT_EQ(DescribeAll(clicks->customClicks), Strings{"cc|https://click.example.com/custom"});
    EXPECT_EQ(linear.trackingCount, 4u);
    EXPECT_EQ(linear.adParametersCount, 1u);
    EXPECT_EQ(linear.iconCount, 0u);  // icons with content are never stored
    // A companion-only creative keeps kind 0 and an all-zero content.
    const AdCreative* third = Nth(first, 2);
    EXPECT_EQ(third->kind, AD_CREATIVE_NONE);
    EXPECT_EQ(memcmp(&third->content, &kZeroLinear, sizeof(kZeroLinear)), 0);
}

// Last non-empty wins for the URI and the error; the later <InLine> changes nothing.
TEST_F(VastParserTest, WrapperAdReadWithAllItsData) {
    ASSERT_EQ(Parse(DataFile("wrapper_only.xml")), 0u);
    AdWrapper* wrapper = Wrapper(0);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_EQ(Str(wrapper->adSystem), "Wrap &amp; Co");
    EXPECT_EQ(Str(wrapper->vastAdTagUri), "https://wrap.example.com/second.xml?s=1&amp;t=2");
    EXPECT_EQ(Str(wrapper->error), "https://err.example.com/last?a=1&b=2");
    EXPECT_EQ(Urls(wrapper->impressions),
              (Strings{"https://imp.example.com/w1", "https://imp.example.com/w2?a=1&amp;b=2"}));
    ASSERT_EQ(Length(wrapper->creatives), 2u);
    const AdCreative* first = wrapper->creatives;
    EXPECT_EQ(Str(first->adId) + "|" + std::to_string(first->kind), "wa1|1");
    EXPECT_EQ(DescribeAll(first->content.trackingEvents),
              (Strings{"start|0|0|https://track.example.com/w-start",
                       "progress|2|50|https://track.example.com/w-half"}));
    EXPECT_EQ(Str(first->content.videoClicks->clickTrackings->id), "wt");
    EXPECT_EQ(first->next->kind, AD_CREATIVE_NONE);
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

// ---- <Ad>: type, body, attributes ------------------------------------------------------------

// Names are case-sensitive and the root may have any name: only the one <Ad> counts.
TEST_F(VastParserTest, AdTypeBodyIdAndSequence) {
    const std::string i = "<InLine><AdSystem>I</AdSystem></InLine>";
    const std::string w = "<Wrapper><AdSystem>W</AdSystem></Wrapper>";
    const struct {
        std::string attributes, content;  // of <Ad>
        uint32_t type;
        const char* adSystem;  // of the body that was read; null: no body
        const char* id;
        int32_t sequence;
    } kCases[] = {
        {"", "", AD_TYPE_UNKNOWN, nullptr, "<null>", 0},
        {"id=\"\" sequence=\"\"", "text", AD_TYPE_UNKNOWN, nullptr, "<null>", 0},
        // Unknown children mark the ad InLine but give it no body.
        {"id=\"x\" sequence=\"7\"", "<Something/>", AD_TYPE_INLINE, nullptr, "x", 7},
        {"sequence=\"abc\"", "<inline/><WRAPPER/>", AD_TYPE_INLINE, nullptr, "<null>", 0},
        {"sequence=\"12th\"", "<InLine/>", AD_TYPE_INLINE, "<null>", "<null>", 12},
        {"sequence=\"-2\"", w, AD_TYPE_WRAPPER, "W", "<null>", -2},
        {"ID=\"upper\"", i + w, AD_TYPE_INLINE, "I", "<null>", 0},
        {"", w + i, AD_TYPE_WRAPPER, "W", "<null>", 0},
        {"", w + "<Other/>", AD_TYPE_WRAPPER, "W", "<null>", 0},
        {"", "<Other/>" + w, AD_TYPE_WRAPPER, "W", "<null>", 0},
        {"", i + "<InLine><AdSystem>2</AdSystem></InLine>", AD_TYPE_INLINE, "I", "<null>", 0},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.attributes + c.content);
        ASSERT_EQ(Fresh("<Playlist><ad><InLine/></ad><AD/><Ad " + c.attributes + ">" + c.content +
                        "</Ad></Playlist>"),
                  0u);
        ASSERT_EQ(Data().adCount, 1u);
        EXPECT_EQ(Ad(0)->type, c.type);
        EXPECT_EQ(Str(Ad(0)->id), c.id);
        EXPECT_EQ(Ad(0)->sequence, c.sequence);
        ASSERT_EQ(Ad(0)->body != nullptr, c.adSystem != nullptr);
        if (c.adSystem == nullptr) continue;
        EXPECT_EQ(Str(c.type == AD_TYPE_INLINE ? InLine(0)->adSystem : Wrapper(0)->adSystem),
                  c.adSystem);
    }
}

// ---- Texts -----------------------------------------------------------------------------------

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
        {"\n <![CDATA[\n  https://x.example/c  \n]]>\n ",
         {"https://x.example/c", "https://x.example/c", "https://x.example/c"}},
        {"a&amp;amp;b", {"a&amp;amp;b", "a&amp;b", "a&amp;b"}},  // decoded once
        {"   spaced out   ", {"spaced out", "spaced out", "spaced out"}},
        {"", {nullptr, nullptr, nullptr}},
        {"<![CDATA[   ]]>", {"", "", ""}},
    };
    for (const auto& input : kInputs) {
        SCOPED_TRACE(std::string("'") + input.text + "'");
        const std::string t = input.text;
        // The same text in every element that holds one; a later blank one changes nothing.
        std::string in = "<Impression>" + t + "</Impression>";
        for (const std::string name :
             {"AdSystem", "AdTitle", "Description", "Advertiser", "Survey", "Error"}) {
            in += "<" + name + ">" + t + "</" + name + "><" + name + "> </" + name + ">";
        }
        in += "<Creatives><Creative><Linear><MediaFiles><MediaFile>" + t +
              "</MediaFile></MediaFiles><VideoClicks><ClickThrough>" + t +
              "</ClickThrough></VideoClicks><TrackingEvents><Tracking>" + t +
              "</Tracking></TrackingEvents></Linear></Creative></Creatives>";
        ASSERT_EQ(Fresh("<VAST><Error>" + t + "</Error><Ad><InLine>" + in +
                        "</InLine></Ad><Ad><Wrapper><VASTAdTagURI>" + t +
                        "</VASTAdTagURI><VASTAdTagURI/></Wrapper></Ad><Error/></VAST>"),
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

// ---- Linear content --------------------------------------------------------------------------

TEST_F(VastParserTest, SkipOffsetInMilliseconds) {
    const struct {
        const char* attributes;  // of <Linear>
        const char* duration;    // <Duration> text, null for none
        int64_t skipOffset;
    } kCases[] = {
        // clang-format off
        {"skipoffset=\"00:00:05\"", "00:00:30", 5000},
        {"skipoffset=\"00:01:02.250\"", nullptr, 62250},
        {"skipoffset=\"25%\"", "00:00:30", 7500}, {"skipoffset=\"%25\"", "00:00:30", 0},
        {"skipoffset=\"25%\"", nullptr, 0}, {"skipoffset=\"7.5%\"", "00:00:10", 700},
        {"skipoffset=\"100%\"", "00:00:30", 3000},  // two digits read: 10%
        {"skipoffset=\"33%\"", "00:00:00.010", 3},  // truncated
        {"skipoffset=\"x%\"", "00:00:30", 0}, {"skipoffset=\"soon\"", "00:00:30", 0},
        {"", "00:00:30", -1}, {"skipoffset=\"\"", "00:00:30", -1},
        {"skipOffset=\"00:00:05\"", "00:00:30", -1},
        // clang-format on
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(std::string(c.attributes) + " / " + (c.duration ? c.duration : "-"));
        const std::string duration =
            c.duration == nullptr ? "" : std::string("<Duration>") + c.duration + "</Duration>";
        ASSERT_EQ(Fresh(vasttest::LinearDocument(c.attributes, duration)), 0u);
        ASSERT_NE(FirstCreative(), nullptr);
        EXPECT_EQ(FirstCreative()->content.skipOffset, c.skipOffset);
    }
}

TEST_F(VastParserTest, TrackingAndMediaFileAttributes) {
    const struct {
        bool media;              // a <MediaFile>, else a <Tracking>
        const char* attributes;  // of that element
        const char* described;   // see Describe
    } kCases[] = {
        {false, "event=\"progress\" offset=\"75%\"", "progress|2|75|u"},
        {false, "event=\"progress\" offset=\"00:00:10.500\"", "progress|1|10500|u"},
        {false, "event=\"start\"", "start|0|0|u"},
        {false, "event=\"start\" offset=\"\"", "start|0|0|u"},
        {false, "offset=\"100%\"", "<null>|2|10|u"},
        {false, "offset=\"-5%\"", "<null>|2|-5|u"},
        {false, "event=\"madeUp &amp; more\"", "madeUp &amp; more|0|0|u"},
        {true, "delivery=\"streaming\"", "1|<null>|0x0|<null>|0|0|0-0|0|0|u"},
        {true, "delivery=\"Streaming\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|u"},
        {true, "delivery=\"streamingx\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|u"},
        {true, "id=\"42\" bitrate=\"9\"", "0|<null>|0x0|<null>|42|9|0-0|0|0|u"},
        {true, "id=\"12abc\"", "0|<null>|0x0|<null>|12|0|0-0|0|0|u"},
        {true, "id=\"abc\" scalable=\"true\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|u"},
        {true,
         "type=\"video/mp4\" width=\"1280\" height=\"720\" codec=\"H.264\" minBitrate=\"1\" "
         "maxBitrate=\"2\"",
         "0|video/mp4|1280x720|H.264|0|0|1-2|0|0|u"},
        {true, "scalable=\"1\" maintainAspectRatio=\"true\"", "0|<null>|0x0|<null>|0|0|0-0|1|0|u"},
        {true, "width=\"-3\" height=\"\" type=\"\" codec=\"\"",
         "0|<null>|-3x0|<null>|0|0|0-0|0|0|u"},
        {true, "Width=\"5\" TYPE=\"x\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|u"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.attributes);
        const std::string a = c.attributes;
        ASSERT_EQ(
            Fresh(vasttest::LinearDocument(
                "", "<Duration>00:00:30</Duration>" +
                        (c.media ? "<MediaFiles><MediaFile " + a + ">u</MediaFile></MediaFiles>"
                                 : "<TrackingEvents><Tracking " + a +
                                       ">u</Tracking></TrackingEvents>"))),
            0u);
        ASSERT_NE(FirstCreative(), nullptr);
        const AdLinear& l = FirstCreative()->content;
        EXPECT_EQ(c.media ? DescribeAll(l.mediaFiles) : DescribeAll(l.trackingEvents),
                  Strings{c.described});
    }
}

// Repeated lists append, a second VideoClicks or AdParameters is ignored, a later Duration and
// a second Linear read into the same content; only <Creative> children are creatives.
TEST_F(VastParserTest, StructureRulesOfCreativesAndLinears) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Creatives><Creative id=\"\" sequence=\"2x\" adId=\"\">"
                  "<Linear skipoffset=\"00:00:01\">"
                  "<MediaFiles><MediaFile>m1</MediaFile></MediaFiles>"
                  "<TrackingEvents><Tracking>t1</Tracking></TrackingEvents>"
                  "<VideoClicks><ClickThrough>a</ClickThrough><Other>x</Other>"
                  "<ClickTracking>1</ClickTracking><ClickTracking/></VideoClicks>"
                  "<AdParameters>p</AdParameters>"
                  "<VideoClicks><ClickThrough>b</ClickThrough></VideoClicks>"
                  "<AdParameters>q</AdParameters>"
                  "<MediaFiles><MediaFile>m2</MediaFile><MediaFile>m3</MediaFile></MediaFiles>"
                  "<TrackingEvents><Tracking>t2</Tracking></TrackingEvents>"
                  "<Duration>00:00:01</Duration><Duration>00:00:02</Duration></Linear>"
                  "<NonLinearAds><NonLinear/></NonLinearAds>"
                  "<Linear><MediaFiles><MediaFile>m4</MediaFile></MediaFiles></Linear></Creative>"
                  "<Other/><creative/><Creative id=\"2\" sequence=\"-1\" AdID=\"wrong case\"/>"
                  "</Creatives><Creatives><Creative id=\"3\"/></Creatives>")),
              0u);
    AdInLine* inLine = InLine(0);
    ASSERT_EQ(inLine->creativeCount, 3u);
    AdCreative* first = inLine->creatives;
    EXPECT_EQ(first->id, nullptr);
    EXPECT_EQ(first->adId, nullptr);
    EXPECT_EQ(first->sequence, 2);
    EXPECT_EQ(first->next->sequence, -1);
    EXPECT_EQ(first->next->adId, nullptr);
    EXPECT_EQ(Str(Nth(first, 2)->id), "3");

    const AdLinear& linear = first->content;
    EXPECT_EQ(Urls(linear.mediaFiles), (Strings{"m1", "m2", "m3", "m4"}));
    EXPECT_EQ(Urls(linear.trackingEvents), (Strings{"t1", "t2"}));
    EXPECT_EQ(linear.duration, 2000u);
    EXPECT_EQ(linear.skipOffset, -1);  // the second Linear has no skipoffset
    EXPECT_EQ(linear.videoClicksCount, 1u);
    EXPECT_EQ(Urls(linear.videoClicks->clickThroughs), Strings{"a"});
    // An element without text still makes a record, with a null url.
    EXPECT_EQ(Urls(linear.videoClicks->clickTrackings), (Strings{"1", "<null>"}));
    EXPECT_EQ(linear.adParametersCount, 1u);
}

// ---- Process, lifecycle and releases ---------------------------------------------------------

TEST_F(VastParserTest, ProcessAndOpenFailures) {
    for (const char* bad :
         {"", "not xml at all <", "<VAST><Ad></VAST>", "<?xml version=\"1.0\"?>"}) {
        SCOPED_TRACE(bad);
        EXPECT_EQ(Reparse(bad), KA_ERR_LOAD_FAILED);
        EXPECT_EQ(Data().adCount, 0u);
        EXPECT_EQ(Data().firstAd, nullptr);
    }
    EXPECT_EQ(mParser->Process(nullptr, 10, 1, nullptr), KA_ERR_LOAD_FAILED);
    // The flags are stored even by a failing Process.
    KA_BOOL stop = 0;
    std::string bad = "<";
    EXPECT_EQ(mParser->Process(&bad[0], 1, 0, &stop), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->mMergeWrappers, 0);
    EXPECT_EQ(mParser->mStopFlag, &stop);
    // Process needs an open parser, and closes it.
    const std::string document = vasttest::InLineDocument("<AdSystem>s</AdSystem>");
    ASSERT_EQ(Reparse(document), 0u);
    EXPECT_EQ(Parse(document), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(Data().adCount, 1u);
    CVASTParser fresh;
    std::string buffer = document;
    EXPECT_EQ(fresh.Process(&buffer[0], static_cast<unsigned int>(buffer.size()), 1, nullptr),
              KA_ERR_LOAD_FAILED);
    EXPECT_EQ(fresh.mVastAdData.firstAd, nullptr);
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
}

TEST_F(VastParserTest, ReleasesEmptyAndCanBeRepeated) {
    ASSERT_EQ(Parse(DataFile("inline_full.xml")), 0u);
    AdLinear& linear = FirstCreative()->content;
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(mParser->ReleaseLinear(&linear), 0u);
        EXPECT_EQ(memcmp(&linear, &kZeroLinear, sizeof(kZeroLinear)), 0);
    }
    EXPECT_EQ(mParser->ReleaseLinear(nullptr), 0u);
    // The node stays, with its sequence, type and next.
    for (uint32_t i = 0; i < 2; ++i) {
        AdData* ad = Ad(i);
        const AdData before = *ad;
        for (int round = 0; round < 2; ++round) {
            EXPECT_EQ(mParser->ReleaseAdData(ad), 0u);
            EXPECT_EQ(ad->id, nullptr);
            EXPECT_EQ(ad->body, nullptr);
            EXPECT_EQ(ad->sequence, before.sequence);
            EXPECT_EQ(ad->type, before.type);
            EXPECT_EQ(ad->next, before.next);
        }
    }
    EXPECT_EQ(mParser->ReleaseAdData(nullptr), 0u);
    Data().depth = 4;
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(mParser->ReleaseVastAdData(&Data()), 0u);
        EXPECT_EQ(Data().adCount, 0u);
        EXPECT_EQ(Data().firstAd, nullptr);
        EXPECT_EQ(Data().errorUrl, nullptr);
        EXPECT_EQ(Data().depth, 4u);  // not the release's business
    }
    EXPECT_EQ(mParser->ReleaseVastAdData(nullptr), 0u);
    // A container without ads: only its error URL to free.
    VastAdData errorOnly = VastAdData();
    errorOnly.errorUrl = new char[2]{'e', '\0'};
    EXPECT_EQ(mParser->ReleaseVastAdData(&errorOnly), 0u);
    EXPECT_EQ(errorOnly.errorUrl, nullptr);
}

// Internal handlers reached with nothing to work on do nothing.
TEST_F(VastParserTest, HandlersIgnoreNullArguments) {
    typedef unsigned int (CVASTParser::*Handler)(void*, void*, char*, unsigned int);
    AdData ad = AdData();
    char name[] = "InLine";
    int node = 0;
    const Handler kHandlers[] = {
        &CVASTParser::LoadVASTTag,        &CVASTParser::LoadAdTag,
        &CVASTParser::LoadInLineTag,      &CVASTParser::LoadCreativesTag,
        &CVASTParser::LoadWrapperTag,     &CVASTParser::LoadCreativeTag,
        &CVASTParser::LoadLinearTag,      &CVASTParser::LoadMediaFilesTag,
        &CVASTParser::LoadVideoClicksTag, &CVASTParser::LoadTrackingEventsTag,
        &CVASTParser::LoadIgnoredTag,
    };
    CVASTParser& p = *mParser;
    for (Handler h : kHandlers) {
        EXPECT_EQ((p.*h)(nullptr, &ad, name, 6), 0u);
        EXPECT_EQ((p.*h)(&node, nullptr, name, 6), 0u);
        EXPECT_EQ((p.*h)(&node, &ad, nullptr, 6), 0u);
    }
    EXPECT_EQ(ad.body, nullptr);
    EXPECT_EQ(ad.type, AD_TYPE_UNKNOWN);
    AdCreative* list = nullptr;
    char creative[] = "Creative";
    EXPECT_EQ(mParser->LoadCreative(nullptr, &list, creative, 8), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->LoadCreative(&node, nullptr, creative, 8), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(mParser->LoadCreative(&node, &list, nullptr, 8), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(list, nullptr);
    EXPECT_EQ(mParser->LoadTag(nullptr, &ad, &CVASTParser::LoadAdTag), 0u);
    EXPECT_EQ(mParser->LoadAdAttributes(nullptr, &ad), 0u);
    EXPECT_EQ(mParser->LoadCreativeAttributes(nullptr, nullptr), 0u);
    EXPECT_EQ(mParser->LoadSkipOffset(nullptr, nullptr), 0u);
    EXPECT_EQ(mParser->LoadMediaFileAttributes(nullptr, nullptr), 0u);
    EXPECT_EQ(mParser->LoadTrackingAttributes(nullptr, nullptr), 0u);
}

// ---- Extension parsers -----------------------------------------------------------------------

struct ExtensionLog {
    int parsed = 0, built = 0, destroyed = 0, parserDestroyed = 0;
};

struct TestExtensions : CAdExtensions {
    TestExtensions(ExtensionLog* log, int serial) : mLog(log), mSerial(serial) {}
    ~TestExtensions() override { mLog->destroyed++; }
    ExtensionLog* mLog;
    int mSerial;
};

struct TestExtensionParser : CExtensionParser {
    TestExtensionParser(CVASTParser* owner, ExtensionLog* log, uint32_t result)
        : mOwner(owner), mLog(log), mResult(result) {}
    ~TestExtensionParser() override { mLog->parserDestroyed++; }
    uint32_t Parse(void* node) override {  // counts only the <Extensions> element itself
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
    // Other parameters are ignored.
    int dummy = 0;
    EXPECT_EQ(mParser->SetParam(0x45000002u, &dummy), 0u);
    EXPECT_EQ(mParser->mExtensionParser, nullptr);
    void* out = &dummy;
    EXPECT_EQ(mParser->GetParam(KA_PID_VAST_EXTENSION_PARSER, &out), 0u);
    EXPECT_EQ(out, &dummy);

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
    // A failed Parse stores nothing.
    ASSERT_EQ(mParser->Open(vasttest::ModulesDir()), 0u);
    Install(7);
    ASSERT_EQ(Parse(vasttest::InLineDocument("<Extensions/>")), 0u);
    EXPECT_EQ(mLog.parsed, 4);
    EXPECT_EQ(mLog.built, 3);
    EXPECT_EQ(InLine(0)->extensions, nullptr);
    {
        CVASTParser other;  // the destructor destroys an installed parser too
        other.SetParam(KA_PID_VAST_EXTENSION_PARSER, new TestExtensionParser(&other, &mLog, 0));
    }
    EXPECT_EQ(mLog.parserDestroyed, 3);
}

}  // namespace
