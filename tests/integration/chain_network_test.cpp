// Wrapper chains through the public table whose documents come over HTTP from a loopback server
// in this process (127.0.0.1 only), in VAST-only mode: each hop fetched once, and the stop flag
// ending a stalled fetch. What a chain merges is in the document cases, read from local files.
#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>

#include "api_support.h"
#include "loopback.h"

namespace {

using Clock = std::chrono::steady_clock;

std::string Wrapper(const std::string& uri) {
    return "<VAST><Ad id=\"w\"><Wrapper><VASTAdTagURI>" + uri +
           "</VASTAdTagURI><Impression>imp</Impression></Wrapper></Ad></VAST>";
}

class ChainNetwork : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        ASSERT_EQ(handle_.openResult(), KA_OK);
        handle_.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    }
    // The type of the first ad after processing document, or -1 without one.
    int Run(const std::string& document) {
        EXPECT_EQ(handle_.Process(document), KA_OK);
        VastAdData* data = handle_.Container();
        if (data == katest::kUntouched || data == nullptr || data->firstAd == nullptr) return -1;
        return data->firstAd->type;
    }

    loopback::Server server_;
    katest::Handle handle_;
};

TEST_F(ChainNetwork, TwoHopsReachTheInLine) {
    const std::string inLine = server_.Put(
        "inline", "<VAST><Ad id=\"real\"><InLine><AdTitle>title</AdTitle></InLine></Ad></VAST>");
    EXPECT_EQ(Run(Wrapper(server_.Put("w1", Wrapper(inLine)))), AD_TYPE_INLINE);
    EXPECT_EQ(server_.Requests(), 2);
    EXPECT_EQ(server_.Requests("/d/inline"), 1);
}

// Set by another thread while the fetch waits, the flag ends it and leaves the wrapper.
TEST_F(ChainNetwork, StopFlagEndsAStalledFetch) {
    KA_BOOL stop = 0;
    ASSERT_EQ(katest::Api().SetParam(handle_.get(), KA_PID_VMAP_STOP_FLAG, &stop), KA_OK);
    std::thread stopper([&] {
        const auto deadline = Clock::now() + std::chrono::seconds(5);
        while (server_.Requests("/stall") == 0 && Clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        __atomic_store_n(&stop, static_cast<KA_BOOL>(1), __ATOMIC_SEQ_CST);
    });
    const auto start = Clock::now();
    EXPECT_EQ(Run(Wrapper(server_.Url("/stall"))), AD_TYPE_WRAPPER);
    EXPECT_LT(Clock::now() - start, std::chrono::seconds(3));  // the stall holds ten
    stopper.join();
    EXPECT_EQ(server_.Requests("/stall"), 1);
}

}  // namespace
