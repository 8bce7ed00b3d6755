// VAST through the public table over the real modules: documents inline in VMAP ad sources (the
// block each source owns, the linear durations summed on the break, the handle's container) and
// bare documents in VAST-only mode, wrappers merged or kept, and releases across Processes and
// mode switches (run under ASan/LSan as well).
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "api_support.h"

namespace {

using katest::Api;
using katest::BreakById;
using katest::Handle;
using katest::kUntouched;

VastAdData* BlockOf(const AdInfo* info, const char* breakId) {
    AdBreak* adBreak = BreakById(info, breakId);
    return adBreak != nullptr && adBreak->adSource != nullptr ? adBreak->adSource->vastAdData
                                                              : nullptr;
}

template <typename Body>
Body* BodyOf(const AdData* ad, uint32_t type) {
    return ad != nullptr && ad->type == type ? static_cast<Body*>(ad->body) : nullptr;
}

bool IsAllZero(const VastAdData& data) {
    return data.adCount == 0 && data.firstAd == nullptr && data.errorUrl == nullptr &&
           data.depth == 0;
}

// A VMAP document whose one break "b" carries body inside its source.
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
        document = katest::ReadTestData("handoff/inline_breaks.xml");
        ASSERT_FALSE(document.empty());
    }
    void TearDown() override { katest::AllowLocalFiles(false); }

    Handle handle;
    std::vector<char> document;
};

// The VAST records themselves are the VAST parser's tests; here which source holds what.
TEST_F(VastHandoff, EachSourceOwnsACopyOfItsVastResult) {
    ASSERT_EQ(handle.Process(document), KA_OK);
    ASSERT_EQ(handle.Info()->adBreakCount, 5u);
    VastAdData* pod = BlockOf(handle.Info(), "pod");
    ASSERT_NE(pod, nullptr);
    EXPECT_EQ(pod->adCount, 3u);
    EXPECT_EQ(katest::Length(pod->firstAd), 3u);
    EXPECT_STREQ(pod->errorUrl, "http://err.test/root");
    EXPECT_EQ(pod->depth, 0u);
    const AdData* ad = pod->firstAd;
    AdInLine* first = BodyOf<AdInLine>(ad, AD_TYPE_INLINE);
    ASSERT_NE(first, nullptr);
    EXPECT_STREQ(ad->id, "spot-15");
    EXPECT_EQ(first->creatives->content.duration, 15000u);
    EXPECT_STREQ(first->creatives->content.mediaFiles->url, "http://media.test/a.m3u8");
    // The unreachable wrapper stays a wrapper and owns no nested parser.
    AdWrapper* wrapper = BodyOf<AdWrapper>(ad->next, AD_TYPE_WRAPPER);
    ASSERT_NE(wrapper, nullptr);
    EXPECT_STREQ(wrapper->vastAdTagUri, "http://127.0.0.1:1/none");
    EXPECT_EQ(wrapper->nestedParser, nullptr);
    EXPECT_STREQ(ad->next->next->id, "spot-30");

    // VASTData then VASTAdData: only the first is read.
    VastAdData* both = BlockOf(handle.Info(), "both");
    ASSERT_NE(both, nullptr);
    EXPECT_EQ(both->adCount, 1u);
    EXPECT_STREQ(both->firstAd->id, "first");
    // A VASTAdData without a VAST child; a source with a tag URI only.
    ASSERT_NE(BlockOf(handle.Info(), "empty"), nullptr);
    EXPECT_TRUE(IsAllZero(*BlockOf(handle.Info(), "empty")));
    EXPECT_EQ(BlockOf(handle.Info(), "tag"), nullptr);

    // The handle's container repeats the last source with VAST, in a block of its own.
    VastAdData* last = BlockOf(handle.Info(), "wrapper-only");
    ASSERT_NE(last, nullptr);
    VastAdData* container = handle.Container();
    ASSERT_NE(container, kUntouched);
    EXPECT_NE(container, last);
    EXPECT_EQ(container->adCount, last->adCount);
    EXPECT_EQ(container->firstAd, last->firstAd);
    EXPECT_STREQ(container->firstAd->id, "no-uri");
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
        handle.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, merge);
        ASSERT_EQ(handle.Process(document), KA_OK);
        for (const auto& c : kCases) {
            AdBreak* adBreak = BreakById(handle.Info(), c.breakId);
            ASSERT_NE(adBreak, nullptr) << c.breakId;
            EXPECT_EQ(adBreak->linearDuration, c.linearDuration) << c.breakId << " merge " << merge;
        }
    }
}

TEST_F(VastHandoff, SmallSources) {
    // VASTAdData before VASTData: again only the first counts.
    ASSERT_EQ(handle.Process(OneBreak("<vmap:VASTAdData>" + InlineAd("a", "00:00:01") +
                                      "</vmap:VASTAdData><vmap:VASTData>" +
                                      InlineAd("b", "00:00:02") + "</vmap:VASTData>")),
              KA_OK);
    VastAdData* block = BlockOf(handle.Info(), "b");
    ASSERT_NE(block, nullptr);
    EXPECT_EQ(block->adCount, 1u);
    EXPECT_STREQ(block->firstAd->id, "a");
    EXPECT_EQ(handle.Info()->adBreaks->linearDuration, 1000u);
    // An empty VASTData alone: the parser exists and lends a container with nothing in it.
    ASSERT_EQ(handle.Process(OneBreak("<vmap:VASTData/>")), KA_OK);
    block = BlockOf(handle.Info(), "b");
    ASSERT_NE(block, nullptr);
    EXPECT_TRUE(IsAllZero(*block));
    VastAdData* container = handle.Container();
    ASSERT_NE(container, kUntouched);
    EXPECT_TRUE(IsAllZero(*container));
}

TEST_F(VastHandoff, NothingLentAfterVmapWithoutInlineVast) {
    ASSERT_EQ(handle.Process(katest::ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Container(), kUntouched);
    // After one with inline VAST, the next VMAP Process drops the parser again.
    ASSERT_EQ(handle.Process(document), KA_OK);
    EXPECT_NE(handle.Container(), kUntouched);
    ASSERT_EQ(handle.Process(katest::ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Container(), kUntouched);
}

// The mode of each Process in turn, on a handle of its own: each Process releases what the
// previous one built, and Close what the last one built, whatever the flag says by then.
TEST_F(VastHandoff, ModeSwitchesReleaseExactlyWhatWasBuilt) {
    const std::vector<char> vast = katest::ReadExample("vast-inline-linear.xml");
    const struct {
        std::vector<bool> vastOnly;
        bool flipBeforeClose;
    } kSequences[] = {
        // clang-format off
        {{false, true, false, true, true, false}, false}, {{true}, true}, {{false}, true},
        {{true, false}, true},
        // clang-format on
    };
    for (const auto& sequence : kSequences) {
        Handle other;
        ASSERT_EQ(other.openResult(), KA_OK);
        for (bool vastOnly : sequence.vastOnly) {
            SCOPED_TRACE(testing::Message() << "vast only " << vastOnly);
            other.SetFlag(KA_PID_VMAP_VAST_ONLY, vastOnly);
            ASSERT_EQ(other.Process(vastOnly ? vast : document), KA_OK);
            VastAdData* container = other.Container();
            ASSERT_NE(container, kUntouched);
            if (vastOnly) {  // the VAST parser's own container, and no VMAP records
                EXPECT_EQ(other.Info()->adBreakCount, 0u);
                EXPECT_EQ(other.Info()->adBreaks, nullptr);
                EXPECT_EQ(other.ContentUri(), nullptr);
                EXPECT_EQ(container->adCount, 1u);
                EXPECT_EQ(container->depth, 0u);
                EXPECT_STREQ(container->firstAd->id, "spring-sale");
                EXPECT_EQ(container->firstAd->type, AD_TYPE_INLINE);
            } else {
                EXPECT_EQ(other.Info()->adBreakCount, 5u);
                EXPECT_EQ(container->firstAd, BlockOf(other.Info(), "wrapper-only")->firstAd);
            }
        }
        if (sequence.flipBeforeClose) {
            other.SetFlag(KA_PID_VMAP_VAST_ONLY, !sequence.vastOnly.back());
        }
    }
}

TEST_F(VastHandoff, VastOnlyUnreadableBufferFailsButLendsAnEmptyContainer) {
    handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    for (const char* buffer : {"plain text", "<VAST><Ad id=\"x\"><InLine>", ""}) {
        SCOPED_TRACE(buffer);
        ASSERT_EQ(handle.Process(katest::ReadExample("vast-inline-linear.xml")), KA_OK);
        EXPECT_EQ(handle.Process(std::string(buffer)), KA_ERR_LOAD_FAILED);
        VastAdData* data = handle.Container();
        ASSERT_NE(data, kUntouched);
        EXPECT_EQ(data->adCount, 0u);
        EXPECT_EQ(data->firstAd, nullptr);
        EXPECT_EQ(handle.Info()->adBreakCount, 0u);
    }
}

TEST_F(VastHandoff, VastOnlyStopFlagEndsWrapperDownloads) {
    handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    KA_BOOL stop = 1;
    ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_STOP_FLAG, &stop), KA_OK);
    const auto start = std::chrono::steady_clock::now();
    ASSERT_EQ(handle.Process(katest::WrapperTo("http://127.0.0.1:1/none")), KA_OK);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
    VastAdData* data = handle.Container();
    ASSERT_NE(data, kUntouched);
    AdWrapper* wrapper = BodyOf<AdWrapper>(data->firstAd, AD_TYPE_WRAPPER);
    ASSERT_NE(wrapper, nullptr) << "the failed fetch leaves the wrapper";
    EXPECT_EQ(wrapper->nestedParser, nullptr);
}

// A wrapped document read from the test data through the module's file access, in both modes:
// merged, the wrapped InLine takes the wrapper's place (and its duration counts on the break);
// unmerged, the wrapper keeps a nested parser whose container slot 5 lends, the same each time.
TEST_F(VastHandoff, MergeFlagDecidesWhatAWrapperBecomes) {
    katest::AllowLocalFiles(true);
    const std::string wrapper = katest::WrapperTo();
    for (bool vastOnly : {false, true}) {
        for (bool merge : {false, true}) {
            SCOPED_TRACE(testing::Message() << "vast only " << vastOnly << ", merge " << merge);
            handle.SetFlag(KA_PID_VMAP_VAST_ONLY, vastOnly);
            handle.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, merge);
            ASSERT_EQ(handle.Process(vastOnly ? wrapper
                                              : OneBreak("<vmap:VASTAdData>" + wrapper +
                                                         "</vmap:VASTAdData>")),
                      KA_OK);
            VastAdData* data = vastOnly ? handle.Container() : BlockOf(handle.Info(), "b");
            ASSERT_TRUE(data != nullptr && data != kUntouched);
            if (!vastOnly) {
                EXPECT_EQ(handle.Info()->adBreaks->linearDuration, merge ? 10000u : 0u);
            }
            if (merge) {
                AdInLine* inLine = BodyOf<AdInLine>(data->firstAd, AD_TYPE_INLINE);
                ASSERT_NE(inLine, nullptr);
                EXPECT_STREQ(inLine->adTitle, "Wrapped Spot");
                continue;
            }
            AdWrapper* outer = BodyOf<AdWrapper>(data->firstAd, AD_TYPE_WRAPPER);
            ASSERT_NE(outer, nullptr);
            ASSERT_NE(outer->nestedParser, nullptr);
            VastAdData *nested = static_cast<VastAdData*>(kUntouched), *again = nullptr;
            ASSERT_EQ(Api().GetVastParserVastAdData(outer->nestedParser, &nested), KA_OK);
            ASSERT_EQ(Api().GetVastParserVastAdData(outer->nestedParser, &again), KA_OK);
            ASSERT_NE(nested, kUntouched);
            EXPECT_EQ(again, nested);
            EXPECT_EQ(nested->adCount, 1u);
            EXPECT_EQ(nested->depth, 1u);
            EXPECT_STREQ(nested->firstAd->id, "wrapped");
            AdInLine* inLine = BodyOf<AdInLine>(nested->firstAd, AD_TYPE_INLINE);
            ASSERT_NE(inLine, nullptr);
            EXPECT_STREQ(inLine->adTitle, "Wrapped Spot");
        }
    }
}

}  // namespace
