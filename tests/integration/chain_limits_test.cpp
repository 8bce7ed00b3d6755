// What an ad server can make one Process spend, through the public table, with the documents
// served by a loopback server in this process: the deadline, the byte budget, the share of merge
// copies, where relative references lead, each hop fetched once, and the stop flag ending a
// stalled fetch.
#include "ka/chain_limits.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>

#include "api_support.h"
#include "loopback.h"

namespace {

using Clock = std::chrono::steady_clock;

std::string Vast(const std::string& ads) { return "<VAST version=\"3.0\">" + ads + "</VAST>"; }
std::string WrapperAd(const std::string& id, const std::string& uri,
                      const std::string& creatives = "") {
    return "<Ad id=\"" + id + "\"><Wrapper><VASTAdTagURI><![CDATA[" + uri +
           "]]></VASTAdTagURI><Impression>imp-" + id + "</Impression>" + creatives +
           "</Wrapper></Ad>";
}
std::string InLineAd(const std::string& id, const std::string& creatives = "") {
    return "<Ad id=\"" + id + "\"><InLine><Impression>imp-" + id + "</Impression>" + creatives +
           "</InLine></Ad>";
}

void* Value(uintptr_t value) { return reinterpret_cast<void*>(value); }

class ChainLimits : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        ASSERT_EQ(handle_.openResult(), KA_OK);
    }
    VastAdData* RunVast(const std::string& document) {
        handle_.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
        EXPECT_EQ(handle_.Process(document), KA_OK);
        return handle_.Container();
    }
    void Set(uint32_t id, void* value) {
        EXPECT_EQ(katest::Api().SetParam(handle_.get(), id, value), KA_OK);
    }

    loopback::Server server_;
    katest::Handle handle_;
};

// Four inline wrappers naming a server that never answers: the deadline ends the whole Process,
// in VMAP mode too, where no stop flag reaches the downloads.
TEST_F(ChainLimits, DeadlineEndsEveryDownloadOfAProcess) {
    std::string breaks;
    for (int i = 0; i < 4; ++i) {
        breaks += "<vmap:AdBreak breakId=\"b" + std::to_string(i) +
                  "\"><vmap:AdSource><vmap:VASTAdData>" +
                  Vast(WrapperAd("w", server_.Url("/stall/" + std::to_string(i)))) +
                  "</vmap:VASTAdData></vmap:AdSource></vmap:AdBreak>";
    }
    Set(KA_PID_VMAP_DEADLINE_MS, Value(2000));
    uint32_t deadline = 0;
    EXPECT_EQ(katest::Api().GetParam(handle_.get(), KA_PID_VMAP_DEADLINE_MS, &deadline), KA_OK);
    EXPECT_EQ(deadline, 2000u);
    const auto start = Clock::now();
    ASSERT_EQ(handle_.Process("<vmap:VMAP>" + breaks + "</vmap:VMAP>"), KA_OK);
    const auto ms =
        std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count();
    EXPECT_GE(ms, 1950);
    EXPECT_LT(ms, 2500);
    EXPECT_EQ(handle_.Info()->adBreakCount, 4u);
    EXPECT_EQ(server_.Requests(), 1) << "no fetch starts past the deadline";
    RecordProperty("ms", std::to_string(ms));
}

// Sixty-four wrappers all naming one 1 MiB document, merging off: the byte budget decides how
// many copies of it the nested parsers keep; the rest stay as parsed.
TEST_F(ChainLimits, ByteBudgetBoundsTheKeptDocuments) {
    const std::string document = Vast(std::string(1 << 20, ' ') + InLineAd("in"));
    const std::string big = server_.Put("big", document);
    std::string ads;
    for (int i = 0; i < 64; ++i) ads += WrapperAd("w" + std::to_string(i), big);
    handle_.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, false);
    for (uint64_t budget : {uint64_t{0}, uint64_t{3} << 20}) {
        Set(KA_PID_VMAP_FETCH_BYTES, Value(budget));
        uint64_t read = 0;
        katest::Api().GetParam(handle_.get(), KA_PID_VMAP_FETCH_BYTES, &read);
        EXPECT_EQ(read, budget != 0 ? budget : KA_VMAP_DEFAULT_FETCH_BYTES);
        VastAdData* data = RunVast(Vast(ads));
        uint64_t kept = 0;
        for (const AdData* ad = data->firstAd; ad != nullptr; ad = ad->next) {
            kept += static_cast<const AdWrapper*>(ad->body)->nestedParser != nullptr;
        }
        EXPECT_EQ(kept, read / document.size()) << budget;
    }
}

// A wrapper with many Linear tracking events over an InLine with many Linear creatives: the
// copies stop at the Process's share, measured as the library counts them.
TEST_F(ChainLimits, MergeCopiesStopAtTheirShare) {
    const int kEvents = 1500, kCreatives = 1500;
    std::string events, linears;
    for (int i = 0; i < kEvents; ++i) events += "<Tracking event=\"start\">t</Tracking>";
    for (int i = 0; i < kCreatives; ++i) linears += "<Creative><Linear/></Creative>";
    const std::string inLine = Vast(InLineAd("in", "<Creatives>" + linears + "</Creatives>"));
    const std::string wrapper =
        Vast(WrapperAd("w", server_.Put("in", inLine),
                       "<Creatives><Creative><Linear><TrackingEvents>" + events +
                           "</TrackingEvents></Linear></Creative></Creatives>"));
    VastAdData* data = RunVast(wrapper);
    ASSERT_EQ(data->firstAd->type, AD_TYPE_INLINE);
    const AdInLine* body = static_cast<const AdInLine*>(data->firstAd->body);
    uint64_t copied = 0;
    for (const AdCreative* c = body->creatives; c != nullptr; c = c->next) {
        for (const AdTracking* t = c->content.trackingEvents; t != nullptr; t = t->next) {
            copied += sizeof(AdTracking) + sizeof("start") + sizeof("t");
        }
    }
    const uint64_t share = KA_VMAP_MERGE_BYTES_FLOOR +
                           KA_VMAP_MERGE_BYTES_PER_PARSED_BYTE * (wrapper.size() + inLine.size());
    EXPECT_LE(copied, share);
    EXPECT_GT(copied + sizeof(AdTracking) + 8, share) << "the copies fill their share";
    // The impressions are merged before the creatives and fit.
    EXPECT_STREQ(body->impressions->next->url, "imp-w");
    // The ad plays; its outcome tells that its wrapper's tracking was cut.
    KaChainOutcome* outcome = nullptr;
    katest::ExtApi().GetChainOutcomes(handle_.get(), &outcome);
    ASSERT_NE(outcome, nullptr);
    EXPECT_EQ(outcome->state, KA_CHAIN_RESOLVED);
    EXPECT_EQ(outcome->reason, KA_CHAIN_REASON_MERGE_SHARE);
    EXPECT_EQ(outcome->vastError, KA_VAST_ERROR_LIMIT);
}

// References seen from the document that names them; what came over the network may name only
// http and https documents.
TEST_F(ChainLimits, RelativeReferencesAndSchemes) {
    server_.Put("inline", Vast(InLineAd("in")));
    server_.Put("relative", Vast(WrapperAd("rel", "inline")));
    const std::string folder = std::string(KA_TEST_DATA_DIR) + "documents/vast/";
    server_.Put("file", Vast(WrapperAd(
                            "file", "file://localhost" + folder + "wrapped_inline.wrapped.xml")));
    const std::string origin = server_.Url("/x");
    const std::string authority = server_.Url("/").substr(5);  // "//127.0.0.1:port/"
    const struct {
        std::string document;
        const char* base;  // KA_PID_VMAP_BASE_URL
        uint32_t type;     // of the first ad after the chain
        const char* id;
    } kCases[] = {
        {Vast(WrapperAd("a", server_.Url("/d/relative"))), nullptr, AD_TYPE_INLINE, "in"},
        {Vast(WrapperAd("b", "d/inline")), origin.c_str(), AD_TYPE_INLINE, "in"},
        {Vast(WrapperAd("c", authority + "d/inline")), "http://unused.test/x", AD_TYPE_INLINE,
         "in"},
        {Vast(WrapperAd("d", "relative")), nullptr, AD_TYPE_WRAPPER, "d"},
        {Vast(WrapperAd("e", server_.Url("/d/file"))), nullptr, AD_TYPE_WRAPPER, "file"},
        {Vast(WrapperAd("f", server_.Url("/d/missing"))), nullptr, AD_TYPE_WRAPPER, "f"},  // 404
    };
    katest::AllowLocalFilesBelow(folder);  // only the scheme rule keeps the file from being read
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.document);
        std::string base = c.base != nullptr ? c.base : "";
        Set(KA_PID_VMAP_BASE_URL, c.base != nullptr ? &base[0] : nullptr);
        const AdData* ad = RunVast(c.document)->firstAd;
        EXPECT_EQ(ad->type, c.type);
        EXPECT_STREQ(ad->id, c.id);
    }
    katest::AllowLocalFiles(false);
    char* base = static_cast<char*>(katest::kUntouched);
    katest::Api().GetParam(handle_.get(), KA_PID_VMAP_BASE_URL, &base);
    EXPECT_EQ(base, nullptr);
}

TEST_F(ChainLimits, TwoHopsFetchEachDocumentOnce) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("in")));
    const std::string hop = server_.Put("w1", Vast(WrapperAd("w1", inLine)));
    EXPECT_EQ(RunVast(Vast(WrapperAd("w0", hop)))->firstAd->type, AD_TYPE_INLINE);
    EXPECT_EQ(server_.Requests(), 2);
    EXPECT_EQ(server_.Requests("/d/inline"), 1);
}

// Set by another thread while the fetch waits, the flag ends it and leaves the wrapper.
TEST_F(ChainLimits, StopFlagEndsAStalledFetch) {
    KA_BOOL stop = 0;
    Set(KA_PID_VMAP_STOP_FLAG, &stop);
    std::thread stopper([&] {
        const auto deadline = Clock::now() + std::chrono::seconds(5);
        while (server_.Requests("/stall") == 0 && Clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        __atomic_store_n(&stop, static_cast<KA_BOOL>(1), __ATOMIC_SEQ_CST);
    });
    const auto start = Clock::now();
    EXPECT_EQ(RunVast(Vast(WrapperAd("w", server_.Url("/stall"))))->firstAd->type, AD_TYPE_WRAPPER);
    EXPECT_LT(Clock::now() - start, std::chrono::seconds(3));  // the stall holds ten
    stopper.join();
    EXPECT_EQ(server_.Requests("/stall"), 1);
}

}  // namespace
