// VAST documents inline in VMAP ad sources, read through the public table over the real
// modules: the block each source owns, the linear durations summed on the break, the handle's
// container, and releases across Processes and mode switches (run under ASan/LSan as well).
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "api_support.h"

namespace {

using katest::Api;
using katest::BreakById;
using katest::Handle;
using katest::Length;
using katest::ReadTestData;

void* const kUntouched = reinterpret_cast<void*>(0x5a5a);

template <typename Record>
Record* At(Record* first, uint32_t index) {
    for (; first != nullptr && index > 0; --index) first = first->next;
    return first;
}

VastAdData* BlockOf(const AdInfo* info, const char* breakId) {
    AdBreak* adBreak = BreakById(info, breakId);
    if (adBreak == nullptr || adBreak->adSource == nullptr) return nullptr;
    return adBreak->adSource->vastAdData;
}

AdInLine* InLineOf(AdData* ad) {
    return ad != nullptr && ad->type == AD_TYPE_INLINE ? static_cast<AdInLine*>(ad->body) : nullptr;
}

AdWrapper* WrapperOf(AdData* ad) {
    return ad != nullptr && ad->type == AD_TYPE_WRAPPER ? static_cast<AdWrapper*>(ad->body)
                                                        : nullptr;
}

VastAdData* HandleContainer(void* handle) {
    VastAdData* data = static_cast<VastAdData*>(kUntouched);
    EXPECT_EQ(Api().GetVastAdData(handle, &data), KA_OK);
    return data;
}

void SetFlag(void* handle, uint32_t id, bool on) {
    ASSERT_EQ(Api().SetParam(handle, id, on ? kUntouched : nullptr), KA_OK);
}

bool IsAllZero(const VastAdData& data) {
    return data.adCount == 0 && data.firstAd == nullptr && data.errorUrl == nullptr &&
           data.depth == 0;
}

// A VMAP document whose one break carries body inline under element.
std::string OneBreak(const std::string& body) {
    return "<vmap:VMAP><vmap:AdBreak breakId=\"b\"><vmap:AdSource>" + body +
           "</vmap:AdSource></vmap:AdBreak></vmap:VMAP>";
}

std::string InlineAd(const char* id, const char* duration) {
    return std::string("<VAST><Ad id=\"") + id +
           "\"><InLine><Creatives><Creative><Linear><Duration>" + duration +
           "</Duration></Linear></Creative></Creatives></InLine></Ad></VAST>";
}

class VastHandoff : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(handle.openResult(), KA_OK);
        document = ReadTestData("handoff/inline_breaks.xml");
        ASSERT_FALSE(document.empty());
    }

    Handle handle;
    std::vector<char> document;
};

TEST_F(VastHandoff, SourceOwnsACopyOfTheVastResult) {
    ASSERT_EQ(handle.Process(document), KA_OK);
    const AdInfo* info = handle.Info();
    ASSERT_EQ(info->adBreakCount, 5u);
    VastAdData* pod = BlockOf(info, "pod");
    ASSERT_NE(pod, nullptr);
    EXPECT_EQ(pod->adCount, 3u);
    EXPECT_EQ(Length(pod->firstAd), 3u);
    EXPECT_STREQ(pod->errorUrl, "http://err.test/root");
    EXPECT_EQ(pod->depth, 0u);

    AdData* first = At(pod->firstAd, 0);
    EXPECT_STREQ(first->id, "spot-15");
    EXPECT_EQ(first->sequence, 1);
    AdInLine* inLine = InLineOf(first);
    ASSERT_NE(inLine, nullptr);
    EXPECT_STREQ(inLine->adSystem, "Sys A");
    EXPECT_STREQ(inLine->adTitle, "Spot 15");
    EXPECT_STREQ(inLine->description, "Fifteen");
    EXPECT_STREQ(inLine->advertiser, "Adv A");
    EXPECT_STREQ(inLine->survey, "http://survey.test/a");
    EXPECT_STREQ(inLine->error, "http://err.test/a");
    EXPECT_EQ(inLine->extensions, nullptr);
    EXPECT_EQ(inLine->impressionCount, 2u);
    ASSERT_EQ(Length(inLine->impressions), 2u);
    EXPECT_STREQ(At(inLine->impressions, 1)->url, "http://imp.test/a2");
    ASSERT_EQ(inLine->creativeCount, 1u);
    AdCreative* creative = inLine->creatives;
    EXPECT_STREQ(creative->id, "c15");
    EXPECT_EQ(creative->sequence, 1);
    EXPECT_STREQ(creative->adId, "AD15");
    ASSERT_EQ(creative->kind, AD_CREATIVE_LINEAR);

    const AdLinear& linear = creative->content;
    EXPECT_EQ(linear.duration, 15000u);
    EXPECT_EQ(linear.skipOffset, 5000);
    EXPECT_EQ(linear.adParametersCount, 1u);
    EXPECT_NE(linear.adParameters, nullptr);
    EXPECT_EQ(linear.iconCount, 0u);
    EXPECT_EQ(linear.icons, nullptr);
    ASSERT_EQ(linear.mediaFileCount, 2u);
    const AdMediaFile* media = linear.mediaFiles;
    EXPECT_EQ(media->delivery, AD_DELIVERY_STREAMING);
    EXPECT_STREQ(media->type, "application/x-mpegURL");
    EXPECT_EQ(media->width, 1280);
    EXPECT_EQ(media->height, 720);
    EXPECT_STREQ(media->codec, "avc1");
    EXPECT_EQ(media->id, 7);
    EXPECT_EQ(media->bitrate, 2000);
    EXPECT_EQ(media->minBitrate, 500);
    EXPECT_EQ(media->maxBitrate, 3000);
    EXPECT_EQ(media->scalable, 1);
    EXPECT_EQ(media->maintainAspectRatio, 1);
    EXPECT_STREQ(media->url, "http://media.test/a.m3u8");
    EXPECT_EQ(media->next->delivery, AD_DELIVERY_PROGRESSIVE);
    EXPECT_STREQ(media->next->url, "http://media.test/a.mp4");
    ASSERT_EQ(linear.trackingCount, 3u);
    const AdTracking* tracking = linear.trackingEvents;
    EXPECT_STREQ(tracking->event, "start");
    EXPECT_EQ(tracking->offsetKind, AD_OFFSET_NONE);
    EXPECT_STREQ(tracking->url, "http://track.test/a/start");
    EXPECT_EQ(tracking->next->offsetKind, AD_OFFSET_TIME);
    EXPECT_EQ(tracking->next->offset, 10000);
    EXPECT_EQ(tracking->next->next->offsetKind, AD_OFFSET_PERCENT);
    EXPECT_EQ(tracking->next->next->offset, 50);
    ASSERT_EQ(linear.videoClicksCount, 1u);
    const AdVideoClicks* clicks = linear.videoClicks;
    ASSERT_EQ(clicks->clickThroughCount, 1u);
    EXPECT_STREQ(clicks->clickThroughs->id, "ct");
    EXPECT_STREQ(clicks->clickThroughs->url, "http://click.test/through");
    ASSERT_EQ(clicks->clickTrackingCount, 2u);
    EXPECT_STREQ(clicks->clickTrackings->id, "tr1");
    EXPECT_EQ(clicks->clickTrackings->next->id, nullptr);
    EXPECT_STREQ(clicks->clickTrackings->next->url, "http://click.test/track2");
    ASSERT_EQ(clicks->customClickCount, 1u);
    EXPECT_STREQ(clicks->customClicks->url, "http://click.test/custom");

    // The unreachable wrapper stays a wrapper whether or not merging was asked for.
    AdData* second = At(pod->firstAd, 1);
    EXPECT_STREQ(second->id, "unreachable");
    AdWrapper* wrapper = WrapperOf(second);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_STREQ(wrapper->adSystem, "Sys W");
    EXPECT_STREQ(wrapper->vastAdTagUri, "http://127.0.0.1:1/none");
    EXPECT_STREQ(wrapper->error, "http://err.test/w");
    ASSERT_NE(wrapper->impressions, nullptr);
    EXPECT_STREQ(wrapper->impressions->url, "http://imp.test/w");
    ASSERT_NE(wrapper->creatives, nullptr);
    EXPECT_EQ(wrapper->creatives->content.trackingCount, 1u);
    EXPECT_EQ(wrapper->nestedParser, nullptr);

    AdInLine* third = InLineOf(At(pod->firstAd, 2));
    ASSERT_NE(third, nullptr);
    EXPECT_EQ(third->creativeCount, 2u);
    EXPECT_EQ(third->creatives->kind, AD_CREATIVE_NONE);
    EXPECT_EQ(third->creatives->next->content.duration, 30000u);
}

TEST_F(VastHandoff, LinearDurationsAreSummedPerBreak) {
    const struct {
        const char* breakId;
        uint64_t linearDuration;  // ms
    } kCases[] = {
        {"pod", 45000},       // 15 s + 30 s; the unmerged wrapper and the companion add nothing
        {"both", 7000},       // only the first of VASTData / VASTAdData counts
        {"wrapper-only", 0},  // a wrapper's own linear is no ad to play
        {"empty", 0},         // no VAST child
        {"tag", 0},           // no inline VAST at all
    };
    for (bool merge : {true, false}) {
        SetFlag(handle.get(), KA_PID_VMAP_MERGE_WRAPPERS, merge);
        ASSERT_EQ(handle.Process(document), KA_OK);
        for (const auto& c : kCases) {
            AdBreak* adBreak = BreakById(handle.Info(), c.breakId);
            ASSERT_NE(adBreak, nullptr) << c.breakId;
            EXPECT_EQ(adBreak->linearDuration, c.linearDuration) << c.breakId << " merge " << merge;
        }
    }
}

TEST_F(VastHandoff, OnlyTheFirstVastElementOfASourceIsRead) {
    ASSERT_EQ(handle.Process(document), KA_OK);
    VastAdData* both = BlockOf(handle.Info(), "both");
    ASSERT_NE(both, nullptr);
    EXPECT_EQ(both->adCount, 1u);
    EXPECT_STREQ(both->firstAd->id, "first");

    // The same the other way round.
    ASSERT_EQ(handle.Process(OneBreak("<vmap:VASTAdData>" + InlineAd("a", "00:00:01") +
                                      "</vmap:VASTAdData><vmap:VASTData>" +
                                      InlineAd("b", "00:00:02") + "</vmap:VASTData>")),
              KA_OK);
    VastAdData* block = BlockOf(handle.Info(), "b");
    ASSERT_NE(block, nullptr);
    EXPECT_EQ(block->adCount, 1u);
    EXPECT_STREQ(block->firstAd->id, "a");
    EXPECT_EQ(handle.Info()->adBreaks->linearDuration, 1000u);
}

TEST_F(VastHandoff, VastElementWithoutVastGivesAnAllZeroBlock) {
    ASSERT_EQ(handle.Process(document), KA_OK);
    VastAdData* empty = BlockOf(handle.Info(), "empty");
    ASSERT_NE(empty, nullptr);
    EXPECT_TRUE(IsAllZero(*empty));
    EXPECT_EQ(BlockOf(handle.Info(), "tag"), nullptr);

    // Alone in a document: the parser exists and lends a container with nothing in it.
    ASSERT_EQ(handle.Process(OneBreak("<vmap:VASTData/>")), KA_OK);
    VastAdData* block = BlockOf(handle.Info(), "b");
    ASSERT_NE(block, nullptr);
    EXPECT_TRUE(IsAllZero(*block));
    VastAdData* container = HandleContainer(handle.get());
    ASSERT_NE(container, kUntouched);
    EXPECT_TRUE(IsAllZero(*container));
}

TEST_F(VastHandoff, HandleContainerRepeatsTheLastSourceWithVast) {
    ASSERT_EQ(handle.Process(document), KA_OK);
    VastAdData* last = BlockOf(handle.Info(), "wrapper-only");
    ASSERT_NE(last, nullptr);
    VastAdData* container = HandleContainer(handle.get());
    ASSERT_NE(container, kUntouched);
    EXPECT_NE(container, last) << "the source has a block of its own";
    EXPECT_EQ(container->adCount, last->adCount);
    EXPECT_EQ(container->firstAd, last->firstAd);
    EXPECT_EQ(container->errorUrl, last->errorUrl);
    EXPECT_STREQ(container->firstAd->id, "no-uri");
}

TEST_F(VastHandoff, NothingLentWithoutInlineVast) {
    EXPECT_EQ(HandleContainer(handle.get()), kUntouched) << "fresh handle";
    ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(HandleContainer(handle.get()), kUntouched) << "VMAP without inline VAST";
    // A VMAP Process after one with inline VAST drops the parser again.
    ASSERT_EQ(handle.Process(document), KA_OK);
    EXPECT_NE(HandleContainer(handle.get()), kUntouched);
    ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(HandleContainer(handle.get()), kUntouched);
}

TEST_F(VastHandoff, SecondProcessReleasesTheFirst) {
    for (int i = 0; i < 3; ++i) {
        ASSERT_EQ(handle.Process(document), KA_OK);
        VastAdData* pod = BlockOf(handle.Info(), "pod");
        ASSERT_NE(pod, nullptr);
        EXPECT_EQ(pod->adCount, 3u);
        EXPECT_EQ(BreakById(handle.Info(), "pod")->linearDuration, 45000u);
    }
}

// The mode of each Process in turn; the handle releases what the previous one built, and Close
// (the fixture's handle) what the last one built, whatever the flag says by then.
struct ModeSequence {
    const char* name;
    std::vector<bool> vastOnly;
    bool flipBeforeClose;
};

class ModeSwitch : public VastHandoff, public ::testing::WithParamInterface<ModeSequence> {};

TEST_P(ModeSwitch, ReleasesExactlyWhatTheLastProcessBuilt) {
    const std::vector<char> vast =
        katest::ReadFile(std::string(KA_EXAMPLES_DIR) + "vast-inline-linear.xml");
    ASSERT_FALSE(vast.empty());
    bool last = false;
    for (bool vastOnly : GetParam().vastOnly) {
        SetFlag(handle.get(), KA_PID_VMAP_VAST_ONLY, vastOnly);
        ASSERT_EQ(handle.Process(vastOnly ? vast : document), KA_OK);
        VastAdData* container = HandleContainer(handle.get());
        ASSERT_NE(container, kUntouched);
        if (vastOnly) {
            EXPECT_EQ(handle.Info()->adBreakCount, 0u);
            EXPECT_EQ(container->adCount, 1u);
            EXPECT_STREQ(container->firstAd->id, "spring-sale");
        } else {
            EXPECT_EQ(handle.Info()->adBreakCount, 5u);
            EXPECT_EQ(container->firstAd, BlockOf(handle.Info(), "wrapper-only")->firstAd);
        }
        last = vastOnly;
    }
    if (GetParam().flipBeforeClose) SetFlag(handle.get(), KA_PID_VMAP_VAST_ONLY, !last);
}

INSTANTIATE_TEST_SUITE_P(
    Sequences, ModeSwitch,
    ::testing::Values(ModeSequence{"VmapThenVast", {false, true}, false},
                      ModeSequence{"VastThenVmap", {true, false}, false},
                      ModeSequence{"Alternating", {false, true, false, true, true, false}, false},
                      ModeSequence{"VastThenFlipAndClose", {true}, true},
                      ModeSequence{"VmapThenFlipAndClose", {false}, true},
                      ModeSequence{"VastVmapThenFlipAndClose", {true, false}, true}),
    [](const ::testing::TestParamInfo<ModeSequence>& info) { return info.param.name; });

// Wrapped documents read from the test data through the module's file access.
class WrappedFiles : public VastHandoff {
protected:
    void SetUp() override {
        VastHandoff::SetUp();
        katest::AllowLocalFiles(true);
    }
    void TearDown() override { katest::AllowLocalFiles(false); }

    static std::string WrapperTo(const std::string& uri) {
        return "<VAST><Ad id=\"outer\"><Wrapper><AdSystem>Outer</AdSystem><VASTAdTagURI>" + uri +
               "</VASTAdTagURI><Impression>http://imp.test/outer</Impression></Wrapper></Ad>"
               "</VAST>";
    }
    static std::string WrappedPath() {
        return std::string(KA_TEST_DATA_DIR) + "handoff/wrapped_inline.xml";
    }
};

TEST_F(WrappedFiles, UnmergedWrapperLendsItsNestedParserThroughSlotFive) {
    SetFlag(handle.get(), KA_PID_VMAP_MERGE_WRAPPERS, false);
    ASSERT_EQ(handle.Process(
                  OneBreak("<vmap:VASTAdData>" + WrapperTo(WrappedPath()) + "</vmap:VASTAdData>")),
              KA_OK);
    AdBreak* adBreak = handle.Info()->adBreaks;
    EXPECT_EQ(adBreak->linearDuration, 0u) << "an unmerged wrapper adds nothing";
    VastAdData* block = BlockOf(handle.Info(), "b");
    ASSERT_NE(block, nullptr);
    AdWrapper* wrapper = WrapperOf(block->firstAd);
    ASSERT_NE(wrapper, nullptr);
    ASSERT_NE(wrapper->nestedParser, nullptr);

    VastAdData* nested = static_cast<VastAdData*>(kUntouched);
    ASSERT_EQ(Api().GetVastParserVastAdData(wrapper->nestedParser, &nested), KA_OK);
    ASSERT_NE(nested, kUntouched);
    EXPECT_EQ(nested->adCount, 1u);
    EXPECT_EQ(nested->depth, 1u);
    AdInLine* inLine = InLineOf(nested->firstAd);
    ASSERT_NE(inLine, nullptr);
    EXPECT_STREQ(inLine->adTitle, "Wrapped Spot");
    EXPECT_EQ(inLine->creatives->content.duration, 10000u);
    // The same parser asked twice lends the same container.
    VastAdData* again = nullptr;
    ASSERT_EQ(Api().GetVastParserVastAdData(wrapper->nestedParser, &again), KA_OK);
    EXPECT_EQ(again, nested);
}

TEST_F(WrappedFiles, MergedWrapperCountsTowardsTheBreak) {
    ASSERT_EQ(handle.Process(
                  OneBreak("<vmap:VASTAdData>" + WrapperTo(WrappedPath()) + "</vmap:VASTAdData>")),
              KA_OK);
    VastAdData* block = BlockOf(handle.Info(), "b");
    ASSERT_NE(block, nullptr);
    AdInLine* inLine = InLineOf(block->firstAd);
    ASSERT_NE(inLine, nullptr) << "the wrapped InLine took the wrapper's place";
    EXPECT_STREQ(inLine->adTitle, "Wrapped Spot");
    EXPECT_EQ(handle.Info()->adBreaks->linearDuration, 10000u);
}

TEST(VastParserSlot, NullObjectIsRefused) {
    VastAdData* out = static_cast<VastAdData*>(kUntouched);
    EXPECT_EQ(Api().GetVastParserVastAdData(nullptr, &out), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(out, kUntouched);
}

}  // namespace
