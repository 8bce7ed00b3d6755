// Creatives and linear content through CVASTParser and the stand-in XML module: media files,
// clicks, tracking events, skip and tracking offsets, and the releases.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "vast_test_util.h"

namespace {

using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;
using vasttest::Urls;
using vasttest::VastParserTest;
using Strings = std::vector<std::string>;

// Every field of a record in one line, so a whole record is compared at once.
std::string Describe(const AdMediaFile* m) {
    return std::to_string(m->delivery) + "|" + Str(m->type) + "|" + std::to_string(m->width) + "x" +
           std::to_string(m->height) + "|" + Str(m->codec) + "|" + std::to_string(m->id) + "|" +
           std::to_string(m->bitrate) + "|" + std::to_string(m->minBitrate) + "-" +
           std::to_string(m->maxBitrate) + "|" + std::to_string(m->scalable) + "|" +
           std::to_string(m->maintainAspectRatio) + "|" + Str(m->url);
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

TEST_F(VastParserTest, CreativesOfAFullDocument) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    AdCreative* first = FirstCreative();
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(Str(first->id), "c1");
    EXPECT_EQ(first->sequence, 1);
    EXPECT_EQ(Str(first->adId), "a-1");
    EXPECT_EQ(first->kind, AD_CREATIVE_LINEAR);
    const AdLinear& linear = first->content;
    EXPECT_EQ(linear.duration, 30500u);
    EXPECT_EQ(linear.skipOffset, 5000);
    // <Mezzanine> is no media file; "abc" and "true" read as 0.
    EXPECT_EQ(
        DescribeAll(linear.mediaFiles),
        (Strings{"0|video/mp4|1280x720|H.264|7|2000|1500-2500|1|1|https://cdn.example.com/a.mp4",
                 "1|application/x-mpegURL|640x360|<null>|0|0|0-0|0|0|"
                 "https://cdn.example.com/b.m3u8?t=1&u=2"}));
    ASSERT_NE(linear.videoClicks, nullptr);
    EXPECT_EQ(linear.videoClicks->next, nullptr);
    EXPECT_EQ(DescribeAll(linear.videoClicks->clickThroughs),
              Strings{"ct|https://click.example.com/through"});
    EXPECT_EQ(
        DescribeAll(linear.videoClicks->clickTrackings),
        (Strings{"tr1|https://click.example.com/t1", "<null>|https://click.example.com/t2?a=1&b=2",
                 "tr3|https://click.example.com/t3?a=1&amp;b=2"}));
    EXPECT_EQ(DescribeAll(linear.videoClicks->customClicks),
              Strings{"cc|https://click.example.com/custom"});
    EXPECT_EQ(DescribeAll(linear.trackingEvents),
              (Strings{"start|0|0|https://track.example.com/start",
                       "progress|1|10500|https://track.example.com/p10",
                       "progress|2|75|https://track.example.com/p75",
                       "<null>|0|0|https://track.example.com/bare"}));
    EXPECT_EQ(linear.adParametersCount, 1u);
    ASSERT_NE(linear.adParameters, nullptr);
    EXPECT_EQ(linear.adParameters->next, nullptr);
    EXPECT_EQ(linear.iconCount, 0u);  // icons with content are never stored
    EXPECT_EQ(linear.icons, nullptr);

    AdCreative* second = first->next;
    EXPECT_EQ(second->adId, nullptr);
    EXPECT_EQ(second->content.duration, 15000u);
    EXPECT_EQ(second->content.skipOffset, 3750);  // 25% of 15 s
    EXPECT_EQ(second->content.videoClicks, nullptr);
    EXPECT_EQ(second->content.adParameters, nullptr);
    // A companion-only creative keeps kind 0 and an all-zero content.
    AdCreative* third = second->next;
    EXPECT_EQ(third->kind, AD_CREATIVE_NONE);
    EXPECT_EQ(memcmp(&third->content, &kZeroLinear, sizeof(kZeroLinear)), 0);
    EXPECT_EQ(third->next, nullptr);
}

TEST_F(VastParserTest, SkipOffsetInMilliseconds) {
    const struct {
        const char* attributes;  // of <Linear>
        const char* duration;    // <Duration> text, null for none
        int64_t skipOffset;
    } kCases[] = {
        {"skipoffset=\"00:00:05\"", "00:00:30", 5000},
        {"skipoffset=\"00:01:02.250\"", nullptr, 62250},
        {"skipoffset=\"25%\"", "00:00:30", 7500},
        {"skipoffset=\"%25\"", "00:00:30", 0},
        {"skipoffset=\"25%\"", nullptr, 0},
        {"skipoffset=\"100%\"", "00:00:30", 3000},  // two digits read: 10%
        {"skipoffset=\"7.5%\"", "00:00:10", 700},
        {"skipoffset=\"33%\"", "00:00:00.010", 3},  // truncated
        {"skipoffset=\"x%\"", "00:00:30", 0},
        {"", "00:00:30", -1},
        {"skipoffset=\"\"", "00:00:30", -1},
        {"skipOffset=\"00:00:05\"", "00:00:30", -1},
        {"skipoffset=\"soon\"", "00:00:30", 0},
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

TEST_F(VastParserTest, TrackingEventAndOffset) {
    const struct {
        const char* attributes;  // of <Tracking>
        const char* described;   // event|offsetKind|offset|url
    } kCases[] = {
        {"event=\"progress\" offset=\"75%\"", "progress|2|75|u"},
        {"event=\"progress\" offset=\"00:00:10.500\"", "progress|1|10500|u"},
        {"event=\"start\"", "start|0|0|u"},
        {"event=\"start\" offset=\"\"", "start|0|0|u"},
        {"offset=\"100%\"", "<null>|2|10|u"},
        {"offset=\"-5%\"", "<null>|2|-5|u"},
        {"event=\"complete\" offset=\"00:00:01\"", "complete|1|1000|u"},
        {"event=\"madeUp &amp; more\"", "madeUp &amp; more|0|0|u"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.attributes);
        ASSERT_EQ(Fresh(vasttest::LinearDocument(
                      "", "<Duration>00:00:30</Duration><TrackingEvents><Tracking " +
                              std::string(c.attributes) + ">u</Tracking></TrackingEvents>")),
                  0u);
        ASSERT_NE(FirstCreative(), nullptr);
        EXPECT_EQ(DescribeAll(FirstCreative()->content.trackingEvents), Strings{c.described});
    }
}

TEST_F(VastParserTest, MediaFileAttributes) {
    const struct {
        const char* attributes;
        const char* described;  // see Describe(AdMediaFile*)
    } kCases[] = {
        {"delivery=\"progressive\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|m"},
        {"delivery=\"streaming\"", "1|<null>|0x0|<null>|0|0|0-0|0|0|m"},
        {"delivery=\"Streaming\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|m"},
        {"delivery=\"streamingx\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|m"},
        {"id=\"42\" bitrate=\"9\"", "0|<null>|0x0|<null>|42|9|0-0|0|0|m"},
        {"id=\"abc\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|m"},
        {"id=\"12abc\"", "0|<null>|0x0|<null>|12|0|0-0|0|0|m"},
        {"scalable=\"1\" maintainAspectRatio=\"true\"", "0|<null>|0x0|<null>|0|0|0-0|1|0|m"},
        {"width=\"-3\" height=\"\" type=\"\" codec=\"\"", "0|<null>|-3x0|<null>|0|0|0-0|0|0|m"},
        {"Width=\"5\" TYPE=\"x\"", "0|<null>|0x0|<null>|0|0|0-0|0|0|m"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.attributes);
        ASSERT_EQ(Fresh(vasttest::LinearDocument("", "<MediaFiles><MediaFile " +
                                                         std::string(c.attributes) +
                                                         ">m</MediaFile></MediaFiles>")),
                  0u);
        ASSERT_NE(FirstCreative(), nullptr);
        EXPECT_EQ(DescribeAll(FirstCreative()->content.mediaFiles), Strings{c.described});
    }
}

// ---- Structure rules -------------------------------------------------------------------------

TEST_F(VastParserTest, SecondVideoClicksAndAdParametersAreIgnored) {
    ASSERT_EQ(Parse(vasttest::LinearDocument(
                  "",
                  "<VideoClicks><ClickThrough>a</ClickThrough><Other>x</Other>"
                  "<ClickTracking>1</ClickTracking><ClickTracking/></VideoClicks>"
                  "<AdParameters>p</AdParameters>"
                  "<VideoClicks><ClickThrough>b</ClickThrough>"
                  "<ClickTracking>c</ClickTracking></VideoClicks>"
                  "<AdParameters>q</AdParameters>")),
              0u);
    const AdLinear& linear = FirstCreative()->content;
    EXPECT_EQ(linear.videoClicksCount, 1u);
    EXPECT_EQ(Urls(linear.videoClicks->clickThroughs), Strings{"a"});
    // An element without text still makes a record, with a null url.
    EXPECT_EQ(Urls(linear.videoClicks->clickTrackings), (Strings{"1", "<null>"}));
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
    const AdLinear& linear = FirstCreative()->content;
    EXPECT_EQ(Urls(linear.mediaFiles), (Strings{"m1", "m2", "m3"}));
    EXPECT_EQ(Urls(linear.trackingEvents), (Strings{"t1", "t2"}));
    EXPECT_EQ(linear.duration, 2000u);  // a later Duration overwrites
}

TEST_F(VastParserTest, SecondLinearReadsIntoTheSameContent) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Creatives><Creative>"
                  "<Linear skipoffset=\"00:00:01\"><MediaFiles><MediaFile>a</MediaFile>"
                  "</MediaFiles></Linear><NonLinearAds><NonLinear/></NonLinearAds>"
                  "<Linear><Duration>00:00:09</Duration><MediaFiles><MediaFile>b</MediaFile>"
                  "</MediaFiles></Linear></Creative></Creatives>")),
              0u);
    ASSERT_EQ(InLine(0)->creativeCount, 1u);
    const AdLinear& linear = FirstCreative()->content;
    EXPECT_EQ(linear.mediaFileCount, 2u);
    EXPECT_EQ(linear.duration, 9000u);
    EXPECT_EQ(linear.skipOffset, -1);  // the second Linear has no skipoffset
}

TEST_F(VastParserTest, CreativesCountOnlyCreativeChildren) {
    ASSERT_EQ(Parse(vasttest::InLineDocument(
                  "<Creatives><Creative id=\"\" sequence=\"2x\" adId=\"\"/><Other/><creative/>"
                  "<Creative id=\"2\" sequence=\"-1\" AdID=\"wrong case\"/></Creatives>"
                  "<Creatives><Creative id=\"3\"/></Creatives>")),
              0u);
    AdInLine* inLine = InLine(0);
    EXPECT_EQ(inLine->creativeCount, 3u);
    AdCreative* first = inLine->creatives;
    EXPECT_EQ(first->id, nullptr);
    EXPECT_EQ(first->adId, nullptr);
    EXPECT_EQ(first->sequence, 2);
    EXPECT_EQ(first->next->sequence, -1);
    EXPECT_EQ(first->next->adId, nullptr);
    EXPECT_EQ(Str(Nth(inLine->creatives, 2)->id), "3");
}

// ---- Releases --------------------------------------------------------------------------------

TEST_F(VastParserTest, ReleasesEmptyAndCanBeRepeated) {
    ASSERT_EQ(Parse(vasttest::DataFile("inline_full.xml")), 0u);
    AdLinear& linear = FirstCreative()->content;
    EXPECT_EQ(mParser->ReleaseLinear(&linear), 0u);
    EXPECT_EQ(memcmp(&linear, &kZeroLinear, sizeof(kZeroLinear)), 0);
    EXPECT_EQ(mParser->ReleaseLinear(&linear), 0u);
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

}  // namespace
