// VMAP documents from tests/data/vmap read through the public table over the real modules.
#include <gtest/gtest.h>

#include <string>

#include "api_support.h"

using katest::BreakById;
using katest::Handle;

namespace {

std::string Str(const char* text) { return text != nullptr ? text : "<null>"; }

class VmapDocumentTest : public ::testing::Test {
protected:
    void Load(const char* name) {
        ASSERT_EQ(handle.openResult(), KA_OK);
        ASSERT_EQ(handle.Process(katest::ReadTestData(std::string("vmap/") + name)), KA_OK);
        info = handle.Info();
    }

    Handle handle;
    AdInfo* info = nullptr;
};

TEST_F(VmapDocumentTest, ReadsEveryFieldOfEveryRecord) {
    Load("full.xml");
    EXPECT_EQ(Str(handle.ContentUri()), "http://cdn.test/movie.m3u8?a=1&b=2");
    ASSERT_EQ(info->adBreakCount, 4u);
    ASSERT_EQ(katest::Length(info->adBreaks), 4u);
    const struct {
        uint32_t offsetType;
        int64_t offset;
        uint32_t breakType;
        const char* breakId;
        uint64_t repeatAfter;  // "5:00" is no clock time of a known length
        size_t trackings;
        bool hasSource;  // an empty vmap:AdSource still makes a record
        int32_t sourceId;
        KA_BOOL allowMultipleAds;  // only exactly "true" counts
        KA_BOOL followRedirects;
        const char* adTagUri;  // CDATA: blanks trimmed, the entity kept as written
    } kBreaks[] = {
        // clang-format off
        {TIME_OFFSET_START_END, 0, BREAK_TYPE_LINEAR, "pre", 300000, 5, true, 11, 1, 1,
         "http://ads.test/pre?x=1&amp;y=2"},
        {TIME_OFFSET_CLOCK, 90500, BREAK_TYPE_LINEAR | BREAK_TYPE_SKIPPABLE | BREAK_TYPE_ADPODS,
         "mid", 3723004, 0, true, -7, 0, 0, "http://ads.test/mid?x=1&y=2"},
        {TIME_OFFSET_START_END, 1, BREAK_TYPE_COMPANION, "post", 0, 0, true, 0, 0, 0, nullptr},
        {TIME_OFFSET_NONE, 0, 0, nullptr, 0, 0, false, 0, 0, 0, nullptr},
        // clang-format on
    };
    const AdBreak* adBreak = info->adBreaks;
    for (const auto& expected : kBreaks) {
        SCOPED_TRACE(Str(expected.breakId));
        EXPECT_EQ(adBreak->timeOffsetType, expected.offsetType);
        EXPECT_EQ(adBreak->timeOffset, expected.offset);
        EXPECT_EQ(adBreak->breakType, expected.breakType);
        EXPECT_EQ(Str(adBreak->breakId), Str(expected.breakId));
        EXPECT_EQ(adBreak->repeatAfter, expected.repeatAfter);
        EXPECT_EQ(adBreak->linearDuration, 0u);
        EXPECT_EQ(katest::Length(adBreak->trackings), expected.trackings);
        ASSERT_EQ(adBreak->adSource != nullptr, expected.hasSource);
        if (expected.hasSource) {
            EXPECT_EQ(adBreak->adSource->id, expected.sourceId);
            EXPECT_EQ(adBreak->adSource->allowMultipleAds, expected.allowMultipleAds);
            EXPECT_EQ(adBreak->adSource->followRedirects, expected.followRedirects);
            EXPECT_EQ(Str(adBreak->adSource->adTagUri), Str(expected.adTagUri));
            EXPECT_EQ(adBreak->adSource->reservedText, nullptr);
            EXPECT_EQ(adBreak->adSource->vastAdData, nullptr);
        }
        adBreak = adBreak->next;
    }
    EXPECT_EQ(adBreak, nullptr);

    // Both vmap:TrackingEvents of "pre" feed one list in document order; empty ones count.
    const char* const kTrackings[][2] = {
        // clang-format off
        {"breakStart", "http://t.test/start?b=pre&c=1"},
        {"breakEnd", "http://t.test/end?b=pre&c=2"}, {"error", nullptr},
        {nullptr, "http://t.test/noevent"}, {"second", "http://t.test/second"},
        // clang-format on
    };
    const AdBreakTracking* tracking = info->adBreaks->trackings;
    for (const auto& expected : kTrackings) {
        ASSERT_NE(tracking, nullptr);
        EXPECT_EQ(Str(tracking->event), Str(expected[0]));
        EXPECT_EQ(Str(tracking->url), Str(expected[1]));
        tracking = tracking->next;
    }
    EXPECT_EQ(tracking, nullptr);
}

// Each break of the document names its case by breakId.
TEST_F(VmapDocumentTest, BreakTypeFlagsForWholeWords) {
    Load("break_types.xml");
    const struct {
        const char* breakId;
        uint32_t flags;
    } kCases[] = {
        // clang-format off
        {"absent", 0}, {"empty", 0}, {"linear", BREAK_TYPE_LINEAR},
        {"nonlinear", BREAK_TYPE_NONLINEAR},
        {"linear,nonlinear", BREAK_TYPE_LINEAR | BREAK_TYPE_NONLINEAR},
        {"companion", BREAK_TYPE_COMPANION}, {"lower companion", 0},
        {"linear;Skippable", BREAK_TYPE_LINEAR | BREAK_TYPE_SKIPPABLE},
        {"linear,Skippable,AdPods", 25}, {"all", 31}, {"glued", 0}, {"upper", 0}, {"unknown", 0},
        {"digits separate", BREAK_TYPE_LINEAR | BREAK_TYPE_ADPODS}, {"repeated", BREAK_TYPE_LINEAR},
        // clang-format on
    };
    for (const auto& c : kCases) {
        const AdBreak* adBreak = BreakById(info, c.breakId);
        ASSERT_NE(adBreak, nullptr) << c.breakId;
        EXPECT_EQ(adBreak->breakType, c.flags) << c.breakId;
    }
}

TEST_F(VmapDocumentTest, TimeOffsetKindAndValue) {
    Load("time_offsets.xml");
    const struct {
        const char* breakId;
        uint32_t type;
        int64_t value;
    } kCases[] = {
        // clang-format off
        {"absent", TIME_OFFSET_NONE, 0}, {"empty", TIME_OFFSET_NONE, 0},
        {"clock", TIME_OFFSET_CLOCK, 10000}, {"clock ms", TIME_OFFSET_CLOCK, 90500},
        {"clock hours", TIME_OFFSET_CLOCK, 7200001}, {"clock length 10", TIME_OFFSET_NONE, 0},
        {"clock short", TIME_OFFSET_NONE, 0}, {"percent", TIME_OFFSET_PERCENT, 25},
        {"percent after", TIME_OFFSET_PERCENT, 70}, {"percent empty", TIME_OFFSET_PERCENT, 0},
        {"percent decimal after", TIME_OFFSET_NONE, 0}, {"start", TIME_OFFSET_START_END, 0},
        {"end", TIME_OFFSET_START_END, 1}, {"upper start", TIME_OFFSET_NONE, 0},
        {"position", TIME_OFFSET_POSITION, 2}, {"position zero", TIME_OFFSET_POSITION, 1},
        {"position negative", TIME_OFFSET_POSITION, 1},
        {"position huge", TIME_OFFSET_POSITION, 2147483647}, {"bare number", TIME_OFFSET_NONE, 0},
        // clang-format on
    };
    for (const auto& c : kCases) {
        const AdBreak* adBreak = BreakById(info, c.breakId);
        ASSERT_NE(adBreak, nullptr) << c.breakId;
        EXPECT_EQ(adBreak->timeOffsetType, c.type) << c.breakId;
        EXPECT_EQ(adBreak->timeOffset, c.value) << c.breakId;
    }
}

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
    EXPECT_EQ(Str(info->adBreaks->breakId), "direct");
    EXPECT_EQ(info->adBreaks->timeOffset, 1);
    EXPECT_EQ(Str(info->adBreaks->next->breakId), "second direct");
    EXPECT_EQ(handle.ContentUri(), nullptr);
}

TEST_F(VmapDocumentTest, EveryExampleParses) {
    for (const char* name :
         {"vmap-playlist.xml", "vmap-preroll-only.xml", "vmap-live-repeating.xml"}) {
        SCOPED_TRACE(name);
        ASSERT_EQ(handle.Process(katest::ReadExample(name)), KA_OK);
        EXPECT_GE(handle.Info()->adBreakCount, 1u);
        for (const AdBreak* b = handle.Info()->adBreaks; b != nullptr; b = b->next) {
            EXPECT_NE(b->timeOffsetType, TIME_OFFSET_NONE) << Str(b->breakId);
            ASSERT_NE(b->adSource, nullptr);
            EXPECT_NE(b->adSource->adTagUri, nullptr);
        }
    }
}

}  // namespace
