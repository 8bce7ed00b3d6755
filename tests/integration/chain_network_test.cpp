// Wrapper chains through the public table whose documents come over HTTP from a loopback server
// in this process (127.0.0.1 only), in VAST-only mode: merging over two hops, a failed fetch, and
// the stop flag ending a stalled fetch.
#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "api_support.h"
#include "loopback.h"

namespace {

using Clock = std::chrono::steady_clock;
using Strings = std::vector<std::string>;

std::string Wrapper(const std::string& id, const std::string& uri) {
    return "<VAST><Ad id=\"" + id + "\"><Wrapper><VASTAdTagURI>" + uri +
           "</VASTAdTagURI><Impression>imp-" + id + "</Impression></Wrapper></Ad></VAST>";
}

Strings Impressions(const AdImpression* impression) {
    Strings urls;
    for (; impression != nullptr; impression = impression->next) urls.push_back(impression->url);
    return urls;
}

class ChainNetwork : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        ASSERT_EQ(handle_.openResult(), KA_OK);
        handle_.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    }
    // The first ad after processing document, or null.
    const AdData* Run(const std::string& document) {
        EXPECT_EQ(handle_.Process(document), KA_OK);
        VastAdData* data = handle_.Container();
        return data != katest::kUntouched && data != nullptr ? data->firstAd : nullptr;
    }
    // The ad as parsed from Wrapper(id, uri), untouched by the chain.
    static void ExpectWrapperAsParsed(const AdData* ad, const std::string& id,
                                      const std::string& uri) {
        ASSERT_NE(ad, nullptr);
        ASSERT_EQ(ad->type, AD_TYPE_WRAPPER);
        const AdWrapper* wrapper = static_cast<const AdWrapper*>(ad->body);
        EXPECT_EQ(std::string(ad->id), id);
        EXPECT_EQ(std::string(wrapper->vastAdTagUri), uri);
        EXPECT_EQ(Impressions(wrapper->impressions), Strings{"imp-" + id});
        EXPECT_EQ(wrapper->nestedParser, nullptr);
    }

    loopback::Server server_;
    katest::Handle handle_;
};

TEST_F(ChainNetwork, TwoHopsMergeIntoTheInLine) {
    const std::string inLine =
        server_.Put("inline",
                    "<VAST><Ad id=\"real\"><InLine><AdTitle>title</AdTitle><Impression>imp-in"
                    "</Impression></InLine></Ad></VAST>");
    const std::string w1 = server_.Put("w1", Wrapper("w1", inLine));
    const AdData* ad = Run(Wrapper("w0", w1));
    ASSERT_NE(ad, nullptr);
    ASSERT_EQ(ad->type, AD_TYPE_INLINE);
    EXPECT_STREQ(ad->id, "real");
    const AdInLine* body = static_cast<const AdInLine*>(ad->body);
    EXPECT_STREQ(body->adTitle, "title");
    EXPECT_EQ(Impressions(body->impressions), (Strings{"imp-in", "imp-w1", "imp-w0"}));
    EXPECT_EQ(server_.Requests(), 2);
    EXPECT_EQ(server_.Requests("/d/inline"), 1);
}

TEST_F(ChainNetwork, FailedFetchLeavesTheWrapperAsParsed) {
    const std::string absent = server_.Url("/d/absent");
    ExpectWrapperAsParsed(Run(Wrapper("w0", absent)), "w0", absent);
    EXPECT_EQ(server_.Requests("/d/absent"), 1);
}

TEST_F(ChainNetwork, StopFlagEndsAStalledFetch) {
    KA_BOOL stop = 0;
    ASSERT_EQ(katest::Api().SetParam(handle_.get(), KA_PID_VMAP_STOP_FLAG, &stop), KA_OK);
    Clock::time_point storedAt = Clock::now() + std::chrono::hours(1);
    std::thread stopper([&] {
        const auto deadline = Clock::now() + std::chrono::seconds(5);
        while (server_.Requests("/stall") == 0 && Clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        storedAt = Clock::now();
        __atomic_store_n(&stop, static_cast<KA_BOOL>(1), __ATOMIC_SEQ_CST);
    });
    const std::string stall = server_.Url("/stall");
    const AdData* ad = Run(Wrapper("w0", stall));
    stopper.join();
    EXPECT_LT(
        std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - storedAt).count(),
        3000);
    EXPECT_EQ(server_.Requests("/stall"), 1);
    ExpectWrapperAsParsed(ad, "w0", stall);
}

}  // namespace
