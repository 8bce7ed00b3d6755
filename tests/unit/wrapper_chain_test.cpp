// The wrapper chain over real downloads: wrapped documents come from a loopback HTTP server
// started in this process (127.0.0.1 only) through the real source-IO and XML stand-ins.
#include <arpa/inet.h>
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <httplib.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ka/download.h"
#include "loopback.h"
#include "net/source_io_api.h"
#include "vast_test_util.h"

namespace {

using Clock = std::chrono::steady_clock;
using loopback::SetModule;
using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;
using vasttest::Urls;
using Strings = std::vector<std::string>;

double MsSince(Clock::time_point from, Clock::time_point to = Clock::now()) {
    return std::chrono::duration<double, std::milli>(to - from).count();
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
    std::string doc = "<?xml version=\"1.0\"?><VAST version=\"3.0\">";
    if (!error.empty()) doc += "<Error>" + error + "</Error>";
    return doc + ads + "</VAST>";
}

// Serves the documents a test registers under /d/NAME and counts every request by path.
// /stall requests are held until the server stops or ten seconds pass.
class LoopbackServer : public loopback::Server {
public:
    LoopbackServer()
        : loopback::Server([this](httplib::Server& server, const loopback::Server& self) {
              using Req = const httplib::Request&;
              using Res = httplib::Response&;
              server.Get("/d/(.*)", [this](Req req, Res res) {
                  std::lock_guard<std::mutex> lock(mutex_);
                  counts_[req.path]++;
                  auto found = docs_.find(req.matches[1]);
                  if (found == docs_.end()) {
                      res.status = 404;
                      res.set_content("not here", "text/plain");
                  } else {
                      res.set_content(found->second, "application/xml");
                  }
              });
              server.Get("/stall(/.*)?", [this, &self](Req req, Res res) {
                  {
                      std::lock_guard<std::mutex> lock(mutex_);
                      counts_[req.path]++;
                  }
                  loopback::Stall(self);
                  res.set_content(Vast(InLineAd("late", "late")), "application/xml");
              });
              server.Get("/size/(\\d+)", [](Req req, Res res) {
                  res.set_content(std::string(std::stoul(req.matches[1]), ' '), "application/xml");
              });
          }) {}

    // Registers a document; returns its URL.
    std::string Put(const std::string& name, const std::string& body) {
        std::lock_guard<std::mutex> lock(mutex_);
        docs_[name] = body;
        return Url("/d/" + name);
    }
    int Requests(const std::string& path) {
        std::lock_guard<std::mutex> lock(mutex_);
        return counts_[path];
    }
    int TotalRequests() {
        std::lock_guard<std::mutex> lock(mutex_);
        int total = 0;
        for (const auto& entry : counts_) total += entry.second;
        return total;
    }

private:
    std::mutex mutex_;
    std::map<std::string, std::string> docs_;
    std::map<std::string, int> counts_;
};

// A 127.0.0.1 port that nothing listens on.
int ClosedPort() {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t length = sizeof(address);
    int port = -1;
    if (bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0 &&
        getsockname(fd, reinterpret_cast<sockaddr*>(&address), &length) == 0) {
        port = ntohs(address.sin_port);
    }
    close(fd);
    return port;
}

// The parser fixture with the default depth limit: wrapped documents are fetched.
class WrapperChainTest : public vasttest::VastParserTest {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        SetModule(ka::kSioConnectTimeoutMs, 0);
        SetModule(ka::kSioTotalTimeoutMs, 0);
        SetModule(ka::kSioAllowFiles, 0);
        VastParserTest::SetUp();
        mParser->mMaxDepth = CVASTParser().mMaxDepth;
    }

    void TearDown() override {
        VastParserTest::TearDown();
        SetModule(ka::kSioTotalTimeoutMs, 0);
    }

    // Process on the caller's document (depth 0); the counts are checked afterwards.
    unsigned int Run(const std::string& document, KA_BOOL merge = 1, KA_BOOL* stop = nullptr) {
        mBuffer = document;
        const unsigned int result =
            mParser->Process(&mBuffer[0], static_cast<unsigned int>(mBuffer.size()), merge, stop);
        vasttest::ExpectCountsMatch(Data());
        return result;
    }

    // Drops the result and opens again for the next case of a table.
    void Reset() {
        mParser->ReleaseVastAdData(&Data());
        ASSERT_EQ(0u, mParser->Open(vasttest::ModulesDir()));
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

    LoopbackServer server_;
    std::string mBuffer;
};


// ---- Merging ----------------------------------------------------------------------------------

TEST_F(WrapperChainTest, ThreeWrappersMergeInnermostFirst) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("real", "in")));
    const std::string w2 = server_.Put("w2", Vast(WrapperAd("w2", 7, inLine, "w2")));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 8, w2, "w1")));
    const auto start = Clock::now();
    ASSERT_EQ(0u, Run(Vast(InLineAd("first", "first") + WrapperAd("outer", 3, w1, "w0") +
                           InLineAd("last", "last"))));
    const double ms = MsSince(start);
    std::printf("three-hop chain on loopback: %.2f ms\n", ms);
    RecordProperty("three_hop_ms", std::to_string(ms));

    EXPECT_EQ(3, server_.TotalRequests());
    EXPECT_EQ(1, server_.Requests("/d/inline"));
    EXPECT_EQ(3u, Data().adCount);
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
    // Click-throughs are the InLine's own only.
    EXPECT_EQ(Strings{"thru-in"}, Urls(clicks.clickThroughs));
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
    // Ten documents below the caller's; the parser at depth 10 follows nothing.
    for (int i = 1; i <= 10; ++i) EXPECT_EQ(1, server_.Requests("/d/d" + std::to_string(i))) << i;
    EXPECT_EQ(10, server_.TotalRequests());
    // The tenth document's Wrapper replaces the outer one, without any outer wrapper's
    // tracking: that is copied into InLine ads only.
    ASSERT_EQ(1u, Length(Data().firstAd));
    ExpectWrapperAsParsed(Ad(0), "ad-10", 1, urls[11], "d10");
}

TEST_F(WrapperChainTest, OnlyTheFirstWrappedAdSurvives) {
    const std::string two =
        server_.Put("two", Vast(InLineAd("one", "one") + InLineAd("two", "two")));
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 4, two, "w0"))));
    ASSERT_EQ(1u, Length(Data().firstAd));
    AdData* ad = Ad(0);
    EXPECT_EQ("one", Str(ad->id));
    EXPECT_EQ(4, ad->sequence);
    ASSERT_EQ(AD_TYPE_INLINE, ad->type);
    EXPECT_EQ((Strings{"imp-one-1", "imp-one-2", "imp-w0"}),
              Urls(static_cast<AdInLine*>(ad->body)->impressions));
    EXPECT_EQ(3u, static_cast<AdInLine*>(ad->body)->impressionCount);
}

TEST_F(WrapperChainTest, UnresolvedInnerWrapperReplacesTheOuterOne) {
    // Its own data only: the outer wrapper's impressions go to InLine ads alone. Once the inner
    // wrapper names nothing, once its document is missing.
    const std::string missing = server_.Url("/d/missing");
    const struct {
        const char* name;
        std::string innerUri;
    } kCases[] = {{"nouri", ""}, {"notfound", missing}};
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.name);
        const std::string inner = server_.Put(
            c.name, Vast(WrapperAd("stuck", 9, c.innerUri, "in") + InLineAd("real", "real")));
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 2, inner, "w0"))));
        ASSERT_EQ(1u, Length(Data().firstAd));
        ExpectWrapperAsParsed(Ad(0), "stuck", 2, c.innerUri, "in");
        Reset();
    }
    EXPECT_EQ(1, server_.Requests("/d/missing"));
}

TEST_F(WrapperChainTest, RootErrorOfTheWrappedDocument) {
    const struct {
        const char* outer;
        const char* inner;
        const char* expected;
    } kCases[] = {
        {"outer-error", "inner-error", "outer-error"},
        {"", "inner-error", "inner-error"},
        {"outer-error", "", "outer-error"},
        {"", "", "<null>"},
    };
    int n = 0;
    for (const auto& c : kCases) {
        const std::string name = "inline" + std::to_string(n++);
        SCOPED_TRACE(name);
        const std::string url = server_.Put(name, Vast(InLineAd("real", "in"), c.inner));
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, url, "w0"), c.outer)));
        EXPECT_EQ(c.expected, Str(Data().errorUrl));
        EXPECT_EQ(AD_TYPE_INLINE, Ad(0)->type);
        Reset();
    }
}

// ---- Failures ---------------------------------------------------------------------------------

// A failed download leaves the wrapper as parsed; a download that is no VAST with ads empties it.
TEST_F(WrapperChainTest, FailuresLeaveOrEmptyTheWrapper) {
    server_.Put("text", "this is not XML at all");
    server_.Put("binary", std::string("\x00\x01\xff<\x02", 5));
    server_.Put("empty", "");
    server_.Put("no-ads", Vast(""));
    server_.Put("html", "<html><body>a page</body></html>");
    const int closed = ClosedPort();
    ASSERT_GT(closed, 0);
    const struct {
        const char* name;
        std::string url;
        bool emptied;
        uint32_t totalTimeoutMs;  // 0: the module's default
    } kCases[] = {
        {"no uri", "", false, 0},
        {"404", server_.Url("/d/absent"), false, 0},
        {"refused", "http://127.0.0.1:" + std::to_string(closed) + "/d/x", false, 0},
        {"stall", server_.Url("/stall/a"), false, 400},
        {"over cap", server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE + 1)), false, 0},
        {"empty body", server_.Url("/d/empty"), false, 0},
        {"not xml", server_.Url("/d/text"), true, 0},
        {"binary", server_.Url("/d/binary"), true, 0},
        // A root of any name is read as VAST: no <Ad> child, nothing to put in the place.
        {"no ads", server_.Url("/d/no-ads"), true, 0},
        {"html", server_.Url("/d/html"), true, 0},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.name);
        SetModule(ka::kSioTotalTimeoutMs, c.totalTimeoutMs);
        const int requestsBefore = server_.TotalRequests();
        const auto start = Clock::now();
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 6, c.url, "w0") + InLineAd("next", "n"))));
        EXPECT_LT(MsSince(start), 5000.0);
        if (c.url.empty()) {
            EXPECT_EQ(requestsBefore, server_.TotalRequests());
        }
        ASSERT_EQ(2u, Length(Data().firstAd));
        EXPECT_EQ("next", Str(Ad(1)->id));
        AdData* ad = Ad(0);
        if (!c.emptied) {
            ExpectWrapperAsParsed(ad, "outer", 6, c.url, "w0");
        } else {
            // The wrapper's data is gone and nothing replaces it.
            EXPECT_EQ(AD_TYPE_WRAPPER, ad->type);
            EXPECT_EQ(nullptr, ad->body);
            EXPECT_EQ(nullptr, ad->id);
            EXPECT_EQ(6, ad->sequence);
            EXPECT_EQ(Ad(1), ad->next);
        }
        Reset();
    }
    EXPECT_EQ(1, server_.Requests("/d/absent"));
}

// ---- Merging off ------------------------------------------------------------------------------

// The nested parser of the first Wrapper ad of a container, and the first ad it holds.
CVASTParser* NestedOf(const VastAdData& data) {
    const AdData* ad = data.firstAd;
    if (ad == nullptr || ad->type != AD_TYPE_WRAPPER || ad->body == nullptr) return nullptr;
    return static_cast<AdWrapper*>(ad->body)->nestedParser;
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

// ---- Stop flag --------------------------------------------------------------------------------

TEST_F(WrapperChainTest, StopFlagEndsAStalledChain) {
    // The outer wrapper reaches a stall one hop down; a second top-level wrapper stalls too and
    // must not wait once the flag is set.
    const std::string stallA = server_.Url("/stall/a");
    const std::string stallB = server_.Url("/stall/b");
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, stallA, "w1")));
    KA_BOOL stop = 0;
    Clock::time_point storedAt;
    bool stored = false;
    std::thread stopper([&] {
        const auto deadline = Clock::now() + std::chrono::seconds(5);
        while (server_.Requests("/stall/a") == 0 && Clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(5));
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(100));
        storedAt = Clock::now();
        __atomic_store_n(&stop, static_cast<KA_BOOL>(1), __ATOMIC_SEQ_CST);
        stored = true;
    });
    const auto start = Clock::now();
    const unsigned int result =
        Run(Vast(WrapperAd("outer", 1, w1, "w0") + WrapperAd("second", 2, stallB, "w2")), 1, &stop);
    const auto end = Clock::now();
    stopper.join();

    ASSERT_TRUE(stored);
    EXPECT_EQ(0u, result);
    EXPECT_EQ(&stop, mParser->mStopFlag);
    const double latency = MsSince(storedAt, end);
    std::printf("stop flag to Process return: %.2f ms (whole run %.2f ms)\n", latency,
                MsSince(start, end));
    RecordProperty("stop_latency_ms", std::to_string(latency));
    EXPECT_LT(latency, 3000.0);
    EXPECT_EQ(1, server_.Requests("/stall/a"));
    // The stalled inner wrapper stays as read and replaces the outer one; the second wrapper's
    // fetch fails too and it stays as read.
    ExpectWrapperAsParsed(Ad(0), "w1", 1, stallA, "w1");
    ExpectWrapperAsParsed(Ad(1), "second", 2, stallB, "w2");
}

// ---- Creative pairs ---------------------------------------------------------------------------

// The wrapper's and the InLine's documents are parsed by two parsers and merged with
// MergeCreatives: every pair of Linear creatives gets a copy.
TEST_F(WrapperChainTest, EveryPairOfLinearCreativesGetsACopy) {
    auto creative = [](const std::string& tag, bool clicks) {
        std::string c = "<Creative><Linear><TrackingEvents><Tracking>trk-" + tag +
                        "</Tracking></TrackingEvents>";
        if (clicks)
            c += "<VideoClicks><ClickTracking>click-" + tag + "</ClickTracking></VideoClicks>";
        return c + "</Linear></Creative>";
    };
    const std::string companion = "<Creative><CompanionAds><Companion/></CompanionAds></Creative>";
    // Each: a Linear creative with VideoClicks, a companion, a Linear creative without.
    mParser->mMaxDepth = 0;
    ASSERT_EQ(0u, Run(Vast("<Ad><Wrapper><Creatives>" + creative("wa", true) + companion +
                           creative("wb", false) + "</Creatives></Wrapper></Ad>")));
    CVASTParser other;
    ASSERT_EQ(0u, other.Open(vasttest::ModulesDir()));
    std::string buffer = Vast("<Ad><InLine><Creatives>" + creative("ia", true) + companion +
                              creative("ib", false) + "</Creatives></InLine></Ad>");
    ASSERT_EQ(0u, other.Process(&buffer[0], static_cast<unsigned int>(buffer.size()), 1, nullptr));
    AdWrapper* wrapper = static_cast<AdWrapper*>(Ad(0)->body);
    AdInLine* inLine = static_cast<AdInLine*>(other.mVastAdData.firstAd->body);
    ASSERT_EQ(0u, mParser->MergeCreatives(wrapper, inLine->creatives));
    vasttest::ExpectCountsMatch(other.mVastAdData);

    AdCreative* ia = inLine->creatives;
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
    EXPECT_EQ(nullptr, mParser->CopyClickList(nullptr));
    EXPECT_EQ(nullptr, mParser->CopyTrackingList(nullptr));
    EXPECT_EQ(nullptr, mParser->CopyImpressionList(nullptr));
    EXPECT_EQ("trk-wb", Str(Nth(ia->content.trackingEvents, 3)->url));
    EXPECT_EQ(2u, ia->content.videoClicks->clickTrackingCount);
    other.ReleaseVastAdData(&other.mVastAdData);
}

}  // namespace
