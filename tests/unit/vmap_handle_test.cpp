// CVMAPParser driven directly: what the public table cannot reach (Reset, ReleaseAdInfo, the
// list appends) over the real XML module.
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "platform/sdk_object.h"
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

class VmapHandle : public ::testing::Test {
  protected:
    void SetUp() override { ASSERT_EQ(parser.Open(&workPath[0]), KA_OK); }

    unsigned int Process(const std::string& text) {
        std::string copy = text;
        return parser.Process(&copy[0], static_cast<unsigned int>(copy.size()));
    }

    std::string workPath = KA_MODULES_DIR;
    CVMAPParser parser;
};

TEST_F(VmapHandle, ConstructedState) {
    CVMAPParser fresh;
    EXPECT_EQ(fresh.mContentUri, nullptr);
    EXPECT_EQ(fresh.mAdInfo.adBreakCount, 0u);
    EXPECT_EQ(fresh.mAdInfo.adBreaks, nullptr);
    EXPECT_EQ(fresh.mVastParser, nullptr);
    EXPECT_EQ(fresh.mVastOnly, 0u);
    EXPECT_EQ(fresh.mMergeWrappers, 1u);
    EXPECT_EQ(fresh.mStopFlag, nullptr);
    // Without Open there is no module: Process fails and builds nothing.
    std::string copy = kDocument;
    EXPECT_EQ(fresh.Process(&copy[0], static_cast<unsigned int>(copy.size())), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(fresh.mAdInfo.adBreakCount, 0u);
}

TEST_F(VmapHandle, ResetReleasesAndStaysOpen) {
    ASSERT_EQ(Process(kDocument), KA_OK);
    ASSERT_EQ(parser.mAdInfo.adBreakCount, 2u);
    ASSERT_STREQ(parser.mContentUri, "http://c/");
    EXPECT_EQ(parser.Reset(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreakCount, 0u);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    EXPECT_EQ(parser.mContentUri, nullptr);
    EXPECT_NE(parser.mXMLHandle, nullptr) << "Reset keeps the module";
    EXPECT_EQ(parser.Reset(), KA_OK) << "a second Reset finds nothing to free";
    ASSERT_EQ(Process(kDocument), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreakCount, 2u);
    EXPECT_STREQ(parser.mAdInfo.adBreaks->next->breakId, "b");
}

TEST_F(VmapHandle, CloseUnloadsAndReleases) {
    ASSERT_EQ(Process(kDocument), KA_OK);
    EXPECT_EQ(parser.Close(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    EXPECT_EQ(parser.mContentUri, nullptr);
    EXPECT_EQ(parser.mXMLHandle, nullptr);
    EXPECT_EQ(Process(kDocument), KA_ERR_LOAD_FAILED);
}

TEST_F(VmapHandle, ReleaseTwiceIsHarmless) {
    ASSERT_EQ(Process(kDocument), KA_OK);
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreakCount, 0u);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
}

TEST_F(VmapHandle, ReleaseStopsAtTheCount) {
    ASSERT_EQ(Process(kDocument), KA_OK);
    // A count below the list length frees only that many breaks: the rest is the caller's.
    AdBreak* second = parser.mAdInfo.adBreaks->next;
    parser.mAdInfo.adBreakCount = 1;
    parser.mAdInfo.adBreaks->next = nullptr;
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);
    EXPECT_EQ(parser.mAdInfo.adBreaks, nullptr);
    delete[] second->breakId;
    delete second;
}

TEST_F(VmapHandle, ReleaseFreesSourceStringsAndBlock) {
    ASSERT_EQ(Process(kDocument), KA_OK);
    // The record owns reservedText and a VAST block whenever they are set.
    AdSource* source = parser.mAdInfo.adBreaks->adSource;
    ASSERT_NE(source, nullptr);
    source->reservedText = new char[4]{'a', 'b', 'c', '\0'};
    source->vastAdData = new VastAdData();
    EXPECT_EQ(parser.ReleaseAdInfo(), KA_OK);  // leaks show under LeakSanitizer
}

TEST_F(VmapHandle, AppendsFollowEveryListInOrder) {
    // Trackings of one break split over two TrackingEvents around another element, then
    // a second break with its own: each list gets exactly its own records.
    ASSERT_EQ(Process("<r>"
                      "<vmap:AdBreak breakId=\"1\">"
                      "<vmap:TrackingEvents><vmap:Tracking event=\"1a\"/></vmap:TrackingEvents>"
                      "<vmap:AdSource/>"
                      "<vmap:TrackingEvents><vmap:Tracking event=\"1b\"/>"
                      "<vmap:Tracking event=\"1c\"/></vmap:TrackingEvents>"
                      "</vmap:AdBreak>"
                      "<vmap:AdBreak breakId=\"2\"><vmap:TrackingEvents>"
                      "<vmap:Tracking event=\"2a\"/></vmap:TrackingEvents></vmap:AdBreak>"
                      "</r>"),
              KA_OK);
    const AdBreak* first = parser.mAdInfo.adBreaks;
    ASSERT_NE(first, nullptr);
    std::string events;
    for (const AdBreakTracking* t = first->trackings; t != nullptr; t = t->next) {
        events += t->event;
        events += ' ';
    }
    EXPECT_EQ(events, "1a 1b 1c ");
    ASSERT_NE(first->next, nullptr);
    ASSERT_NE(first->next->trackings, nullptr);
    EXPECT_STREQ(first->next->trackings->event, "2a");
    EXPECT_EQ(first->next->trackings->next, nullptr);
    EXPECT_EQ(first->next->next, nullptr);
}

TEST_F(VmapHandle, ParamsSetFields) {
    KA_BOOL stop = 0;
    parser.SetParam(KA_PID_VMAP_MERGE_WRAPPERS, nullptr);
    EXPECT_EQ(parser.mMergeWrappers, 0u);
    parser.SetParam(KA_PID_VMAP_MERGE_WRAPPERS, &stop);
    EXPECT_EQ(parser.mMergeWrappers, 1u);
    parser.SetParam(KA_PID_VMAP_STOP_FLAG, &stop);
    EXPECT_EQ(parser.mStopFlag, &stop);
    parser.SetParam(KA_PID_VMAP_STOP_FLAG, nullptr);
    EXPECT_EQ(parser.mStopFlag, nullptr);
    parser.SetParam(KA_PID_VMAP_VAST_ONLY, &stop);
    EXPECT_EQ(parser.mVastOnly, 1u);
    // Only exactly 1 reads back as set.
    parser.mVastOnly = 2;
    unsigned int flag = 7;
    parser.GetParam(KA_PID_VMAP_VAST_ONLY, &flag);
    EXPECT_EQ(flag, 0u);
}

TEST_F(VmapHandle, ObjectsAreCounted) {
    const int before = CSDKObject::g_kaSDKObjectNum;
    {
        CVMAPParser other;
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, before + 1);
    }
    EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, before);
}

TEST(VersionBanner, CopiedAtLoadTime) {
    const char kBanner[] =
        "kaAbout> kaVMAPParser - release - android - armv8 - V3.19 - r93297 - NDKr10e - "
        "11:04:12 Aug  1 2016\n";
    EXPECT_EQ(strlen(szVerInfo), 100u);
    EXPECT_STREQ(szVerInfo, kBanner);
    for (size_t i = sizeof(kBanner); i < sizeof(szVerInfo); ++i) {
        ASSERT_EQ(szVerInfo[i], '\0') << i;
    }
}

}  // namespace
