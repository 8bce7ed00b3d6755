// VAST-only mode through the public table over the real modules: the buffer is a bare VAST
// document whose result the handle lends through GetVastAdData.
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "api_support.h"

namespace {

using katest::Api;
using katest::Handle;
using katest::Length;

void* const kOn = reinterpret_cast<void*>(1);
void* const kUntouched = reinterpret_cast<void*>(0x5a5a);

std::vector<char> Example(const char* name) {
    return katest::ReadFile(std::string(KA_EXAMPLES_DIR) + name);
}

class VastOnly : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(handle.openResult(), KA_OK);
        ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_VAST_ONLY, kOn), KA_OK);
    }

    VastAdData* Container() {
        VastAdData* data = static_cast<VastAdData*>(kUntouched);
        EXPECT_EQ(Api().GetVastAdData(handle.get(), &data), KA_OK);
        return data;
    }

    Handle handle;
};

TEST_F(VastOnly, ResultIsTheParsersContainer) {
    ASSERT_EQ(handle.Process(Example("vast-inline-linear.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 0u);
    EXPECT_EQ(handle.Info()->adBreaks, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);

    VastAdData* data = Container();
    ASSERT_NE(data, kUntouched);
    ASSERT_NE(data, nullptr);
    EXPECT_EQ(data->adCount, 1u);
    EXPECT_EQ(data->depth, 0u);
    EXPECT_EQ(data->errorUrl, nullptr);
    AdData* ad = data->firstAd;
    ASSERT_NE(ad, nullptr);
    EXPECT_STREQ(ad->id, "spring-sale");
    ASSERT_EQ(ad->type, AD_TYPE_INLINE);
    const AdInLine* inLine = static_cast<const AdInLine*>(ad->body);
    EXPECT_STREQ(inLine->adTitle, "Spring Sale: 30 and 15 second spots");
    EXPECT_EQ(inLine->impressionCount, 2u);
    ASSERT_EQ(inLine->creativeCount, 3u);
    const AdCreative* spot30 = inLine->creatives;
    EXPECT_EQ(spot30->content.duration, 30000u);
    EXPECT_EQ(spot30->content.skipOffset, 5000);
    EXPECT_EQ(spot30->content.mediaFileCount, 3u);
    EXPECT_EQ(spot30->content.trackingCount, 7u);
    const AdCreative* spot15 = spot30->next;
    EXPECT_EQ(spot15->content.duration, 15000u);
    EXPECT_EQ(spot15->content.skipOffset, 3750);
    EXPECT_EQ(spot30->next->next->kind, AD_CREATIVE_NONE);
}

TEST_F(VastOnly, PodKeepsItsAdsInOrder) {
    ASSERT_EQ(handle.Process(Example("vast-ad-pod.xml")), KA_OK);
    VastAdData* data = Container();
    ASSERT_NE(data, kUntouched);
    EXPECT_GE(data->adCount, 2u);
    EXPECT_EQ(Length(data->firstAd), data->adCount);
    int32_t previous = 0;
    for (const AdData* ad = data->firstAd; ad != nullptr; ad = ad->next) {
        EXPECT_GT(ad->sequence, previous);
        previous = ad->sequence;
    }
}

TEST_F(VastOnly, UnreadableBufferFailsButLendsAnEmptyContainer) {
    const struct {
        const char* what;
        std::string buffer;
    } kCases[] = {
        {"not xml", "plain text"},
        {"truncated", "<VAST><Ad id=\"x\"><InLine>"},
        {"empty", ""},
    };
    for (const auto& c : kCases) {
        EXPECT_EQ(handle.Process(c.buffer), KA_ERR_LOAD_FAILED) << c.what;
        VastAdData* data = Container();
        ASSERT_NE(data, kUntouched) << c.what;
        EXPECT_EQ(data->adCount, 0u) << c.what;
        EXPECT_EQ(data->firstAd, nullptr) << c.what;
        EXPECT_EQ(handle.Info()->adBreakCount, 0u) << c.what;
    }
}

TEST_F(VastOnly, EachProcessReplacesThePreviousResult) {
    ASSERT_EQ(handle.Process(Example("vast-inline-linear.xml")), KA_OK);
    ASSERT_EQ(handle.Process(std::string("<VAST><Ad id=\"one\"/><Ad id=\"two\"/></VAST>")), KA_OK);
    VastAdData* data = Container();
    ASSERT_NE(data, kUntouched);
    EXPECT_EQ(data->adCount, 2u);
    EXPECT_STREQ(data->firstAd->id, "one");
    ASSERT_EQ(handle.Process(Example("vast-inline-linear.xml")), KA_OK);
    EXPECT_STREQ(Container()->firstAd->id, "spring-sale");
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
    ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_STOP_FLAG, nullptr), KA_OK);
    VastAdData* data = Container();
    ASSERT_NE(data, kUntouched);
    ASSERT_NE(data->firstAd, nullptr);
    EXPECT_EQ(data->firstAd->type, AD_TYPE_WRAPPER) << "the failed fetch leaves the wrapper";
    EXPECT_EQ(static_cast<AdWrapper*>(data->firstAd->body)->nestedParser, nullptr);
}

class VastOnlyFiles : public VastOnly {
protected:
    void SetUp() override {
        VastOnly::SetUp();
        katest::AllowLocalFiles(true);
    }
    void TearDown() override { katest::AllowLocalFiles(false); }

    uint32_t ProcessWrapper() {
        const std::string path = std::string(KA_TEST_DATA_DIR) + "handoff/wrapped_inline.xml";
        return handle.Process("<VAST><Ad id=\"outer\"><Wrapper><VASTAdTagURI>" + path +
                              "</VASTAdTagURI></Wrapper></Ad></VAST>");
    }
};

TEST_F(VastOnlyFiles, MergeFlagDecidesBetweenMergedAndNested) {
    ASSERT_EQ(ProcessWrapper(), KA_OK);
    VastAdData* merged = Container();
    ASSERT_NE(merged, kUntouched);
    ASSERT_NE(merged->firstAd, nullptr);
    EXPECT_EQ(merged->firstAd->type, AD_TYPE_INLINE);

    ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_MERGE_WRAPPERS, nullptr), KA_OK);
    ASSERT_EQ(ProcessWrapper(), KA_OK);
    VastAdData* data = Container();
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
