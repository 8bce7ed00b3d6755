// Creatives and linear content through CVASTParser and the stand-in XML module: media files,
// clicks, tracking events, skip and tracking offsets.
#include <gtest/gtest.h>

#include <string>

#include "vast_test_util.h"

namespace {

using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;
using vasttest::VastParserTest;

// ---- The full InLine creative of inline_full.xml ---------------------------------------------

class VastFullCreativeTest : public VastParserTest {
protected:
    void SetUp() override {
        VastParserTest::SetUp();
        ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
        mCreative = FirstCreative();
        ASSERT_NE(mCreative, nullptr);
    }
    AdCreative* mCreative = nullptr;
};

TEST_F(VastFullCreativeTest, CreativeAttributesAndKinds) {
    EXPECT_EQ(Str(mCreative->id), "c1");
    EXPECT_EQ(mCreative->sequence, 1);
    EXPECT_EQ(Str(mCreative->adId), "a-1");
    EXPECT_EQ(mCreative->kind, AD_CREATIVE_LINEAR);
    AdCreative* second = mCreative->next;
    EXPECT_EQ(second->sequence, 2);
    EXPECT_EQ(second->adId, nullptr);
    EXPECT_EQ(second->kind, AD_CREATIVE_LINEAR);
    // A companion-only creative keeps kind 0 and an all-zero content.
    AdCreative* third = second->next;
    EXPECT_EQ(third->kind, AD_CREATIVE_NONE);
    EXPECT_EQ(third->sequence, 0);
    const AdLinear zero = AdLinear();
    EXPECT_EQ(memcmp(&third->content, &zero, sizeof(zero)), 0);
    EXPECT_EQ(third->next, nullptr);
}

TEST_F(VastFullCreativeTest, LinearDurationAndSkipOffset) {
    EXPECT_EQ(mCreative->content.duration, 30500u);
    EXPECT_EQ(mCreative->content.skipOffset, 5000);
    // 25% of 15 s.
    EXPECT_EQ(mCreative->next->content.duration, 15000u);
    EXPECT_EQ(mCreative->next->content.skipOffset, 3750);
}

TEST_F(VastFullCreativeTest, MediaFilesEveryField) {
    AdLinear& linear = mCreative->content;
    ASSERT_EQ(linear.mediaFileCount, 2u);  // <Mezzanine> is not a media file
    AdMediaFile* mp4 = linear.mediaFiles;
    EXPECT_EQ(mp4->delivery, AD_DELIVERY_PROGRESSIVE);
    EXPECT_EQ(Str(mp4->type), "video/mp4");
    EXPECT_EQ(mp4->width, 1280);
    EXPECT_EQ(mp4->height, 720);
    EXPECT_EQ(Str(mp4->codec), "H.264");
    EXPECT_EQ(mp4->id, 7);
    EXPECT_EQ(mp4->bitrate, 2000);
    EXPECT_EQ(mp4->minBitrate, 1500);
    EXPECT_EQ(mp4->maxBitrate, 2500);
    EXPECT_EQ(mp4->scalable, 1);
    EXPECT_EQ(mp4->maintainAspectRatio, 1);
    EXPECT_EQ(Str(mp4->url), "https://cdn.example.com/a.mp4");
    AdMediaFile* hls = mp4->next;
    EXPECT_EQ(hls->delivery, AD_DELIVERY_STREAMING);
    EXPECT_EQ(Str(hls->type), "application/x-mpegURL");
    EXPECT_EQ(hls->width, 640);
    EXPECT_EQ(hls->height, 360);
    EXPECT_EQ(hls->codec, nullptr);
    EXPECT_EQ(hls->id, 0);  // "abc"
    EXPECT_EQ(hls->bitrate, 0);
    EXPECT_EQ(hls->scalable, 0);  // "true"
    EXPECT_EQ(hls->maintainAspectRatio, 0);
    EXPECT_EQ(Str(hls->url), "https://cdn.example.com/b.m3u8?t=1&u=2");
    EXPECT_EQ(hls->next, nullptr);
}

TEST_F(VastFullCreativeTest, VideoClicksInDocumentOrder) {
    AdLinear& linear = mCreative->content;
    EXPECT_EQ(linear.videoClicksCount, 1u);
    AdVideoClicks* clicks = linear.videoClicks;
    ASSERT_NE(clicks, nullptr);
    EXPECT_EQ(clicks->next, nullptr);
    ASSERT_EQ(clicks->clickThroughCount, 1u);
    EXPECT_EQ(Str(clicks->clickThroughs->id), "ct");
    EXPECT_EQ(Str(clicks->clickThroughs->url), "https://click.example.com/through");
    ASSERT_EQ(clicks->clickTrackingCount, 3u);
    EXPECT_EQ(Str(Nth(clicks->clickTrackings, 0)->id), "tr1");
    EXPECT_EQ(Nth(clicks->clickTrackings, 1)->id, nullptr);
    EXPECT_EQ(Str(Nth(clicks->clickTrackings, 1)->url), "https://click.example.com/t2?a=1&b=2");
    EXPECT_EQ(Str(Nth(clicks->clickTrackings, 2)->id), "tr3");
    EXPECT_EQ(Str(Nth(clicks->clickTrackings, 2)->url), "https://click.example.com/t3?a=1&amp;b=2");
    ASSERT_EQ(clicks->customClickCount, 1u);
    EXPECT_EQ(Str(clicks->customClicks->id), "cc");
    EXPECT_EQ(Str(clicks->customClicks->url), "https://click.example.com/custom");
}

TEST_F(VastFullCreativeTest, TrackingEventsAndPlaceholders) {
    AdLinear& linear = mCreative->content;
    ASSERT_EQ(linear.trackingCount, 4u);
    AdTracking* start = Nth(linear.trackingEvents, 0);
    EXPECT_EQ(Str(start->event), "start");
    EXPECT_EQ(start->offsetKind, AD_OFFSET_NONE);
    EXPECT_EQ(start->offset, 0);
    EXPECT_EQ(Str(start->url), "https://track.example.com/start");
    AdTracking* p10 = Nth(linear.trackingEvents, 1);
    EXPECT_EQ(p10->offsetKind, AD_OFFSET_TIME);
    EXPECT_EQ(p10->offset, 10500);
    AdTracking* p75 = Nth(linear.trackingEvents, 2);
    EXPECT_EQ(p75->offsetKind, AD_OFFSET_PERCENT);
    EXPECT_EQ(p75->offset, 75);
    EXPECT_EQ(Str(p75->url), "https://track.example.com/p75");
    AdTracking* bare = Nth(linear.trackingEvents, 3);
    EXPECT_EQ(bare->event, nullptr);
    EXPECT_EQ(Str(bare->url), "https://track.example.com/bare");
    EXPECT_EQ(linear.adParametersCount, 1u);
    ASSERT_NE(linear.adParameters, nullptr);
    EXPECT_EQ(linear.adParameters->next, nullptr);
    EXPECT_EQ(linear.iconCount, 0u);
    EXPECT_EQ(linear.icons, nullptr);
    // The second creative has none of these.
    AdLinear& other = mCreative->next->content;
    EXPECT_EQ(other.videoClicks, nullptr);
    EXPECT_EQ(other.videoClicksCount, 0u);
    EXPECT_EQ(other.adParameters, nullptr);
    EXPECT_EQ(other.trackingEvents, nullptr);
}

// ---- Skip offsets ----------------------------------------------------------------------------

struct SkipCase {
    const char* name;
    const char* attributes;  // of <Linear>
    const char* duration;    // <Duration> text, null for none
    int64_t skipOffset;
};

class VastSkipOffsetTest : public VastParserTest, public ::testing::WithParamInterface<SkipCase> {};

TEST_P(VastSkipOffsetTest, Milliseconds) {
    const SkipCase& c = GetParam();
    std::string content =
        c.duration == nullptr ? "" : std::string("<Duration>") + c.duration + "</Duration>";
    ASSERT_EQ(Parse(vasttest::LinearDocument(c.attributes, content)), 0u);
    ASSERT_NE(FirstCreative(), nullptr);
    EXPECT_EQ(FirstCreative()->content.skipOffset, c.skipOffset);
}

const SkipCase kSkipCases[] = {
    {"Clock", "skipoffset=\"00:00:05\"", "00:00:30", 5000},
    {"ClockWithMilliseconds", "skipoffset=\"00:01:02.250\"", nullptr, 62250},
    {"PercentOfDuration", "skipoffset=\"25%\"", "00:00:30", 7500},
    {"PercentBeforeNumber", "skipoffset=\"%25\"", "00:00:30", 0},
    {"PercentWithoutDuration", "skipoffset=\"25%\"", nullptr, 0},
    {"HundredPercentReadsTwoDigits", "skipoffset=\"100%\"", "00:00:30", 3000},
    {"FractionalPercent", "skipoffset=\"7.5%\"", "00:00:10", 700},
    {"PercentTruncates", "skipoffset=\"33%\"", "00:00:00.010", 3},
    {"NoDigitsBeforePercent", "skipoffset=\"x%\"", "00:00:30", 0},
    {"Absent", "", "00:00:30", -1},
    {"Empty", "skipoffset=\"\"", "00:00:30", -1},
    {"OtherCase", "skipOffset=\"00:00:05\"", "00:00:30", -1},
    {"NotATime", "skipoffset=\"soon\"", "00:00:30", 0},
};

INSTANTIATE_TEST_SUITE_P(Linear, VastSkipOffsetTest, ::testing::ValuesIn(kSkipCases),
                         [](const ::testing::TestParamInfo<SkipCase>& info) {
                             return std::string(info.param.name);
                         });

// ---- Tracking offsets ------------------------------------------------------------------------

struct TrackingCase {
    const char* name;
    const char* attributes;  // of <Tracking>
    uint32_t offsetKind;
    int64_t offset;
    const char* event;
};

class VastTrackingOffsetTest : public VastParserTest,
                               public ::testing::WithParamInterface<TrackingCase> {};

TEST_P(VastTrackingOffsetTest, KindAndValue) {
    const TrackingCase& c = GetParam();
    ASSERT_EQ(Parse(vasttest::LinearDocument(
                  "", "<Duration>00:00:30</Duration><TrackingEvents><Tracking " +
                          std::string(c.attributes) + ">u</Tracking></TrackingEvents>")),
              0u);
    ASSERT_NE(FirstCreative(), nullptr);
    AdTracking* tracking = FirstCreative()->content.trackingEvents;
    ASSERT_NE(tracking, nullptr);
    EXPECT_EQ(tracking->offsetKind, c.offsetKind);
    EXPECT_EQ(tracking->offset, c.offset);
    if (c.event == nullptr) {
        EXPECT_EQ(tracking->event, nullptr);
    } else {
        EXPECT_EQ(Str(tracking->event), c.event);
    }
    EXPECT_EQ(Str(tracking->url), "u");
}

const TrackingCase kTrackingCases[] = {
    {"Percent", "event=\"progress\" offset=\"75%\"", AD_OFFSET_PERCENT, 75, "progress"},
    {"Clock", "event=\"progress\" offset=\"00:00:10.500\"", AD_OFFSET_TIME, 10500, "progress"},
    {"None", "event=\"start\"", AD_OFFSET_NONE, 0, "start"},
    {"Empty", "event=\"start\" offset=\"\"", AD_OFFSET_NONE, 0, "start"},
    {"HundredPercent", "offset=\"100%\"", AD_OFFSET_PERCENT, 10, nullptr},
    {"NegativePercent", "offset=\"-5%\"", AD_OFFSET_PERCENT, -5, nullptr},
    {"OffsetOnAnyEvent", "event=\"complete\" offset=\"00:00:01\"", AD_OFFSET_TIME, 1000,
     "complete"},
    {"UnknownEventKeptAsText", "event=\"madeUp &amp; more\"", AD_OFFSET_NONE, 0,
     "madeUp &amp; more"},
};

INSTANTIATE_TEST_SUITE_P(Linear, VastTrackingOffsetTest, ::testing::ValuesIn(kTrackingCases),
                         [](const ::testing::TestParamInfo<TrackingCase>& info) {
                             return std::string(info.param.name);
                         });

// ---- Media file attributes -------------------------------------------------------------------

struct MediaFileCase {
    const char* name;
    const char* attributes;
    uint32_t delivery;
    int32_t id;
    int32_t scalable;
    int32_t width;
};

class VastMediaFileTest : public VastParserTest,
                          public ::testing::WithParamInterface<MediaFileCase> {};

TEST_P(VastMediaFileTest, Attributes) {
    const MediaFileCase& c = GetParam();
    ASSERT_EQ(
        Parse(vasttest::LinearDocument("", "<MediaFiles><MediaFile " + std::string(c.attributes) +
                                               ">m</MediaFile></MediaFiles>")),
        0u);
    ASSERT_NE(FirstCreative(), nullptr);
    AdMediaFile* media = FirstCreative()->content.mediaFiles;
    ASSERT_NE(media, nullptr);
    EXPECT_EQ(media->delivery, c.delivery);
    EXPECT_EQ(media->id, c.id);
    EXPECT_EQ(media->scalable, c.scalable);
    EXPECT_EQ(media->width, c.width);
}

const MediaFileCase kMediaFileCases[] = {
    {"Progressive", "delivery=\"progressive\"", AD_DELIVERY_PROGRESSIVE, 0, 0, 0},
    {"Streaming", "delivery=\"streaming\"", AD_DELIVERY_STREAMING, 0, 0, 0},
    {"StreamingCapitalised", "delivery=\"Streaming\"", AD_DELIVERY_PROGRESSIVE, 0, 0, 0},
    {"StreamingWithSuffix", "delivery=\"streamingx\"", AD_DELIVERY_PROGRESSIVE, 0, 0, 0},
    {"NumericId", "id=\"42\"", AD_DELIVERY_PROGRESSIVE, 42, 0, 0},
    {"TextId", "id=\"abc\"", AD_DELIVERY_PROGRESSIVE, 0, 0, 0},
    {"LeadingNumberId", "id=\"12abc\"", AD_DELIVERY_PROGRESSIVE, 12, 0, 0},
    {"ScalableOne", "scalable=\"1\"", AD_DELIVERY_PROGRESSIVE, 0, 1, 0},
    {"ScalableTrue", "scalable=\"true\"", AD_DELIVERY_PROGRESSIVE, 0, 0, 0},
    {"NegativeWidth", "width=\"-3\"", AD_DELIVERY_PROGRESSIVE, 0, 0, -3},
    {"EmptyWidth", "width=\"\"", AD_DELIVERY_PROGRESSIVE, 0, 0, 0},
};

INSTANTIATE_TEST_SUITE_P(Linear, VastMediaFileTest, ::testing::ValuesIn(kMediaFileCases),
                         [](const ::testing::TestParamInfo<MediaFileCase>& info) {
                             return std::string(info.param.name);
                         });

// ---- Structure rules -------------------------------------------------------------------------

TEST_F(VastParserTest, SecondVideoClicksAndAdParametersAreIgnored) {
    ASSERT_EQ(
        Parse(vasttest::LinearDocument("",
                                       "<VideoClicks><ClickThrough>a</ClickThrough></VideoClicks>"
                                       "<AdParameters>p</AdParameters>"
                                       "<VideoClicks><ClickThrough>b</ClickThrough>"
                                       "<ClickTracking>c</ClickTracking></VideoClicks>"
                                       "<AdParameters>q</AdParameters>")),
        0u);
    AdLinear& linear = FirstCreative()->content;
    EXPECT_EQ(linear.videoClicksCount, 1u);
    ASSERT_EQ(linear.videoClicks->clickThroughCount, 1u);
    EXPECT_EQ(Str(linear.videoClicks->clickThroughs->url), "a");
    EXPECT_EQ(linear.videoClicks->clickTrackingCount, 0u);
    EXPECT_EQ(linear.adParametersCount, 1u);
    EXPECT_EQ(Length(linear.adParameters), 1u);
}

TEST_F(VastParserTest, RepeatedListElementsAppendToOneList) {
    ASSERT_EQ(Parse(vasttest::LinearDocument(
                  "",
                  "<MediaFiles><MediaFile>m1</MediaFile></MediaFiles>"
                  "<TrackingEvents><Tracking>t1</Tracking></TrackingEvents>"
                  "<MediaFiles><MediaFile>m2</MediaFile><MediaFile>m3</MediaFile></MediaFiles>"
                  "<TrackingEvents><Tracking>t2</Tracking></TrackingEvents>"
                  "<Duration>00:00:01</Duration><Duration>00:00:02</Duration>")),
              0u);
    AdLinear& linear = FirstCreative()->content;
    ASSERT_EQ(linear.mediaFileCount, 3u);
    EXPECT_EQ(Str(Nth(linear.mediaFiles, 0)->url), "m1");
    EXPECT_EQ(Str(Nth(linear.mediaFiles, 2)->url), "m3");
    ASSERT_EQ(linear.trackingCount, 2u);
    EXPECT_EQ(Str(linear.trackingEvents->next->url), "t2");
    EXPECT_EQ(linear.duration, 2000u);  // a later Duration overwrites
}

TEST_F(VastParserTest, SecondLinearReadsIntoTheSameContent) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Creatives><Creative>"
                  "<Linear skipoffset=\"00:00:01\"><MediaFiles><MediaFile>a</MediaFile>"
                  "</MediaFiles></Linear>"
                  "<NonLinearAds><NonLinear/></NonLinearAds>"
                  "<Linear><Duration>00:00:09</Duration><MediaFiles><MediaFile>b</MediaFile>"
                  "</MediaFiles></Linear>"
                  "</Creative></Creatives>")),
              0u);
    AdInLine* inLine = InLine(0);
    ASSERT_EQ(inLine->creativeCount, 1u);
    AdLinear& linear = inLine->creatives->content;
    EXPECT_EQ(linear.mediaFileCount, 2u);
    EXPECT_EQ(linear.duration, 9000u);
    EXPECT_EQ(linear.skipOffset, -1);  // the second Linear has no skipoffset
}

TEST_F(VastParserTest, CreativesCountOnlyCreativeChildren) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Creatives><Creative id=\"1\"/><Other/><creative/><Creative id=\"2\"/>"
                  "</Creatives><Creatives><Creative id=\"3\"/></Creatives>")),
              0u);
    AdInLine* inLine = InLine(0);
    EXPECT_EQ(inLine->creativeCount, 3u);
    EXPECT_EQ(Str(Nth(inLine->creatives, 2)->id), "3");
}

TEST_F(VastParserTest, CreativeAttributes) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Creatives><Creative id=\"\" sequence=\"2x\" adId=\"\"/>"
                  "<Creative sequence=\"-1\" AdID=\"wrong case\"/></Creatives>")),
              0u);
    AdCreative* first = InLine(0)->creatives;
    EXPECT_EQ(first->id, nullptr);
    EXPECT_EQ(first->adId, nullptr);
    EXPECT_EQ(first->sequence, 2);
    EXPECT_EQ(first->next->sequence, -1);
    EXPECT_EQ(first->next->adId, nullptr);
}

TEST_F(VastParserTest, IconsAreNeverStored) {
    ASSERT_EQ(Parse(vasttest::LinearDocument(
                  "",
                  "<Icons><Icon><StaticResource>x</StaticResource></Icon><Icon/></Icons>"
                  "<Icons/>")),
              0u);
    AdLinear& linear = FirstCreative()->content;
    EXPECT_EQ(linear.iconCount, 0u);
    EXPECT_EQ(linear.icons, nullptr);
}

TEST_F(VastParserTest, ThreeClickTrackingsInOrder) {
    ASSERT_EQ(Parse(vasttest::LinearDocument(
                  "",
                  "<VideoClicks><ClickTracking>1</ClickTracking><Other>x</Other>"
                  "<ClickTracking>2</ClickTracking><ClickTracking/></VideoClicks>")),
              0u);
    AdVideoClicks* clicks = FirstCreative()->content.videoClicks;
    ASSERT_EQ(clicks->clickTrackingCount, 3u);
    EXPECT_EQ(Str(Nth(clicks->clickTrackings, 0)->url), "1");
    EXPECT_EQ(Str(Nth(clicks->clickTrackings, 1)->url), "2");
    // An element without text still makes a record, with a null url.
    EXPECT_EQ(Nth(clicks->clickTrackings, 2)->url, nullptr);
}

// ---- The bundled InLine example ------------------------------------------------------------

TEST_F(VastParserTest, InLineExampleHasTwoSkippableLinearCreatives) {
    ASSERT_EQ(Parse(vasttest::ReadFile(std::string(KA_EXAMPLES_DIR) + "vast-inline-linear.xml")),
              0u);
    AdInLine* inLine = InLine(0);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(Str(inLine->adTitle), "Spring Sale: 30 and 15 second spots");
    EXPECT_EQ(Str(inLine->impressions->url),
              "https://ads.example.com/impression?ad=spring-sale&amp;cb=[CACHEBUSTING]");
    ASSERT_EQ(inLine->creativeCount, 3u);
    AdLinear& spot30 = inLine->creatives->content;
    EXPECT_EQ(spot30.duration, 30000u);
    EXPECT_EQ(spot30.skipOffset, 5000);
    ASSERT_EQ(spot30.mediaFileCount, 3u);
    EXPECT_EQ(Str(spot30.mediaFiles->url), "https://cdn.example.com/spring/30s_1080p.mp4");
    EXPECT_EQ(Nth(spot30.mediaFiles, 2)->delivery, AD_DELIVERY_STREAMING);
    ASSERT_EQ(spot30.trackingCount, 7u);
    EXPECT_EQ(Nth(spot30.trackingEvents, 3)->offset, 10000);
    EXPECT_EQ(Nth(spot30.trackingEvents, 4)->offsetKind, AD_OFFSET_PERCENT);
    AdLinear& spot15 = inLine->creatives->next->content;
    EXPECT_EQ(spot15.duration, 15000u);
    EXPECT_EQ(spot15.skipOffset, 3750);
    EXPECT_EQ(inLine->creatives->next->next->kind, AD_CREATIVE_NONE);
}

// ---- Releases --------------------------------------------------------------------------------

TEST_F(VastParserTest, ReleaseLinearZeroesTheContent) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    AdLinear& linear = FirstCreative()->content;
    ASSERT_NE(linear.mediaFiles, nullptr);
    EXPECT_EQ(mParser->ReleaseLinear(&linear), 0u);
    const AdLinear zero = AdLinear();
    EXPECT_EQ(memcmp(&linear, &zero, sizeof(zero)), 0);
    EXPECT_EQ(mParser->ReleaseLinear(&linear), 0u);
    EXPECT_EQ(mParser->ReleaseLinear(nullptr), 0u);
}

TEST_F(VastParserTest, ReleaseAdDataKeepsTheNode) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    for (uint32_t i = 0; i < 2; ++i) {
        AdData* ad = Ad(i);
        AdData* next = ad->next;
        int32_t sequence = ad->sequence;
        uint32_t type = ad->type;
        EXPECT_EQ(mParser->ReleaseAdData(ad), 0u);
        EXPECT_EQ(ad->id, nullptr);
        EXPECT_EQ(ad->body, nullptr);
        EXPECT_EQ(ad->sequence, sequence);
        EXPECT_EQ(ad->type, type);
        EXPECT_EQ(ad->next, next);
        // A second release finds nothing to free.
        EXPECT_EQ(mParser->ReleaseAdData(ad), 0u);
    }
    EXPECT_EQ(mParser->ReleaseAdData(nullptr), 0u);
}

TEST_F(VastParserTest, ReleaseVastAdDataEmptiesTheContainer) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    Data().depth = 4;
    EXPECT_EQ(mParser->ReleaseVastAdData(&Data()), 0u);
    EXPECT_EQ(Data().adCount, 0u);
    EXPECT_EQ(Data().firstAd, nullptr);
    EXPECT_EQ(Data().errorUrl, nullptr);
    EXPECT_EQ(Data().depth, 4u);  // not the release's business
    EXPECT_EQ(mParser->ReleaseVastAdData(&Data()), 0u);
    EXPECT_EQ(mParser->ReleaseVastAdData(nullptr), 0u);
    Data().depth = 0;
}

TEST_F(VastParserTest, ReleaseOfHandBuiltRecords) {
    // An error URL only; a Wrapper without body; a Wrapper holding a nested parser with ads.
    VastAdData data = VastAdData();
    data.errorUrl = new char[2]{'e', '\0'};
    AdData* empty = new AdData();
    empty->type = AD_TYPE_WRAPPER;
    empty->id = new char[2]{'w', '\0'};
    AdData* nested = new AdData();
    nested->type = AD_TYPE_WRAPPER;
    AdWrapper* wrapper = new AdWrapper();
    wrapper->nestedParser = new CVASTParser();
    ASSERT_EQ(wrapper->nestedParser->Open(vasttest::ModulesDir()), 0u);
    std::string inner = vasttest::InLineDocument("<AdTitle>inner</AdTitle>");
    ASSERT_EQ(wrapper->nestedParser->Process(&inner[0], static_cast<unsigned int>(inner.size()), 1,
                                             nullptr),
              0u);
    ASSERT_EQ(wrapper->nestedParser->mVastAdData.adCount, 1u);
    nested->body = wrapper;
    empty->next = nested;
    data.firstAd = empty;
    data.adCount = 2;
    int objects = CSDKObject::g_kaSDKObjectNum;
    EXPECT_EQ(mParser->ReleaseAdData(empty), 0u);
    EXPECT_EQ(empty->id, nullptr);
    EXPECT_EQ(empty->type, AD_TYPE_WRAPPER);
    EXPECT_EQ(mParser->ReleaseVastAdData(&data), 0u);
    EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, objects - 1);  // the nested parser is gone
    EXPECT_EQ(data.firstAd, nullptr);
    EXPECT_EQ(data.errorUrl, nullptr);
    EXPECT_EQ(data.adCount, 0u);
}

}  // namespace
