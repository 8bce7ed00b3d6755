// The wrapper chain over real downloads: wrapped documents come from a loopback HTTP server
// started in this process (127.0.0.1 only) through the real source-IO and XML stand-ins.
#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <thread>
#include <vector>

#include "ka/download.h"
#include "loopback.h"
#include "vast_test_util.h"

namespace {

using Clock = std::chrono::steady_clock;
using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;
using vasttest::Urls;
using Strings = std::vector<std::string>;

double MsSince(Clock::time_point from) {
    return std::chrono::duration<double, std::milli>(Clock::now() - from).count();
}

// A Wrapper ad whose every URL is tagged: impression "imp-TAG", tracking "trk-TAG", click
// tracking "click-TAG" (id "ct-TAG"), custom click "custom-TAG", click-through "thru-TAG".
// An empty uri leaves out <VASTAdTagURI>.
std::string WrapperAd(const std::string& id, int sequence, const std::string& uri,
                      const std::string& tag) {
    std::string ad = "<Ad id=\"" + id + "\" sequence=\"" + std::to_string(sequence) +
                     "\"><Wrapper><AdSystem>sys-" + tag + "</AdSystem>";
    if (!uri.empty()) ad += "<VASTAdTagURI><![CDATA[" + uri + "]]></VASTAdTagURI>";
    return ad + "<Error>err-" + tag + "</Error><Impression>imp-" + tag +
           "</Impression><Creatives><Creative><Linear><TrackingEvents><Tracking "
           "event=\"progress\" offset=\"00:00:05\">trk-" +
           tag + "</Tracking></TrackingEvents><VideoClicks><ClickThrough>thru-" + tag +
           "</ClickThrough><ClickTracking id=\"ct-" + tag + "\">click-" + tag +
           "</ClickTracking><CustomClick>custom-" + tag +
           "</CustomClick></VideoClicks></Linear></Creative></Creatives></Wrapper></Ad>";
}

// An InLine ad with two impressions and an empty one (counted, not stored), one Linear
// creative with a tracking event, a click-through and a click tracking of its own.
std::string InLineAd(const std::string& id, const std::string& tag) {
    return "<Ad id=\"" + id + "\"><InLine><AdTitle>title-" + tag + "</AdTitle><Impression>imp-" +
           tag + "-1</Impression><Impression></Impression><Impression>imp-" + tag +
           "-2</Impression><Creatives><Creative><Linear><Duration>00:00:10</Duration>"
           "<TrackingEvents><Tracking event=\"start\">trk-" +
           tag + "</Tracking></TrackingEvents><VideoClicks><ClickThrough>thru-" + tag +
           "</ClickThrough><ClickTracking>click-" + tag +
           "</ClickTracking></VideoClicks></Linear></Creative></Creatives></InLine></Ad>";
}

std::string Vast(const std::string& ads, const std::string& error = "") {
    return "<?xml version=\"1.0\"?><VAST version=\"3.0\">" +
           (error.empty() ? "" : "<Error>" + error + "</Error>") + ads + "</VAST>";
}

// The nested parser of the first Wrapper ad of a container.
CVASTParser* NestedOf(const VastAdData& data) {
    const AdData* ad = data.firstAd;
    if (ad == nullptr || ad->type != AD_TYPE_WRAPPER || ad->body == nullptr) return nullptr;
    return static_cast<AdWrapper*>(ad->body)->nestedParser;
}

// The parser fixture with the default depth limit: wrapped documents are fetched.
class WrapperChainTest : public vasttest::VastParserTest {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        loopback::SetModule(ka::kSioTotalTimeoutMs, 0);
        VastParserTest::SetUp();
        mParser->mMaxDepth = CVASTParser().mMaxDepth;
    }

    // Process on the caller's document (depth 0), after dropping an earlier run's records.
    unsigned int Run(const std::string& document, KA_BOOL merge = 1, KA_BOOL* stop = nullptr) {
        if (mRuns++ > 0) {
            mParser->ReleaseVastAdData(&Data());
            EXPECT_EQ(0u, mParser->Open(vasttest::ModulesDir()));
        }
        mBuffer = document;
        const unsigned int result =
            mParser->Process(&mBuffer[0], static_cast<unsigned int>(mBuffer.size()), merge, stop);
        vasttest::ExpectCountsMatch(Data());
        return result;
    }

    // The ad as parsed from WrapperAd(id, sequence, uri, tag), untouched by the chain.
    static void ExpectWrapperAsParsed(const AdData* ad, const std::string& id, int sequence,
                                      const std::string& uri, const std::string& tag) {
        ASSERT_NE(nullptr, ad);
        EXPECT_EQ(id, Str(ad->id));
        EXPECT_EQ(sequence, ad->sequence);
        ASSERT_EQ(AD_TYPE_WRAPPER, ad->type);
        const AdWrapper* wrapper = static_cast<const AdWrapper*>(ad->body);
        ASSERT_NE(nullptr, wrapper);
        EXPECT_EQ(uri.empty() ? "<null>" : uri, Str(wrapper->vastAdTagUri));
        EXPECT_EQ("sys-" + tag, Str(wrapper->adSystem));
        EXPECT_EQ(Strings{"imp-" + tag}, Urls(wrapper->impressions));
        ASSERT_NE(nullptr, wrapper->creatives);
        EXPECT_EQ(Strings{"trk-" + tag}, Urls(wrapper->creatives->content.trackingEvents));
        EXPECT_EQ(nullptr, wrapper->nestedParser);
    }

    loopback::Server server_;
    std::string mBuffer;
    int mRuns = 0;
};

TEST_F(WrapperChainTest, ThreeWrappersMergeInnermostFirst) {
    // Only the first ad of the wrapped document survives.
    const std::string inLine =
        server_.Put("inline", Vast(InLineAd("real", "in") + InLineAd("two", "two")));
    const std::string w2 = server_.Put("w2", Vast(WrapperAd("w2", 7, inLine, "w2")));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 8, w2, "w1")));
    ASSERT_EQ(0u, Run(Vast(InLineAd("first", "first") + WrapperAd("outer", 3, w1, "w0") +
                           InLineAd("last", "last"))));
    EXPECT_EQ(3, server_.Requests(""));
    EXPECT_EQ(1, server_.Requests("/d/inline"));
    ASSERT_EQ(3u, Length(Data().firstAd));
    EXPECT_EQ("last", Str(Ad(2)->id));
    // The resolved ad stands where the outer wrapper stood, with its sequence.
    AdData* ad = Ad(1);
    EXPECT_EQ("real", Str(ad->id));
    EXPECT_EQ(3, ad->sequence);
    ASSERT_EQ(AD_TYPE_INLINE, ad->type);
    AdInLine* body = static_cast<AdInLine*>(ad->body);
    EXPECT_EQ("title-in", Str(body->adTitle));
    EXPECT_EQ((Strings{"imp-in-1", "imp-in-2", "imp-w2", "imp-w1", "imp-w0"}),
              Urls(body->impressions));
    EXPECT_EQ(5u, body->impressionCount);  // the empty one no longer counts
    AdLinear& linear = body->creatives->content;
    EXPECT_EQ(10000u, linear.duration);
    EXPECT_EQ((Strings{"trk-in", "trk-w2", "trk-w1", "trk-w0"}), Urls(linear.trackingEvents));
    // Copies keep event and offset.
    AdTracking* copied = Nth(linear.trackingEvents, 3);
    EXPECT_EQ("progress", Str(copied->event));
    EXPECT_EQ(AD_OFFSET_TIME, copied->offsetKind);
    EXPECT_EQ(5000, copied->offset);
    AdVideoClicks& clicks = *linear.videoClicks;
    EXPECT_EQ((Strings{"click-in", "click-w2", "click-w1", "click-w0"}),
              Urls(clicks.clickTrackings));
    EXPECT_EQ("ct-w2", Str(clicks.clickTrackings->next->id));
    EXPECT_EQ((Strings{"custom-w2", "custom-w1", "custom-w0"}), Urls(clicks.customClicks));
    EXPECT_EQ(Strings{"thru-in"}, Urls(clicks.clickThroughs));  // the InLine's own only
}

TEST_F(WrapperChainTest, ElevenWrappersStopAtDepthTen) {
    // d1 .. d11 are wrappers, each naming the next; d12 would be the InLine.
    std::vector<std::string> urls(13);
    urls[12] = server_.Put("d12", Vast(InLineAd("real", "in")));
    for (int i = 11; i >= 1; --i) {
        const std::string n = std::to_string(i);
        urls[i] = server_.Put("d" + n, Vast(WrapperAd("ad-" + n, i, urls[i + 1], "d" + n)));
    }
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, urls[1], "d0"))));
    for (int i = 1; i <= 10; ++i) EXPECT_EQ(1, server_.Requests("/d/d" + std::to_string(i))) << i;
    EXPECT_EQ(10, server_.Requests(""));
    // The tenth document's Wrapper replaces the outer one, without the outer wrappers'
    // tracking: that is copied into InLine ads only.
    ASSERT_EQ(1u, Length(Data().firstAd));
    ExpectWrapperAsParsed(Ad(0), "ad-10", 1, urls[11], "d10");
}

// A failed download leaves the wrapper as parsed; a download that is no VAST with ads empties
// it; a wrapped Wrapper that leads nowhere replaces it as parsed (its own data only).
TEST_F(WrapperChainTest, FailuresLeaveEmptyOrReplaceTheWrapper) {
    server_.Put("text", "this is not XML at all");
    server_.Put("binary", std::string("\x00\x01\xff<\x02", 5));
    server_.Put("empty", "");
    server_.Put("no-ads", Vast(""));
    server_.Put("html", "<html><body>a page</body></html>");
    const std::string missing = server_.Url("/d/missing");
    auto inner = [&](const std::string& name, const std::string& uri) {
        return server_.Put(name, Vast(WrapperAd("stuck", 9, uri, "in") + InLineAd("real", "r")));
    };
    enum Outcome { kKept, kEmptied, kInner };
    const struct {
        const char* name;
        std::string url;
        Outcome outcome;
        uint32_t totalTimeoutMs;  // 0: the module's default
        std::string innerUri;
    } kCases[] = {
        {"no uri", "", kKept, 0, ""},
        {"404", server_.Url("/d/absent"), kKept, 0, ""},
        {"refused", loopback::RefusedUrl(), kKept, 0, ""},
        {"stall", server_.Url("/stall/a"), kKept, 400, ""},
        {"over cap", server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE + 1)), kKept, 0,
         ""},
        {"empty body", server_.Url("/d/empty"), kKept, 0, ""},
        {"not xml", server_.Url("/d/text"), kEmptied, 0, ""},
        {"binary", server_.Url("/d/binary"), kEmptied, 0, ""},
        // A root of any name is read as VAST: no <Ad> child, nothing to put in the place.
        {"no ads", server_.Url("/d/no-ads"), kEmptied, 0, ""},
        {"html", server_.Url("/d/html"), kEmptied, 0, ""},
        {"inner without uri", inner("nouri", ""), kInner, 0, ""},
        {"inner not found", inner("notfound", missing), kInner, 0, missing},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.name);
        loopback::SetModule(ka::kSioTotalTimeoutMs, c.totalTimeoutMs);
        const int requestsBefore = server_.Requests("");
        const auto start = Clock::now();
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 6, c.url, "w0") + InLineAd("next", "n"))));
        EXPECT_LT(MsSince(start), 5000.0);
        if (c.url.empty()) {
            EXPECT_EQ(requestsBefore, server_.Requests(""));
        }
        ASSERT_EQ(2u, Length(Data().firstAd));
        EXPECT_EQ("next", Str(Ad(1)->id));
        AdData* ad = Ad(0);
        if (c.outcome == kKept) ExpectWrapperAsParsed(ad, "outer", 6, c.url, "w0");
        if (c.outcome == kInner) ExpectWrapperAsParsed(ad, "stuck", 6, c.innerUri, "in");
        if (c.outcome == kEmptied) {
            // The wrapper's data is gone and nothing replaces it.
            EXPECT_EQ(AD_TYPE_WRAPPER, ad->type);
            EXPECT_EQ(nullptr, ad->body);
            EXPECT_EQ(nullptr, ad->id);
            EXPECT_EQ(6, ad->sequence);
            EXPECT_EQ(Ad(1), ad->next);
        }
    }
    EXPECT_EQ(1, server_.Requests("/d/absent"));
    EXPECT_EQ(1, server_.Requests("/d/missing"));
}

TEST_F(WrapperChainTest, RootErrorOfTheWrappedDocument) {
    const char* const kCases[][3] = {
        // Outer error, inner error, the error kept.
        {"outer-error", "inner-error", "outer-error"},
        {"", "inner-error", "inner-error"},
        {"outer-error", "", "outer-error"},
        {"", "", "<null>"},
    };
    int n = 0;
    for (const auto& c : kCases) {
        const std::string name = "inline" + std::to_string(n++);
        SCOPED_TRACE(name);
        const std::string url = server_.Put(name, Vast(InLineAd("real", "in"), c[1]));
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, url, "w0"), c[0])));
        EXPECT_EQ(c[2], Str(Data().errorUrl));
        EXPECT_EQ(AD_TYPE_INLINE, Ad(0)->type);
    }
}

TEST_F(WrapperChainTest, MergingOffKeepsTheChainInNestedParsers) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("real", "in"), "inner-err"));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, inLine, "w1")));
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, w1, "w0")), 0));
    EXPECT_EQ(1, server_.Requests("/d/inline"));
    EXPECT_EQ(nullptr, Data().errorUrl);
    EXPECT_EQ(Strings{"imp-w0"}, Urls(static_cast<AdWrapper*>(Ad(0)->body)->impressions));
    CVASTParser* level1 = NestedOf(Data());
    ASSERT_NE(nullptr, level1);
    EXPECT_EQ(1u, level1->mVastAdData.depth);
    EXPECT_EQ(0, level1->mMergeWrappers);
    CVASTParser* level2 = NestedOf(level1->mVastAdData);
    ASSERT_NE(nullptr, level2);
    EXPECT_EQ(2u, level2->mVastAdData.depth);
    EXPECT_EQ("inner-err", Str(level2->mVastAdData.errorUrl));
    ASSERT_EQ(AD_TYPE_INLINE, level2->mVastAdData.firstAd->type);
    // Nothing merged: the InLine has only its own impressions.
    EXPECT_EQ((Strings{"imp-in-1", "imp-in-2"}),
              Urls(static_cast<AdInLine*>(level2->mVastAdData.firstAd->body)->impressions));
}

// A VAST element of another parser's document, read with ParseVASTNode alone: the element's
// own wrappers follow the given flag, nested parsers merge (mMergeWrappers stays 1).
TEST_F(WrapperChainTest, ElementOfAnotherDocumentMergesBelowItsOwnLevel) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("real", "in")));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, inLine, "w1")));
    std::string holderDoc = Vast(WrapperAd("outer", 1, w1, "w0"));
    CVASTParser holder;
    ASSERT_EQ(0u, holder.Open(vasttest::ModulesDir()));
    ASSERT_EQ(0u, holder.LoadXML(&holderDoc[0], static_cast<int>(holderDoc.size()), 160));
    void* root = nullptr;
    holder.GetFirstChild(nullptr, &root);
    EXPECT_EQ(0u, mParser->ParseVASTNode(root, false, false));
    holder.Close();
    // Not the owner of the document: still open afterwards, no stop flag of its own.
    EXPECT_NE(nullptr, mParser->mXMLHandle);
    EXPECT_EQ(nullptr, mParser->mStopFlag);
    CVASTParser* nested = NestedOf(Data());
    ASSERT_NE(nullptr, nested);
    EXPECT_EQ(nullptr, nested->mStopFlag);
    EXPECT_EQ(1, nested->mMergeWrappers);
    AdData* resolved = nested->mVastAdData.firstAd;
    EXPECT_EQ("real", Str(resolved->id));
    ASSERT_EQ(AD_TYPE_INLINE, resolved->type);
    EXPECT_EQ((Strings{"imp-in-1", "imp-in-2", "imp-w1"}),
              Urls(static_cast<AdInLine*>(resolved->body)->impressions));
}

TEST_F(WrapperChainTest, StopFlagEndsAStalledChain) {
    // The outer wrapper reaches a stall one hop down; a second top-level wrapper stalls too and
    // must not wait once the flag is set.
    const std::string stallA = server_.Url("/stall/a"), stallB = server_.Url("/stall/b");
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, stallA, "w1")));
    KA_BOOL stop = 0;
    Clock::time_point storedAt;
    std::thread stopper([&] {
        const auto deadline = Clock::now() + std::chrono::seconds(5);
        while (server_.Requests("/stall/a") == 0 && Clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        storedAt = Clock::now();
        __atomic_store_n(&stop, static_cast<KA_BOOL>(1), __ATOMIC_SEQ_CST);
    });
    EXPECT_EQ(0u, Run(Vast(WrapperAd("outer", 1, w1, "w0") + WrapperAd("second", 2, stallB, "w2")),
                      1, &stop));
    stopper.join();
    EXPECT_LT(MsSince(storedAt), 3000.0);
    EXPECT_EQ(&stop, mParser->mStopFlag);
    EXPECT_EQ(1, server_.Requests("/stall/a"));
    // The stalled inner wrapper stays as read and replaces the outer one; the second wrapper's
    // fetch fails too and it stays as read.
    ExpectWrapperAsParsed(Ad(0), "w1", 1, stallA, "w1");
    ExpectWrapperAsParsed(Ad(1), "second", 2, stallB, "w2");
}

// The wrapper's and the InLine's documents parsed by two parsers and merged with MergeCreatives:
// every pair of Linear creatives gets a copy.
TEST_F(WrapperChainTest, EveryPairOfLinearCreativesGetsACopy) {
    // Each side: a Linear creative with VideoClicks, a companion, a Linear creative without.
    auto creatives = [](const std::string& a, const std::string& b) {
        auto linear = [](const std::string& tag, const std::string& clicks) {
            return "<Creative><Linear><TrackingEvents><Tracking>trk-" + tag +
                   "</Tracking></TrackingEvents>" + clicks + "</Linear></Creative>";
        };
        return "<Creatives>" +
               linear(a,
                      "<VideoClicks><ClickTracking>click-" + a + "</ClickTracking></VideoClicks>") +
               "<Creative><CompanionAds><Companion/></CompanionAds></Creative>" + linear(b, "") +
               "</Creatives>";
    };
    mParser->mMaxDepth = 0;
    ASSERT_EQ(0u, Run(Vast("<Ad><Wrapper>" + creatives("wa", "wb") + "</Wrapper></Ad>")));
    CVASTParser other;
    ASSERT_EQ(0u, other.Open(vasttest::ModulesDir()));
    std::string buffer = Vast("<Ad><InLine>" + creatives("ia", "ib") + "</InLine></Ad>");
    ASSERT_EQ(0u, other.Process(&buffer[0], static_cast<unsigned int>(buffer.size()), 1, nullptr));
    AdWrapper* wrapper = static_cast<AdWrapper*>(Ad(0)->body);
    AdCreative* ia = static_cast<AdInLine*>(other.mVastAdData.firstAd->body)->creatives;
    ASSERT_EQ(0u, mParser->MergeCreatives(wrapper, ia));
    vasttest::ExpectCountsMatch(other.mVastAdData);

    AdCreative* ib = Nth(ia, 2);
    EXPECT_EQ((Strings{"trk-ia", "trk-wa", "trk-wb"}), Urls(ia->content.trackingEvents));
    EXPECT_EQ((Strings{"click-ia", "click-wa"}), Urls(ia->content.videoClicks->clickTrackings));
    // Null strings stay null in the copies.
    EXPECT_EQ(nullptr, ia->content.videoClicks->clickTrackings->next->id);
    EXPECT_EQ(nullptr, Nth(ia->content.trackingEvents, 1)->event);
    EXPECT_EQ(nullptr, ia->content.videoClicks->customClicks);
    EXPECT_EQ(nullptr, ia->next->content.trackingEvents);  // the companion
    // Without VideoClicks of its own, a creative takes tracking events but no clicks.
    EXPECT_EQ((Strings{"trk-ib", "trk-wa", "trk-wb"}), Urls(ib->content.trackingEvents));
    EXPECT_EQ(nullptr, ib->content.videoClicks);
    // A wrapper creative without VideoClicks adds tracking only.
    ASSERT_EQ(0u, mParser->MergeLinear(Nth(wrapper->creatives, 2), ia));
    EXPECT_EQ("trk-wb", Str(Nth(ia->content.trackingEvents, 3)->url));
    EXPECT_EQ(2u, ia->content.videoClicks->clickTrackingCount);
    EXPECT_EQ(nullptr, mParser->CopyClickList(nullptr));
    EXPECT_EQ(nullptr, mParser->CopyTrackingList(nullptr));
    EXPECT_EQ(nullptr, mParser->CopyImpressionList(nullptr));
    other.ReleaseVastAdData(&other.mVastAdData);
}

}  // namespace
