// CVMAPParser driven directly: what the public table cannot reach (Reset, ReleaseAdInfo, the
// stored parameters) over the real XML module.
#include <gtest/gtest.h>

#include <string>

#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "vmap/vmap_parser.h"

// The banner buffer the library fills when it is loaded.
extern char szVerInfo[512];

namespace {

const char kDocument[] =
    "<vmap:VMAP>"
    "<vmap:Extensions><uo:unicornOnce contenturi=\"http://c/\"/></vmap:Extensions>"
    "<vmap:AdBreak breakId=\"a\"><vmap:AdSource id=\"1\"><vmap:AdTagURI>http://t/</vmap:AdTagURI>"
    "</vmap:AdSource><vmap:TrackingEvents><vmap:Tracking event=\"e\">http://u/</vmap:Tracking>"
    "</vmap:TrackingEvents></vmap:AdBreak>"
    "<vmap:AdBreak breakId=\"b\"/>"
    "</vmap:VMAP>";

unsigned int Process(CVMAPParser& parser, const std::string& text) {
    std::string copy = text;
    return parser.Process(&copy[0], static_cast<unsigned int>(copy.size()));
}

class VmapHandle : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(parser.Open(&workPath[0]), KA_OK);
        ASSERT_EQ(Process(parser, kDocument), KA_OK);
        ASSERT_EQ(parser.mAdInfo.adBreakCount, 2u);
    }

    std::string workPath = KA_MODULES_DIR;
    CVMAPParser parser;
};

TEST_F(VmapHandle, ReleaseResetAndCloseTwiceAreHarmless) {
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreakCount, 0u);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    ASSERT_EQ(Process(parser, kDocument), KA_OK);
    EXPECT_EQ(parser.Reset(), KA_OK);
    EXPECT_EQ(parser.Reset(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    EXPECT_EQ(parser.mContentUri, nullptr);
    ASSERT_EQ(Process(parser, kDocument), KA_OK) << "Reset keeps the module";
    EXPECT_STREQ(parser.mAdInfo.adBreaks->next->breakId, "b");
    // Close releases everything, module included: Process fails after it, as before any Open.
    EXPECT_EQ(parser.Close(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    EXPECT_EQ(parser.mContentUri, nullptr);
    EXPECT_EQ(Process(parser, kDocument), KA_ERR_LOAD_FAILED);
    CVMAPParser unopened;
    EXPECT_EQ(unopened.mMergeWrappers, 1u) << "merging is the default";
    EXPECT_EQ(Process(unopened, kDocument), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(unopened.mAdInfo.adBreakCount, 0u);
}

// The record owns reservedText and a VAST block whenever they are set (LSan sees a leak); a
// release stops at the count or at the list's end, whichever comes first.
TEST_F(VmapHandle, ReleaseFreesWhatTheRecordsOwnUpToTheCount) {
    AdSource* source = parser.mAdInfo.adBreaks->adSource;
    ASSERT_NE(source, nullptr);
    source->reservedText = new char[4]{'a', 'b', 'c', '\0'};
    source->vastAdData = new VastAdData();
    parser.mAdInfo.adBreakCount = 100;
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    // A count below the list length frees only that many breaks: the rest is the caller's.
    ASSERT_EQ(Process(parser, kDocument), KA_OK);
    AdBreak* second = parser.mAdInfo.adBreaks->next;
    parser.mAdInfo.adBreakCount = 1;
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    EXPECT_STREQ(second->breakId, "b");  // read after the release: ASan catches a free
    delete[] second->breakId;
    delete second;
}

TEST_F(VmapHandle, EachBreakGetsItsOwnTrackingsInOrder) {
    // Trackings of one break split over two TrackingEvents around another element.
    ASSERT_EQ(Process(parser,
                      "<r><vmap:AdBreak>"
                      "<vmap:TrackingEvents><vmap:Tracking event=\"1a\"/></vmap:TrackingEvents>"
                      "<vmap:AdSource/><vmap:TrackingEvents><vmap:Tracking event=\"1b\"/>"
                      "<vmap:Tracking event=\"1c\"/></vmap:TrackingEvents></vmap:AdBreak>"
                      "<vmap:AdBreak><vmap:TrackingEvents><vmap:Tracking event=\"2a\"/>"
                      "</vmap:TrackingEvents></vmap:AdBreak></r>"),
              KA_OK);
    std::string events;
    for (const AdBreak* b = parser.mAdInfo.adBreaks; b != nullptr; b = b->next) {
        for (const AdBreakTracking* t = b->trackings; t != nullptr; t = t->next) events += t->event;
        events += '|';
    }
    EXPECT_EQ(events, "1a1b1c|2a|");
}

TEST(VersionBanner, CopiedAtLoadTime) {
    EXPECT_STREQ(szVerInfo,
                 "kaAbout> kaVMAPParser - release - android - armv8 - V3.19 - r93297 - NDKr10e - "
                 "11:04:12 Aug  1 2016\n");
}

}  // namespace
