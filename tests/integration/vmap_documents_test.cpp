// VMAP documents from tests/data/vmap read through the public table over the real modules.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "api_support.h"

using katest::BreakAt;
using katest::BreakById;
using katest::Handle;
using katest::Length;
using katest::ReadTestData;

namespace {

std::string Str(const char* text) { return text != nullptr ? text : "<null>"; }

class VmapDocumentTest : public ::testing::Test {
  protected:
    void Load(const char* name) {
        ASSERT_EQ(handle.openResult(), KA_OK);
        std::vector<char> document = ReadTestData(std::string("vmap/") + name);
        ASSERT_FALSE(document.empty()) << name;
        ASSERT_EQ(handle.Process(document), KA_OK) << name;
        info = handle.Info();
        ASSERT_NE(info, nullptr);
    }

    Handle handle;
    AdInfo* info = nullptr;
};

TEST_F(VmapDocumentTest, ReadsEveryFieldOfEveryRecord) {
    Load("full.xml");
    EXPECT_EQ(Str(handle.ContentUri()), "http://cdn.test/movie.m3u8?a=1&b=2");
    ASSERT_EQ(info->adBreakCount, 4u);
    ASSERT_EQ(Length(info->adBreaks), 4u);

    const AdBreak* pre = BreakAt(info, 0);
    EXPECT_EQ(pre->timeOffsetType, TIME_OFFSET_START_END);
    EXPECT_EQ(pre->timeOffset, 0);
    EXPECT_EQ(pre->linearDuration, 0u);
    EXPECT_EQ(pre->breakType, BREAK_TYPE_LINEAR);
    EXPECT_EQ(Str(pre->breakId), "pre");
    EXPECT_EQ(pre->repeatAfter, 300000u);
    ASSERT_NE(pre->adSource, nullptr);
    EXPECT_EQ(pre->adSource->id, 11);
    EXPECT_EQ(pre->adSource->allowMultipleAds, 1);
    EXPECT_EQ(pre->adSource->followRedirects, 1);
    // Inside CDATA the blanks are trimmed and the entity stays as written.
    EXPECT_EQ(Str(pre->adSource->adTagUri), "http://ads.test/pre?x=1&amp;y=2");
    EXPECT_EQ(pre->adSource->reservedText, nullptr);
    EXPECT_EQ(pre->adSource->vastAdData, nullptr);

    // Both vmap:TrackingEvents feed one list, in document order; empty ones still count.
    const struct {
        const char* event;
        const char* url;
    } kTrackings[] = {
        {"breakStart", "http://t.test/start?b=pre&c=1"},
        {"breakEnd", "http://t.test/end?b=pre&c=2"},
        {"error", nullptr},
        {nullptr, "http://t.test/noevent"},
        {"second", "http://t.test/second"},
    };
    const AdBreakTracking* tracking = pre->trackings;
    for (const auto& expected : kTrackings) {
        ASSERT_NE(tracking, nullptr);
        EXPECT_EQ(Str(tracking->event), Str(expected.event));
        EXPECT_EQ(Str(tracking->url), Str(expected.url));
        tracking = tracking->next;
    }
    EXPECT_EQ(tracking, nullptr);

    const AdBreak* mid = BreakAt(info, 1);
    EXPECT_EQ(mid->timeOffsetType, TIME_OFFSET_CLOCK);
    EXPECT_EQ(mid->timeOffset, 90500);
    EXPECT_EQ(mid->breakType, BREAK_TYPE_LINEAR | BREAK_TYPE_SKIPPABLE | BREAK_TYPE_ADPODS);
    EXPECT_EQ(Str(mid->breakId), "mid");
    EXPECT_EQ(mid->repeatAfter, 3723004u);
    ASSERT_NE(mid->adSource, nullptr);
    EXPECT_EQ(mid->adSource->id, -7);
    EXPECT_EQ(mid->adSource->allowMultipleAds, 0) << "only exactly \"true\" counts";
    EXPECT_EQ(mid->adSource->followRedirects, 0);
    EXPECT_EQ(Str(mid->adSource->adTagUri), "http://ads.test/mid?x=1&y=2");
    EXPECT_EQ(mid->trackings, nullptr);

    const AdBreak* post = BreakAt(info, 2);
    EXPECT_EQ(post->timeOffsetType, TIME_OFFSET_START_END);
    EXPECT_EQ(post->timeOffset, 1);
    EXPECT_EQ(post->breakType, BREAK_TYPE_COMPANION);
    EXPECT_EQ(post->repeatAfter, 0u) << "5:00 is no clock time of a known length";
    ASSERT_NE(post->adSource, nullptr) << "an empty vmap:AdSource still makes a record";
    EXPECT_EQ(post->adSource->id, 0);
    EXPECT_EQ(post->adSource->allowMultipleAds, 0);
    EXPECT_EQ(post->adSource->followRedirects, 0);
    EXPECT_EQ(post->adSource->adTagUri, nullptr);

    const AdBreak* bare = BreakAt(info, 3);
    EXPECT_EQ(bare->timeOffsetType, TIME_OFFSET_NONE);
    EXPECT_EQ(bare->timeOffset, 0);
    EXPECT_EQ(bare->breakType, 0u);
    EXPECT_EQ(bare->breakId, nullptr);
    EXPECT_EQ(bare->repeatAfter, 0u);
    EXPECT_EQ(bare->adSource, nullptr);
    EXPECT_EQ(bare->trackings, nullptr);
    EXPECT_EQ(bare->linearDuration, 0u);
    EXPECT_EQ(bare->next, nullptr);
}

struct FlagCase {
    const char* breakId;
    uint32_t flags;
};

class BreakTypeTest : public VmapDocumentTest, public ::testing::WithParamInterface<FlagCase> {};

TEST_P(BreakTypeTest, SetsFlagsForWholeWords) {
    Load("break_types.xml");
    const AdBreak* adBreak = BreakById(info, GetParam().breakId);
    ASSERT_NE(adBreak, nullptr) << GetParam().breakId;
    EXPECT_EQ(adBreak->breakType, GetParam().flags) << GetParam().breakId;
}

INSTANTIATE_TEST_SUITE_P(
    Flags, BreakTypeTest,
    ::testing::Values(FlagCase{"absent", 0}, FlagCase{"empty", 0},
                      FlagCase{"linear", BREAK_TYPE_LINEAR},
                      FlagCase{"nonlinear", BREAK_TYPE_NONLINEAR},
                      FlagCase{"linear,nonlinear", BREAK_TYPE_LINEAR | BREAK_TYPE_NONLINEAR},
                      FlagCase{"companion", BREAK_TYPE_COMPANION}, FlagCase{"lower companion", 0},
                      FlagCase{"linear;Skippable", BREAK_TYPE_LINEAR | BREAK_TYPE_SKIPPABLE},
                      FlagCase{"linear,Skippable,AdPods", 25}, FlagCase{"all", 31},
                      FlagCase{"digits separate", BREAK_TYPE_LINEAR | BREAK_TYPE_ADPODS},
                      FlagCase{"glued", 0}, FlagCase{"upper", 0},
                      FlagCase{"repeated", BREAK_TYPE_LINEAR}, FlagCase{"unknown", 0}));

struct OffsetCase {
    const char* breakId;
    uint32_t type;
    int64_t value;
};

class TimeOffsetTest : public VmapDocumentTest, public ::testing::WithParamInterface<OffsetCase> {};

TEST_P(TimeOffsetTest, ReadsKindAndValue) {
    Load("time_offsets.xml");
    const AdBreak* adBreak = BreakById(info, GetParam().breakId);
    ASSERT_NE(adBreak, nullptr) << GetParam().breakId;
    EXPECT_EQ(adBreak->timeOffsetType, GetParam().type) << GetParam().breakId;
    EXPECT_EQ(adBreak->timeOffset, GetParam().value) << GetParam().breakId;
}

INSTANTIATE_TEST_SUITE_P(Kinds, TimeOffsetTest,
                         ::testing::Values(OffsetCase{"absent", TIME_OFFSET_NONE, 0},
                                           OffsetCase{"empty", TIME_OFFSET_NONE, 0},
                                           OffsetCase{"clock", TIME_OFFSET_CLOCK, 10000},
                                           OffsetCase{"clock ms", TIME_OFFSET_CLOCK, 90500},
                                           OffsetCase{"clock hours", TIME_OFFSET_CLOCK, 7200001},
                                           OffsetCase{"clock length 10", TIME_OFFSET_NONE, 0},
                                           OffsetCase{"clock short", TIME_OFFSET_NONE, 0},
                                           OffsetCase{"percent", TIME_OFFSET_PERCENT, 25},
                                           OffsetCase{"percent after", TIME_OFFSET_PERCENT, 70},
                                           OffsetCase{"percent empty", TIME_OFFSET_PERCENT, 0},
                                           OffsetCase{"percent decimal after", TIME_OFFSET_NONE, 0},
                                           OffsetCase{"start", TIME_OFFSET_START_END, 0},
                                           OffsetCase{"end", TIME_OFFSET_START_END, 1},
                                           OffsetCase{"upper start", TIME_OFFSET_NONE, 0},
                                           OffsetCase{"position", TIME_OFFSET_POSITION, 2},
                                           OffsetCase{"position zero", TIME_OFFSET_POSITION, 1},
                                           OffsetCase{"position negative", TIME_OFFSET_POSITION, 1},
                                           OffsetCase{"position huge", TIME_OFFSET_POSITION,
                                                      2147483647},
                                           OffsetCase{"bare number", TIME_OFFSET_NONE, 0}));

TEST_F(VmapDocumentTest, FirstSourceWinsLastTextWins) {
    Load("first_last_wins.xml");
    ASSERT_EQ(info->adBreakCount, 1u);
    const AdSource* source = info->adBreaks->adSource;
    ASSERT_NE(source, nullptr);
    EXPECT_EQ(source->id, 1);
    EXPECT_EQ(source->allowMultipleAds, 1);
    EXPECT_EQ(source->followRedirects, 0) << "the second source's attributes are skipped";
    // The empty third vmap:AdTagURI has no text and leaves the second one's.
    EXPECT_EQ(Str(source->adTagUri), "http://tag.test/two");
    // The second vmap:Extensions wins with its first uo:unicornOnce; the third holds one
    // without contenturi and a nested one, neither of which counts.
    EXPECT_EQ(Str(handle.ContentUri()), "http://second.test/?a&b");
}

TEST_F(VmapDocumentTest, AnyRootNameOnlyDirectChildren) {
    Load("any_root.xml");
    ASSERT_EQ(info->adBreakCount, 2u);
    EXPECT_EQ(Str(BreakAt(info, 0)->breakId), "direct");
    EXPECT_EQ(BreakAt(info, 0)->timeOffset, 1);
    EXPECT_EQ(Str(BreakAt(info, 1)->breakId), "second direct");
    EXPECT_EQ(BreakAt(info, 1)->next, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);
}

TEST_F(VmapDocumentTest, NoBreaksLeavesEmptyInfo) {
    Load("no_breaks.xml");
    EXPECT_EQ(info->adBreakCount, 0u);
    EXPECT_EQ(info->adBreaks, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);
}

TEST_F(VmapDocumentTest, EveryExampleParses) {
    for (const char* name :
         {"vmap-playlist.xml", "vmap-preroll-only.xml", "vmap-live-repeating.xml"}) {
        std::vector<char> document = katest::ReadFile(std::string(KA_EXAMPLES_DIR) + name);
        ASSERT_FALSE(document.empty()) << name;
        EXPECT_EQ(handle.Process(document), KA_OK) << name;
        const AdInfo* examples = handle.Info();
        EXPECT_GE(examples->adBreakCount, 1u) << name;
        EXPECT_EQ(Length(examples->adBreaks), examples->adBreakCount) << name;
        for (const AdBreak* b = examples->adBreaks; b != nullptr; b = b->next) {
            EXPECT_NE(b->timeOffsetType, TIME_OFFSET_NONE) << name << " " << Str(b->breakId);
            ASSERT_NE(b->adSource, nullptr) << name;
            EXPECT_NE(b->adSource->adTagUri, nullptr) << name;
        }
    }
}

}  // namespace
