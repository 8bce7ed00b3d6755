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
#include <condition_variable>
#include <cstdio>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ka/download.h"
#include "net/source_io_api.h"
#include "vast_test_util.h"

namespace {

using Clock = std::chrono::steady_clock;
using vasttest::Length;
using vasttest::Nth;
using vasttest::Str;

double MsSince(Clock::time_point from, Clock::time_point to = Clock::now()) {
    return std::chrono::duration<double, std::milli>(to - from).count();
}

// ---- Documents --------------------------------------------------------------------------------

// A Wrapper ad whose every URL is tagged: impression "imp-TAG", tracking "trk-TAG", click
// tracking "click-TAG" (id "ct-TAG"), custom click "custom-TAG", click-through "thru-TAG".
// An empty uri leaves out <VASTAdTagURI>.
std::string WrapperAd(const std::string& id, int sequence, const std::string& uri,
                      const std::string& tag) {
    std::string ad = "<Ad id=\"" + id + "\" sequence=\"" + std::to_string(sequence) +
                     "\"><Wrapper><AdSystem>sys-" + tag + "</AdSystem>";
    if (!uri.empty()) ad += "<VASTAdTagURI><![CDATA[" + uri + "]]></VASTAdTagURI>";
    ad += "<Error>err-" + tag + "</Error><Impression>imp-" + tag +
          "</Impression><Creatives><Creative id=\"wc-" + tag +
          "\"><Linear><TrackingEvents><Tracking event=\"progress\" offset=\"00:00:05\">trk-" + tag +
          "</Tracking></TrackingEvents><VideoClicks><ClickThrough>thru-" + tag +
          "</ClickThrough><ClickTracking id=\"ct-" + tag + "\">click-" + tag +
          "</ClickTracking><CustomClick>custom-" + tag +
          "</CustomClick></VideoClicks></Linear></Creative></Creatives></Wrapper></Ad>";
    return ad;
}

// An InLine ad with two impressions and an empty one (counted, not stored), one Linear
// creative with a tracking event, a click-through and a click tracking of its own.
std::string InLineAd(const std::string& id, const std::string& tag) {
    return "<Ad id=\"" + id + "\"><InLine><AdSystem>sys-" + tag + "</AdSystem><AdTitle>title-" +
           tag + "</AdTitle><Impression>imp-" + tag + "-1</Impression><Impression></Impression>" +
           "<Impression>imp-" + tag + "-2</Impression><Creatives><Creative id=\"ic-" + tag +
           "\"><Linear><Duration>00:00:10</Duration><MediaFiles><MediaFile type=\"video/mp4\">" +
           "media-" + tag + "</MediaFile></MediaFiles><TrackingEvents><Tracking event=\"start\">" +
           "trk-" + tag + "</Tracking></TrackingEvents><VideoClicks><ClickThrough>thru-" + tag +
           "</ClickThrough><ClickTracking>click-" + tag +
           "</ClickTracking></VideoClicks></Linear></Creative></Creatives></InLine></Ad>";
}

std::string Vast(const std::string& ads, const std::string& error = "") {
    std::string doc = "<?xml version=\"1.0\"?><VAST version=\"3.0\">";
    if (!error.empty()) doc += "<Error>" + error + "</Error>";
    return doc + ads + "</VAST>";
}

// ---- Loopback server --------------------------------------------------------------------------

// Serves the documents a test registers under /d/NAME and counts every request by path.
// Stalled requests are held until the test ends or ten seconds pass.
class LoopbackServer {
public:
    LoopbackServer() {
        server_.Get("/d/(.*)", [this](const httplib::Request& req, httplib::Response& res) {
            Count(req.path);
            std::lock_guard<std::mutex> lock(mutex_);
            auto found = docs_.find(req.matches[1]);
            if (found == docs_.end()) {
                res.status = 404;
                res.set_content("not here", "text/plain");
            } else {
                res.set_content(found->second, "application/xml");
            }
        });
        server_.Get("/stall(/.*)?", [this](const httplib::Request& req, httplib::Response& res) {
            Count(req.path);
            std::unique_lock<std::mutex> lock(mutex_);
            released_.wait_for(lock, std::chrono::seconds(10), [this] { return release_; });
            res.set_content(Vast(InLineAd("late", "late")), "application/xml");
        });
        server_.Get("/size/(\\d+)", [this](const httplib::Request& req, httplib::Response& res) {
            Count(req.path);
            res.set_content(std::string(std::stoul(req.matches[1]), ' '), "application/xml");
        });
        port_ = server_.bind_to_any_port("127.0.0.1");
        if (port_ > 0) {
            thread_ = std::thread([this] { server_.listen_after_bind(); });
            const auto deadline = Clock::now() + std::chrono::seconds(5);
            while (!server_.is_running() && Clock::now() < deadline) {
                std::this_thread::sleep_for(std::chrono::milliseconds(1));
            }
        }
    }

    ~LoopbackServer() {
        {
            std::lock_guard<std::mutex> lock(mutex_);
            release_ = true;
        }
        released_.notify_all();
        server_.stop();
        if (thread_.joinable()) thread_.join();
    }

    bool Running() const { return port_ > 0 && server_.is_running(); }
    std::string Url(const std::string& path) const {
        return "http://127.0.0.1:" + std::to_string(port_) + path;
    }
    // Registers a document; its URL.
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
    void Count(const std::string& path) {
        std::lock_guard<std::mutex> lock(mutex_);
        counts_[path]++;
    }

    httplib::Server server_;
    std::thread thread_;
    int port_ = -1;
    std::mutex mutex_;
    std::condition_variable released_;
    bool release_ = false;
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

// ---- Fixture ----------------------------------------------------------------------------------

class WrapperChainTest : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        // The same loaded object the library reaches: its module-wide settings apply to the
        // downloads of the chain.
        module_ = dlopen(KA_MODULES_DIR "libkaSourceIO.so", RTLD_NOW);
        ASSERT_NE(nullptr, module_) << dlerror();
        auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module_, "kaGetSourceIOAPI"));
        ASSERT_NE(nullptr, entry);
        memset(&api_, 0, sizeof(api_));
        entry(&api_);
    }

    void SetUp() override {
        ASSERT_NE(nullptr, api_.SetParam);
        ASSERT_TRUE(server_.Running());
        SetModule(ka::kSioConnectTimeoutMs, 0);
        SetModule(ka::kSioTotalTimeoutMs, 0);
        SetModule(ka::kSioAllowFiles, 0);
        mObjectsBefore = CSDKObject::g_kaSDKObjectNum;
        mParser = new CVASTParser();
        ASSERT_EQ(0u, mParser->Open(vasttest::ModulesDir()));
    }

    void TearDown() override {
        mParser->ReleaseVastAdData(&mParser->mVastAdData);
        delete mParser;
        // Every nested parser is gone with the records.
        EXPECT_EQ(mObjectsBefore, CSDKObject::g_kaSDKObjectNum);
        SetModule(ka::kSioTotalTimeoutMs, 0);
    }

    static void SetModule(uint32_t id, uint32_t value) {
        ASSERT_EQ(0u, api_.SetParam(nullptr, id, &value));
    }

    // Process on the caller's document (depth 0); the counts are checked afterwards.
    unsigned int Run(const std::string& document, KA_BOOL merge = 1, KA_BOOL* stop = nullptr) {
        mBuffer = document;
        const unsigned int result =
            mParser->Process(&mBuffer[0], static_cast<unsigned int>(mBuffer.size()), merge, stop);
        vasttest::ExpectCountsMatch(mParser->mVastAdData);
        return result;
    }

    VastAdData& Data() { return mParser->mVastAdData; }
    AdData* Ad(uint32_t index) { return Nth(Data().firstAd, index); }

    static std::vector<std::string> Impressions(const AdImpression* list) {
        std::vector<std::string> urls;
        for (; list != nullptr; list = list->next) urls.push_back(Str(list->url));
        return urls;
    }
    static std::vector<std::string> Clicks(const AdClick* list) {
        std::vector<std::string> urls;
        for (; list != nullptr; list = list->next) urls.push_back(Str(list->url));
        return urls;
    }
    static std::vector<std::string> Trackings(const AdTracking* list) {
        std::vector<std::string> urls;
        for (; list != nullptr; list = list->next) urls.push_back(Str(list->url));
        return urls;
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
        EXPECT_EQ(std::vector<std::string>{"imp-" + tag}, Impressions(wrapper->impressions));
        ASSERT_NE(nullptr, wrapper->creatives);
        EXPECT_EQ(std::vector<std::string>{"trk-" + tag},
                  Trackings(wrapper->creatives->content.trackingEvents));
        EXPECT_EQ(nullptr, wrapper->nestedParser);
    }

    static void* module_;
    static SourceIOApi api_;
    LoopbackServer server_;
    CVASTParser* mParser = nullptr;
    int mObjectsBefore = 0;
    std::string mBuffer;
};

void* WrapperChainTest::module_ = nullptr;
SourceIOApi WrapperChainTest::api_;

// ---- Merging ----------------------------------------------------------------------------------

TEST_F(WrapperChainTest, ThreeWrappersMergeInnermostFirst) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("real", "in")));
    const std::string w2 = server_.Put("w2", Vast(WrapperAd("w2", 7, inLine, "w2")));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 8, w2, "w1")));
    const std::string top = Vast(InLineAd("first", "first") + WrapperAd("outer", 3, w1, "w0") +
                                 InLineAd("last", "last"));

    const auto start = Clock::now();
    ASSERT_EQ(0u, Run(top));
    const double ms = MsSince(start);
    std::printf("three-hop chain on loopback: %.2f ms\n", ms);
    RecordProperty("three_hop_ms", std::to_string(ms));

    EXPECT_EQ(1, server_.Requests("/d/w1"));
    EXPECT_EQ(1, server_.Requests("/d/w2"));
    EXPECT_EQ(1, server_.Requests("/d/inline"));
    EXPECT_EQ(3u, Data().adCount);
    ASSERT_EQ(3u, Length(Data().firstAd));
    EXPECT_EQ("first", Str(Ad(0)->id));
    EXPECT_EQ("last", Str(Ad(2)->id));

    // The resolved ad stands where the outer wrapper stood, with its sequence.
    AdData* ad = Ad(1);
    EXPECT_EQ("real", Str(ad->id));
    EXPECT_EQ(3, ad->sequence);
    ASSERT_EQ(AD_TYPE_INLINE, ad->type);
    AdInLine* body = static_cast<AdInLine*>(ad->body);
    ASSERT_NE(nullptr, body);
    EXPECT_EQ("title-in", Str(body->adTitle));
    const std::vector<std::string> impressions = {"imp-in-1", "imp-in-2", "imp-w2", "imp-w1",
                                                  "imp-w0"};
    EXPECT_EQ(impressions, Impressions(body->impressions));
    EXPECT_EQ(5u, body->impressionCount);  // the empty one no longer counts

    ASSERT_EQ(1u, body->creativeCount);
    AdLinear& linear = body->creatives->content;
    EXPECT_EQ(10000u, linear.duration);
    const std::vector<std::string> trackings = {"trk-in", "trk-w2", "trk-w1", "trk-w0"};
    EXPECT_EQ(trackings, Trackings(linear.trackingEvents));
    EXPECT_EQ(4u, linear.trackingCount);
    // Copies keep event and offset.
    AdTracking* copied = Nth(linear.trackingEvents, 3);
    EXPECT_EQ("progress", Str(copied->event));
    EXPECT_EQ(AD_OFFSET_TIME, copied->offsetKind);
    EXPECT_EQ(5000, copied->offset);

    ASSERT_NE(nullptr, linear.videoClicks);
    AdVideoClicks& clicks = *linear.videoClicks;
    const std::vector<std::string> clickTrackings = {"click-in", "click-w2", "click-w1",
                                                     "click-w0"};
    EXPECT_EQ(clickTrackings, Clicks(clicks.clickTrackings));
    EXPECT_EQ(4u, clicks.clickTrackingCount);
    EXPECT_EQ("<null>", Str(clicks.clickTrackings->id));
    EXPECT_EQ("ct-w2", Str(clicks.clickTrackings->next->id));
    const std::vector<std::string> customs = {"custom-w2", "custom-w1", "custom-w0"};
    EXPECT_EQ(customs, Clicks(clicks.customClicks));
    EXPECT_EQ(3u, clicks.customClickCount);
    // Click-throughs are the InLine's own only.
    EXPECT_EQ(std::vector<std::string>{"thru-in"}, Clicks(clicks.clickThroughs));
    EXPECT_EQ(1u, clicks.clickThroughCount);
}

TEST_F(WrapperChainTest, ElevenWrappersStopAtDepthTen) {
    // d1 .. d11 are wrappers, each naming the next; d12 would be the InLine.
    std::vector<std::string> urls(13);
    urls[12] = server_.Put("d12", Vast(InLineAd("real", "in")));
    for (int i = 11; i >= 1; --i) {
        urls[i] = server_.Put(
            "d" + std::to_string(i),
            Vast(WrapperAd("ad-" + std::to_string(i), i, urls[i + 1], "d" + std::to_string(i))));
    }
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, urls[1], "d0"))));

    // Ten documents below the caller's; the parser at depth 10 follows nothing.
    for (int i = 1; i <= 10; ++i) EXPECT_EQ(1, server_.Requests("/d/d" + std::to_string(i))) << i;
    EXPECT_EQ(0, server_.Requests("/d/d11"));
    EXPECT_EQ(10, server_.TotalRequests());

    // The tenth document's Wrapper replaces the outer one, without any outer wrapper's
    // tracking: that is copied into InLine ads only.
    ASSERT_EQ(1u, Length(Data().firstAd));
    AdData* ad = Ad(0);
    EXPECT_EQ(1, ad->sequence);
    EXPECT_EQ("ad-10", Str(ad->id));
    ASSERT_EQ(AD_TYPE_WRAPPER, ad->type);
    AdWrapper* wrapper = static_cast<AdWrapper*>(ad->body);
    ASSERT_NE(nullptr, wrapper);
    EXPECT_EQ(urls[11], Str(wrapper->vastAdTagUri));
    EXPECT_EQ(std::vector<std::string>{"imp-d10"}, Impressions(wrapper->impressions));
    EXPECT_EQ(nullptr, wrapper->nestedParser);
}

TEST_F(WrapperChainTest, OnlyTheFirstWrappedAdSurvives) {
    const std::string two =
        server_.Put("two", Vast(InLineAd("one", "one") + InLineAd("two", "two")));
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 4, two, "w0"))));
    ASSERT_EQ(1u, Length(Data().firstAd));
    EXPECT_EQ(1u, Data().adCount);
    AdData* ad = Ad(0);
    EXPECT_EQ("one", Str(ad->id));
    EXPECT_EQ(4, ad->sequence);
    ASSERT_EQ(AD_TYPE_INLINE, ad->type);
    const std::vector<std::string> impressions = {"imp-one-1", "imp-one-2", "imp-w0"};
    EXPECT_EQ(impressions, Impressions(static_cast<AdInLine*>(ad->body)->impressions));
    EXPECT_EQ(3u, static_cast<AdInLine*>(ad->body)->impressionCount);
}

TEST_F(WrapperChainTest, UnresolvedWrappedWrapperReplacesTheOuterOne) {
    // The wrapped document's first ad names nothing; its second is an InLine.
    const std::string inner =
        server_.Put("inner", Vast(WrapperAd("stuck", 9, "", "in") + InLineAd("real", "real")));
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 2, inner, "w0"))));
    EXPECT_EQ(1, server_.TotalRequests());
    ASSERT_EQ(1u, Length(Data().firstAd));
    // Its own data only: the outer wrapper's impressions go to InLine ads alone.
    ExpectWrapperAsParsed(Ad(0), "stuck", 2, "", "in");
}

TEST_F(WrapperChainTest, FailedInnerFetchLeavesTheInnerWrapperInPlace) {
    const std::string missing = server_.Url("/d/missing");
    const std::string inner = server_.Put("inner", Vast(WrapperAd("inner", 5, missing, "w1")));
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, inner, "w0"))));
    EXPECT_EQ(1, server_.Requests("/d/missing"));
    ExpectWrapperAsParsed(Ad(0), "inner", 1, missing, "w1");
}

TEST_F(WrapperChainTest, RootErrorOfTheWrappedDocument) {
    struct Case {
        const char* outerError;
        const char* innerError;
        const char* expected;
    };
    const Case cases[] = {
        {"outer-error", "inner-error", "outer-error"},
        {"", "inner-error", "inner-error"},
        {"outer-error", "", "outer-error"},
        {"", "", "<null>"},
    };
    int n = 0;
    for (const Case& c : cases) {
        const std::string name = "inline" + std::to_string(n++);
        const std::string url = server_.Put(name, Vast(InLineAd("real", "in"), c.innerError));
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, url, "w0"), c.outerError)));
        EXPECT_EQ(c.expected, Str(Data().errorUrl)) << name;
        EXPECT_EQ(AD_TYPE_INLINE, Ad(0)->type) << name;
        mParser->ReleaseVastAdData(&Data());
        ASSERT_EQ(0u, mParser->Open(vasttest::ModulesDir()));
    }
}

// ---- Failures ---------------------------------------------------------------------------------

enum class Outcome { AsParsed, Emptied };

TEST_F(WrapperChainTest, FailuresLeaveOrEmptyTheWrapper) {
    struct Case {
        const char* name;
        std::string url;
        Outcome outcome;
        uint32_t totalTimeoutMs;  // 0: the module's default
    };
    server_.Put("text", "this is not XML at all");
    server_.Put("binary", std::string("\x00\x01\xff<\x02", 5));
    server_.Put("empty", "");
    server_.Put("no-ads", Vast(""));
    server_.Put("html", "<html><body>a page</body></html>");
    const int closed = ClosedPort();
    ASSERT_GT(closed, 0);
    const std::vector<Case> cases = {
        {"404", server_.Url("/d/absent"), Outcome::AsParsed, 0},
        {"refused", "http://127.0.0.1:" + std::to_string(closed) + "/d/x", Outcome::AsParsed, 0},
        {"stall", server_.Url("/stall/a"), Outcome::AsParsed, 400},
        {"over cap", server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE + 1)),
         Outcome::AsParsed, 0},
        {"empty body", server_.Url("/d/empty"), Outcome::AsParsed, 0},
        {"not xml", server_.Url("/d/text"), Outcome::Emptied, 0},
        {"binary", server_.Url("/d/binary"), Outcome::Emptied, 0},
        // A root of any name is read as VAST: no <Ad> child, nothing to put in the place.
        {"no ads", server_.Url("/d/no-ads"), Outcome::Emptied, 0},
        {"html", server_.Url("/d/html"), Outcome::Emptied, 0},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.name);
        SetModule(ka::kSioTotalTimeoutMs, c.totalTimeoutMs);
        const auto start = Clock::now();
        ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 6, c.url, "w0") + InLineAd("next", "n"))));
        EXPECT_LT(MsSince(start), 5000.0);
        ASSERT_EQ(2u, Length(Data().firstAd));
        EXPECT_EQ("next", Str(Ad(1)->id));
        AdData* ad = Ad(0);
        if (c.outcome == Outcome::AsParsed) {
            ExpectWrapperAsParsed(ad, "outer", 6, c.url, "w0");
        } else {
            // The wrapper's data is gone and nothing replaces it.
            EXPECT_EQ(AD_TYPE_WRAPPER, ad->type);
            EXPECT_EQ(nullptr, ad->body);
            EXPECT_EQ(nullptr, ad->id);
            EXPECT_EQ(6, ad->sequence);
            EXPECT_EQ(Ad(1), ad->next);
        }
        mParser->ReleaseVastAdData(&Data());
        ASSERT_EQ(0u, mParser->Open(vasttest::ModulesDir()));
    }
    EXPECT_EQ(1, server_.Requests("/d/absent"));
}

TEST_F(WrapperChainTest, WrapperWithoutUriFetchesNothing) {
    ASSERT_EQ(0u, Run(Vast(WrapperAd("bare", 1, "", "w0"))));
    EXPECT_EQ(0, server_.TotalRequests());
    ExpectWrapperAsParsed(Ad(0), "bare", 1, "", "w0");
}

// ---- Merging off ------------------------------------------------------------------------------

TEST_F(WrapperChainTest, MergingOffKeepsTheChainInNestedParsers) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("real", "in"), "inner-err"));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, inLine, "w1")));
    ASSERT_EQ(0u, Run(Vast(WrapperAd("outer", 1, w1, "w0")), 0));
    EXPECT_EQ(1, server_.Requests("/d/inline"));
    EXPECT_EQ(nullptr, Data().errorUrl);

    AdData* ad = Ad(0);
    ASSERT_EQ(AD_TYPE_WRAPPER, ad->type);
    AdWrapper* outer = static_cast<AdWrapper*>(ad->body);
    ASSERT_NE(nullptr, outer);
    EXPECT_EQ(w1, Str(outer->vastAdTagUri));
    EXPECT_EQ(std::vector<std::string>{"imp-w0"}, Impressions(outer->impressions));
    ASSERT_NE(nullptr, outer->nestedParser);
    VastAdData& level1 = outer->nestedParser->mVastAdData;
    EXPECT_EQ(1u, level1.depth);
    EXPECT_EQ(0, outer->nestedParser->mMergeWrappers);
    ASSERT_NE(nullptr, level1.firstAd);
    EXPECT_EQ("w1", Str(level1.firstAd->id));
    ASSERT_EQ(AD_TYPE_WRAPPER, level1.firstAd->type);
    AdWrapper* middle = static_cast<AdWrapper*>(level1.firstAd->body);
    ASSERT_NE(nullptr, middle->nestedParser);
    VastAdData& level2 = middle->nestedParser->mVastAdData;
    EXPECT_EQ(2u, level2.depth);
    EXPECT_EQ("inner-err", Str(level2.errorUrl));
    ASSERT_NE(nullptr, level2.firstAd);
    ASSERT_EQ(AD_TYPE_INLINE, level2.firstAd->type);
    // Nothing merged: the InLine has only its own impressions.
    const std::vector<std::string> own = {"imp-in-1", "imp-in-2"};
    EXPECT_EQ(own, Impressions(static_cast<AdInLine*>(level2.firstAd->body)->impressions));
}

// A VAST element of another parser's document, read with ParseVASTNode alone: the element's
// own wrappers follow the given flag, nested parsers merge (mMergeWrappers stays 1).
TEST_F(WrapperChainTest, ElementOfAnotherDocumentMergesBelowItsOwnLevel) {
    const std::string inLine = server_.Put("inline", Vast(InLineAd("real", "in")));
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, inLine, "w1")));
    std::string holderDoc = Vast(WrapperAd("outer", 1, w1, "w0"));
    CVASTParser* holder = new CVASTParser();
    ASSERT_EQ(0u, holder->Open(vasttest::ModulesDir()));
    ASSERT_EQ(0u, holder->LoadXML(&holderDoc[0], static_cast<int>(holderDoc.size()), 160));
    void* root = nullptr;
    holder->GetFirstChild(nullptr, &root);
    ASSERT_NE(nullptr, root);
    EXPECT_EQ(0u, mParser->ParseVASTNode(root, false, false));
    holder->Close();
    delete holder;

    EXPECT_EQ(nullptr, mParser->mStopFlag);
    AdData* ad = Ad(0);
    ASSERT_EQ(AD_TYPE_WRAPPER, ad->type);
    AdWrapper* outer = static_cast<AdWrapper*>(ad->body);
    ASSERT_NE(nullptr, outer->nestedParser);
    EXPECT_EQ(nullptr, outer->nestedParser->mStopFlag);
    EXPECT_EQ(1, outer->nestedParser->mMergeWrappers);
    AdData* resolved = outer->nestedParser->mVastAdData.firstAd;
    ASSERT_NE(nullptr, resolved);
    EXPECT_EQ("real", Str(resolved->id));
    ASSERT_EQ(AD_TYPE_INLINE, resolved->type);
    const std::vector<std::string> impressions = {"imp-in-1", "imp-in-2", "imp-w1"};
    EXPECT_EQ(impressions, Impressions(static_cast<AdInLine*>(resolved->body)->impressions));
}

// ---- Stop flag --------------------------------------------------------------------------------

TEST_F(WrapperChainTest, StopFlagEndsAStalledChain) {
    // The outer wrapper reaches a stall one hop down; a second top-level wrapper stalls too and
    // must not wait once the flag is set.
    const std::string stallA = server_.Url("/stall/a");
    const std::string stallB = server_.Url("/stall/b");
    const std::string w1 = server_.Put("w1", Vast(WrapperAd("w1", 2, stallA, "w1")));
    const std::string top =
        Vast(WrapperAd("outer", 1, w1, "w0") + WrapperAd("second", 2, stallB, "w2"));

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
    const unsigned int result = Run(top, 1, &stop);
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

// ---- Copies -----------------------------------------------------------------------------------

TEST_F(WrapperChainTest, CopiesAreDeepAndOrdered) {
    EXPECT_EQ(nullptr, mParser->CopyImpressionList(nullptr));
    EXPECT_EQ(nullptr, mParser->CopyClickList(nullptr));
    EXPECT_EQ(nullptr, mParser->CopyTrackingList(nullptr));

    char a[] = "a", b[] = "b", id[] = "id", ev[] = "start";
    AdClick c2 = {nullptr, b, nullptr};
    AdClick c1 = {id, nullptr, &c2};
    AdClick* clicks = mParser->CopyClickList(&c1);
    ASSERT_EQ(2u, Length(clicks));
    EXPECT_NE(&c1, clicks);
    EXPECT_NE(c1.id, clicks->id);
    EXPECT_EQ("id", Str(clicks->id));
    EXPECT_EQ(nullptr, clicks->url);
    EXPECT_EQ(nullptr, clicks->next->id);
    EXPECT_EQ("b", Str(clicks->next->url));
    EXPECT_NE(b, clicks->next->url);

    AdTracking t2 = {nullptr, AD_OFFSET_PERCENT, 25, a, nullptr};
    AdTracking t1 = {ev, AD_OFFSET_TIME, 1500, nullptr, &t2};
    AdTracking* trackings = mParser->CopyTrackingList(&t1);
    ASSERT_EQ(2u, Length(trackings));
    EXPECT_EQ("start", Str(trackings->event));
    EXPECT_NE(ev, trackings->event);
    EXPECT_EQ(AD_OFFSET_TIME, trackings->offsetKind);
    EXPECT_EQ(1500, trackings->offset);
    EXPECT_EQ(AD_OFFSET_PERCENT, trackings->next->offsetKind);
    EXPECT_EQ(25, trackings->next->offset);
    EXPECT_EQ("a", Str(trackings->next->url));

    AdImpression i2 = {b, nullptr};
    AdImpression i1 = {a, &i2};
    AdImpression* impressions = mParser->CopyImpressionList(&i1);
    EXPECT_EQ((std::vector<std::string>{"a", "b"}), Impressions(impressions));
    EXPECT_NE(a, impressions->url);

    // Freed as the release does: node by node, strings with array delete.
    for (AdClick* c = clicks; c != nullptr;) {
        AdClick* next = c->next;
        delete[] c->id;
        delete[] c->url;
        delete c;
        c = next;
    }
    for (AdTracking* t = trackings; t != nullptr;) {
        AdTracking* next = t->next;
        delete[] t->event;
        delete[] t->url;
        delete t;
        t = next;
    }
    for (AdImpression* i = impressions; i != nullptr;) {
        AdImpression* next = i->next;
        delete[] i->url;
        delete i;
        i = next;
    }
}

// Creative pairs through the parser's own records, without downloads: the wrapper's and the
// InLine's documents are parsed by two parsers and merged with MergeCreatives.
TEST_F(WrapperChainTest, EveryPairOfLinearCreativesGetsACopy) {
    auto creative = [](const std::string& tag, bool clicks) {
        std::string c = "<Creative id=\"" + tag + "\"><Linear><TrackingEvents>" +
                        "<Tracking event=\"start\">trk-" + tag + "</Tracking></TrackingEvents>";
        if (clicks) {
            c += "<VideoClicks><ClickTracking>click-" + tag + "</ClickTracking></VideoClicks>";
        }
        return c + "</Linear></Creative>";
    };
    const std::string companion =
        "<Creative id=\"cmp\"><CompanionAds><Companion/></CompanionAds></Creative>";
    // Wrapper: two Linear creatives (the second without VideoClicks) and a companion.
    const std::string wrapperDoc =
        Vast("<Ad><Wrapper><Creatives>" + creative("wa", true) + companion + creative("wb", false) +
             "</Creatives></Wrapper></Ad>");
    // InLine: a Linear creative with VideoClicks, a companion, one without VideoClicks.
    const std::string inLineDoc =
        Vast("<Ad><InLine><Creatives>" + creative("ia", true) + companion + creative("ib", false) +
             "</Creatives></InLine></Ad>");
    mParser->mMaxDepth = 0;
    ASSERT_EQ(0u, Run(wrapperDoc));
    CVASTParser* other = new CVASTParser();
    other->mMaxDepth = 0;
    ASSERT_EQ(0u, other->Open(vasttest::ModulesDir()));
    std::string buffer = inLineDoc;
    ASSERT_EQ(0u, other->Process(&buffer[0], static_cast<unsigned int>(buffer.size()), 1, nullptr));

    AdWrapper* wrapper = static_cast<AdWrapper*>(Ad(0)->body);
    AdInLine* inLine = static_cast<AdInLine*>(other->mVastAdData.firstAd->body);
    ASSERT_NE(nullptr, wrapper);
    ASSERT_NE(nullptr, inLine);
    ASSERT_EQ(0u, mParser->MergeCreatives(wrapper, inLine->creatives));
    vasttest::ExpectCountsMatch(other->mVastAdData);

    AdCreative* ia = inLine->creatives;
    AdCreative* cmp = ia->next;
    AdCreative* ib = cmp->next;
    EXPECT_EQ((std::vector<std::string>{"trk-ia", "trk-wa", "trk-wb"}),
              Trackings(ia->content.trackingEvents));
    EXPECT_EQ(3u, ia->content.trackingCount);
    EXPECT_EQ((std::vector<std::string>{"click-ia", "click-wa"}),
              Clicks(ia->content.videoClicks->clickTrackings));
    EXPECT_EQ(2u, ia->content.videoClicks->clickTrackingCount);
    EXPECT_EQ(nullptr, ia->content.videoClicks->customClicks);
    EXPECT_EQ(0u, ia->content.videoClicks->customClickCount);
    EXPECT_EQ(AD_CREATIVE_NONE, cmp->kind);
    EXPECT_EQ(nullptr, cmp->content.trackingEvents);
    // Without VideoClicks of its own, a creative takes tracking events but no clicks.
    EXPECT_EQ((std::vector<std::string>{"trk-ib", "trk-wa", "trk-wb"}),
              Trackings(ib->content.trackingEvents));
    EXPECT_EQ(nullptr, ib->content.videoClicks);

    // MergeLinear alone, the wrapper creative without VideoClicks: tracking only.
    AdCreative* wb = Nth(wrapper->creatives, 2);
    ASSERT_EQ(0u, mParser->MergeLinear(wb, ia));
    EXPECT_EQ(4u, ia->content.trackingCount);
    EXPECT_EQ("trk-wb", Str(Nth(ia->content.trackingEvents, 3)->url));
    EXPECT_EQ(2u, ia->content.videoClicks->clickTrackingCount);

    other->ReleaseVastAdData(&other->mVastAdData);
    delete other;
}

// Many wrapper creatives appended to a long InLine list (timed for the report).
TEST_F(WrapperChainTest, ManyWrapperCreativesIntoALongList) {
    const int kTrackings = 20000;
    const int kCreatives = 2000;
    std::string events;
    for (int i = 0; i < kTrackings; ++i) events += "<Tracking event=\"start\">t</Tracking>";
    const std::string inLineDoc =
        Vast("<Ad id=\"real\"><InLine><Creatives><Creative><Linear><TrackingEvents>" + events +
             "</TrackingEvents></Linear></Creative></Creatives></InLine></Ad>");
    const std::string url = server_.Put("long", inLineDoc);
    std::string creatives;
    for (int i = 0; i < kCreatives; ++i) {
        creatives +=
            "<Creative><Linear><TrackingEvents><Tracking event=\"start\">w</Tracking>"
            "</TrackingEvents></Linear></Creative>";
    }
    const std::string top =
        Vast("<Ad><Wrapper><VASTAdTagURI>" + url + "</VASTAdTagURI><Creatives>" + creatives +
             "</Creatives></Wrapper></Ad>");
    const auto start = Clock::now();
    ASSERT_EQ(0u, Run(top));
    const double ms = MsSince(start);
    std::printf("merge of %d wrapper creatives into %d events: %.1f ms\n", kCreatives, kTrackings,
                ms);
    ASSERT_EQ(AD_TYPE_INLINE, Ad(0)->type);
    AdLinear& linear = static_cast<AdInLine*>(Ad(0)->body)->creatives->content;
    EXPECT_EQ(static_cast<uint32_t>(kTrackings + kCreatives), linear.trackingCount);
    EXPECT_EQ("w", Str(Nth(linear.trackingEvents, kTrackings)->url));
    EXPECT_EQ("t", Str(Nth(linear.trackingEvents, kTrackings - 1)->url));
}

}  // namespace
