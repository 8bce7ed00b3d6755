// VAST-only mode through the public table over the real modules: the buffer is a bare VAST
// document whose result the handle lends through GetVastAdData.
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "api_support.h"

namespace {

using katest::Api;
using katest::kUntouched;

class VastOnly : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(handle.openResult(), KA_OK);
        handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    }

    katest::Handle handle;
};

TEST_F(VastOnly, ResultIsTheParsersContainer) {
    ASSERT_EQ(handle.Process(std::string("<VAST><Ad id=\"one\"/><Ad id=\"two\"/></VAST>")), KA_OK);
    ASSERT_EQ(handle.Process(katest::ReadExample("vast-inline-linear.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 0u);
    EXPECT_EQ(handle.Info()->adBreaks, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);
    VastAdData* data = handle.Container();
    ASSERT_NE(data, kUntouched);
    EXPECT_EQ(data->adCount, 1u);
    EXPECT_EQ(data->depth, 0u);
    ASSERT_NE(data->firstAd, nullptr);
    EXPECT_STREQ(data->firstAd->id, "spring-sale");
    ASSERT_EQ(data->firstAd->type, AD_TYPE_INLINE);
    const AdInLine* inLine = static_cast<const AdInLine*>(data->firstAd->body);
    ASSERT_EQ(inLine->creativeCount, 3u);
    EXPECT_EQ(inLine->creatives->content.duration, 30000u);
    EXPECT_EQ(inLine->creatives->next->content.duration, 15000u);
}

TEST_F(VastOnly, UnreadableBufferFailsButLendsAnEmptyContainer) {
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

TEST_F(VastOnly, StopFlagEndsWrapperDownloads) {
    KA_BOOL stop = 1;
    ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_STOP_FLAG, &stop), KA_OK);
    const auto start = std::chrono::steady_clock::now();
    ASSERT_EQ(handle.Process(std::string("<VAST><Ad id=\"w\"><Wrapper><VASTAdTagURI>"
                                         "http://127.0.0.1:1/none</VASTAdTagURI></Wrapper></Ad>"
                                         "</VAST>")),
              KA_OK);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
    VastAdData* data = handle.Container();
    ASSERT_NE(data, kUntouched);
    ASSERT_NE(data->firstAd, nullptr);
    EXPECT_EQ(data->firstAd->type, AD_TYPE_WRAPPER) << "the failed fetch leaves the wrapper";
    EXPECT_EQ(static_cast<AdWrapper*>(data->firstAd->body)->nestedParser, nullptr);
}

TEST_F(VastOnly, MergeFlagDecidesBetweenMergedAndNested) {
    katest::AllowLocalFiles(true);
    const std::string wrapper = "<VAST><Ad id=\"outer\"><Wrapper><VASTAdTagURI>" +
                                std::string(KA_TEST_DATA_DIR) +
                                "handoff/wrapped_inline.xml</VASTAdTagURI></Wrapper></Ad></VAST>";
    ASSERT_EQ(handle.Process(wrapper), KA_OK);
    VastAdData* data = handle.Container();
    ASSERT_NE(data, kUntouched);
    ASSERT_NE(data->firstAd, nullptr);
    EXPECT_EQ(data->firstAd->type, AD_TYPE_INLINE);

    handle.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, false);
    ASSERT_EQ(handle.Process(wrapper), KA_OK);
    katest::AllowLocalFiles(false);
    data = handle.Container();
    ASSERT_NE(data->firstAd, nullptr);
    ASSERT_EQ(data->firstAd->type, AD_TYPE_WRAPPER);
    CVASTParser* nestedParser = static_cast<AdWrapper*>(data->firstAd->body)->nestedParser;
    ASSERT_NE(nestedParser, nullptr);
    VastAdData* nested = static_cast<VastAdData*>(kUntouched);
    ASSERT_EQ(Api().GetVastParserVastAdData(nestedParser, &nested), KA_OK);
    ASSERT_NE(nested, kUntouched);
    EXPECT_EQ(nested->adCount, 1u);
    EXPECT_STREQ(nested->firstAd->id, "wrapped");
    EXPECT_EQ(nested->depth, 1u);
}

}  // namespace
