// Downloads through the real source-IO stand-in against a loopback HTTP server started in this
// process (127.0.0.1 only), and the read loop against scripted tables.
#include "ka/download.h"

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <httplib.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "ka/result_codes.h"
#include "net/download.h"
#include "loopback.h"
#include "net/source_io_api.h"

namespace {

using Clock = std::chrono::steady_clock;
using loopback::SetModule;

int64_t MsSince(Clock::time_point from) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - from).count();
}

const std::string& Document() {
    static const std::string doc = [] {
        std::string text(100 * 1024 + 17, '\0');
        for (size_t i = 0; i < text.size(); ++i) text[i] = static_cast<char>((i * 131 + 7) & 0xff);
        return text;
    }();
    return doc;
}

const std::string kLocal = KA_TEST_DATA_DIR "net/local_document.xml";

// The test server: /stall holds its request until the server ends (at most 10 s).
class LoopbackServer : public loopback::Server {
public:
    LoopbackServer()
        : loopback::Server([](httplib::Server& server, const loopback::Server& self) {
              using Req = const httplib::Request&;
              using Res = httplib::Response&;
              server.Get("/doc", [](Req, Res res) { res.set_content(Document(), "text/xml"); });
              server.Get("/dir/doc", [](Req, Res res) { res.set_content("in dir", "text/plain"); });
              server.Get("/redirect", [](Req, Res res) { res.set_redirect("/doc"); });
              server.Get("/to-file", [](Req, Res res) { res.set_redirect("file://" + kLocal); });
              server.Get("/agent", [](Req req, Res res) {
                  res.set_content(req.get_header_value("User-Agent"), "text/plain");
              });
              server.Get("/size/(\\d+)", [](Req req, Res res) {
                  res.set_content(std::string(std::stoul(req.matches[1]), 'v'), "text/plain");
              });
              server.Get("/stall", [&self](Req, Res res) {
                  loopback::Stall(self);
                  res.set_content("late", "text/plain");
              });
          }) {}
};

struct Fetched {
    uint32_t code = 0;
    std::unique_ptr<unsigned char[]> data;
    uint32_t size = 0;
    int64_t ms = 0;
    std::string Text() const {
        return data ? std::string(reinterpret_cast<char*>(data.get()), size) : "";
    }
};

// One call of DownloadToBuffer with its own record and reusable buffer.
struct BufferCall {
    std::unique_ptr<DownloadRecord> record{new DownloadRecord()};
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0, count = 0;
    ~BufferCall() { delete[] buffer; }
    uint32_t Run(SourceIOApi* api, const std::string& url, KA_BOOL* stop = nullptr,
                 KA_BOOL useBase = 0, void* info = nullptr, char* text = nullptr,
                 void* request = nullptr) {
        snprintf(record->url, sizeof(record->url), "%s", url.c_str());
        return DownloadToBuffer(api, request, request, request, request, record.get(), &buffer,
                                &capacity, &count, stop, useBase, info, text);
    }
    std::string Text() const { return std::string(reinterpret_cast<char*>(buffer), count); }
};

// A scripted source-IO module for the read loop and the library's own limits.

// One scripted Read answer: result, bytes delivered, and a delay before answering.
struct Step {
    uint32_t result, bytes, delayMs;
};

struct Script {
    std::vector<Step> steps;
    size_t next = 0;
    uint32_t written = 0;
    uint32_t retryResult = 0;
    uint64_t retryCount = 0;
    int retryQueries = 0;
    uint64_t size = 0;  // what GetSourceSize reports
};
Script* gScript = nullptr;

// Bytes follow one running counter, so misplaced pieces show.
uint32_t ScriptRead(void*, uint8_t* dst, uint32_t wanted, uint32_t* got) {
    if (gScript->next >= gScript->steps.size()) return 0x5eed;
    const Step step = gScript->steps[gScript->next++];
    if (step.delayMs != 0) std::this_thread::sleep_for(std::chrono::milliseconds(step.delayMs));
    *got = step.bytes < wanted ? step.bytes : wanted;
    for (uint32_t i = 0; i < *got; ++i) dst[i] = static_cast<uint8_t>(0xa0 + gScript->written++);
    return step.result;
}

uint32_t ScriptGetParam(void*, uint32_t id, void* value) {
    if (id != ka::kSioRetryCount) return 0x7777;
    ++gScript->retryQueries;
    *static_cast<uint64_t*>(value) = gScript->retryCount;
    return gScript->retryResult;
}

SourceIOApi ScriptTable() {
    SourceIOApi api = {};
    api.Init = [](void** handle, char*, uint32_t, void*) -> uint32_t {
        *handle = gScript;
        return 0;
    };
    api.Uninit = api.Close = [](void*) -> uint32_t { return 0; };
    api.Open = [](void*, uint32_t) -> uint32_t { return 0; };
    api.GetSourceSize = [](void*, uint64_t* size) -> uint32_t {
        *size = gScript->size;
        return 0;
    };
    api.SetParam = [](void*, uint32_t, void*) -> uint32_t { return 0; };
    api.Read = ScriptRead;
    api.GetParam = ScriptGetParam;
    return api;
}

// The stand-in module as the host holds it: loaded once, its module-wide settings reset before
// every test. The library's own loads of the module reach this same loaded object.
class DownloadTest : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        SetModule(ka::kSioConnectTimeoutMs, 0);
        SetModule(ka::kSioTotalTimeoutMs, 0);
        SetModule(ka::kSioMaxRedirects, ka::kSioDefaultMaxRedirects);
        SetModule(ka::kSioAllowFiles, 0);
        api_.SetParam(nullptr, ka::kSioFileBaseDir, nullptr);
    }
    // ka_download_by_url with the built modules.
    static Fetched Fetch(const std::string& url, KA_BOOL* stop = nullptr,
                         std::string workPath = KA_MODULES_DIR) {
        std::string u = url;
        Fetched r;
        unsigned char* data = nullptr;
        const auto start = Clock::now();
        r.code = ka_download_by_url(&u[0], &data, &r.size, &workPath[0], stop);
        r.ms = MsSince(start);
        r.data.reset(data);
        return r;
    }

    static SourceIOApi& api_;
    LoopbackServer server_;
};

SourceIOApi& DownloadTest::api_ = loopback::SourceIo();

TEST_F(DownloadTest, DeliversTheExactBytes) {
    KA_BOOL stop = 0;
    Fetched r = Fetch(server_.Url("/doc"), &stop);
    EXPECT_EQ(0u, r.code);
    EXPECT_EQ(Document(), r.Text());
    // An empty source still reaches the read stage: a zero-length buffer.
    r = Fetch(server_.Url("/size/0"));
    EXPECT_EQ(0u, r.code);
    EXPECT_NE(nullptr, r.data);
    EXPECT_EQ(0u, r.size);
}

TEST_F(DownloadTest, FailuresBeforeTheReadStageLeaveTheOutputsAlone) {
    SetModule(ka::kSioTotalTimeoutMs, 300);
    std::string refused;  // a port nothing listens on any more
    {
        LoopbackServer gone;
        refused = gone.Url("/doc");
    }
    for (const std::string& url :
         {server_.Url("/missing"), refused, server_.Url("/stall"),
          server_.Url("/size/" + std::to_string(ka::kSioMaxBodySize + 1))}) {
        Fetched r = Fetch(url);
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code) << url;
        EXPECT_EQ(nullptr, r.data) << url;
        EXPECT_LT(r.ms, 5000) << url;
        // The stall ends at the module's shortened time limit, not before.
        if (url == server_.Url("/stall")) {
            EXPECT_GE(r.ms, 250);
        }
    }
    unsigned char* data = nullptr;
    uint32_t size = 0;
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(nullptr, &data, &size, nullptr, nullptr));
    // No module in this folder.
    Fetched r = Fetch(server_.Url("/doc"), nullptr, KA_TEST_DATA_DIR "net/");
    EXPECT_EQ(KA_ERR_LOAD_FAILED, r.code);
    EXPECT_EQ(nullptr, r.data);
}

TEST_F(DownloadTest, StopFlagFromAnotherThreadEndsAStalledDownload) {
    KA_BOOL stop = 0;
    std::atomic<int64_t> storedAt{0};
    const auto origin = Clock::now();
    std::thread stopper([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        storedAt = MsSince(origin);
        __atomic_store_n(&stop, 1, __ATOMIC_RELAXED);
    });
    Fetched r = Fetch(server_.Url("/stall"), &stop);
    const int64_t latency = MsSince(origin) - storedAt.load();
    stopper.join();
    printf("stop flag latency: %lld ms from the store to the return\n",
           static_cast<long long>(latency));
    // No size was known: a zero-length buffer and the stopped result.
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    EXPECT_NE(nullptr, r.data);
    EXPECT_EQ(0u, r.size);
    EXPECT_GE(latency, 0);
    EXPECT_LT(latency, 2000);

    // Already set: 1 is the stopped result, 2 stops just the same but reads as success.
    for (KA_BOOL value : {1, 2}) {
        stop = value;
        r = Fetch(server_.Url("/stall"), &stop);
        EXPECT_EQ(value == 1 ? KA_ERR_DOWNLOAD_FAILED : 0u, r.code) << value;
        EXPECT_NE(nullptr, r.data);
        EXPECT_EQ(0u, r.size);
        EXPECT_LT(r.ms, 2000);
    }
}

TEST_F(DownloadTest, FilesOnlyWhenEnabledAndInsideTheBase) {
    for (const std::string& url :
         {"file://" + kLocal, kLocal, std::string("net/x.xml"), std::string("ftp://127.0.0.1:1/x"),
          std::string("gopher://127.0.0.1:1/"), std::string("dict://127.0.0.1:1/x"),
          std::string("data:,abc"), std::string("")}) {
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, Fetch(url).code) << "files off: " << url;
    }

    std::ifstream in(kLocal, std::ios::binary);
    const std::string expected((std::istreambuf_iterator<char>(in)), {});
    ASSERT_FALSE(expected.empty());
    SetModule(ka::kSioAllowFiles, 1);
    api_.SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(KA_TEST_DATA_DIR "net"));
    for (const std::string& url : {"file://" + kLocal, "file://localhost" + kLocal, kLocal,
                                   std::string("local_document.xml")}) {
        Fetched r = Fetch(url);
        EXPECT_EQ(0u, r.code) << url;
        EXPECT_EQ(expected, r.Text()) << url;
    }
    // Relative references stay inside the base; only regular files; no redirect to a file.
    for (const std::string& url :
         {std::string("../net/local_document.xml"), std::string("x/../../net/local_document.xml"),
          std::string("missing.xml"), std::string("file://relative.xml"), std::string("/dev/zero"),
          std::string(KA_TEST_DATA_DIR "net"), server_.Url("/to-file")}) {
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, Fetch(url).code) << "files on: " << url;
    }
}

// ---- DownloadToBuffer and DownloadWithAllocator ----

TEST_F(DownloadTest, ToBufferReportsTheFinalUrlKeepsItsBufferAndJoinsTheBase) {
    BufferCall call;
    ka::SourceResponseInfo info = {};
    EXPECT_EQ(0u, call.Run(&api_, server_.Url("/redirect"), nullptr, 0, &info));
    EXPECT_EQ(server_.Url("/doc"), call.record->finalURL);
    EXPECT_EQ(Document(), call.Text());
    EXPECT_EQ(3 * call.count, call.capacity);
    EXPECT_EQ(call.buffer, call.record->buffer);
    EXPECT_EQ(call.count, call.record->size);
    EXPECT_EQ(call.capacity, call.record->capacity);
    EXPECT_EQ(1u, info.redirects);

    uint8_t* const kept = call.buffer;
    char agent[] = "TestPlayer/2.1";
    int request = 0;
    EXPECT_EQ(0u, call.Run(&api_, server_.Url("/agent"), nullptr, 0, nullptr, agent, &request));
    EXPECT_EQ(kept, call.buffer);
    EXPECT_EQ(3 * Document().size(), call.capacity);
    EXPECT_EQ("TestPlayer/2.1", call.Text());

    snprintf(call.record->baseURL, KA_DOWNLOAD_URL_SIZE, "%s",
             server_.Url("/dir/index.xml?u=a/b").c_str());
    EXPECT_EQ(0u, call.Run(&api_, "doc", nullptr, 1));
    EXPECT_EQ("in dir", call.Text());
    EXPECT_EQ(server_.Url("/dir/doc"), call.record->finalURL);
    // Without the base the reference is used as given, and "doc" is no URL of the module.
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, call.Run(&api_, "doc", nullptr, 0));
}

TEST_F(DownloadTest, ToBufferTakesEightMebibytesAndNoMore) {
    BufferCall call;
    EXPECT_EQ(0u, call.Run(&api_, server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE))));
    EXPECT_EQ(KA_DOWNLOAD_MAX_SIZE, call.count);
    EXPECT_EQ(3 * KA_DOWNLOAD_MAX_SIZE, call.capacity);

    // The stand-in refuses bigger bodies itself; a scripted module reports one byte more.
    Script script;
    script.size = KA_DOWNLOAD_MAX_SIZE + 1;
    gScript = &script;
    SourceIOApi api = ScriptTable();
    BufferCall over;
    EXPECT_EQ(KA_ERR_LOAD_FAILED, over.Run(&api, "http://host/big"));
    EXPECT_EQ(nullptr, over.buffer);
    gScript = nullptr;
}

TEST_F(DownloadTest, ToBufferFailures) {
    BufferCall call;
    for (KA_BOOL value : {1, 2}) {
        // 1 ends in the read as stopped; 2 reads nothing and fails after it.
        KA_BOOL stop = value;
        const auto start = Clock::now();
        EXPECT_EQ(value == 1 ? KA_ERR_DOWNLOAD_FAILED : KA_ERR_LOAD_FAILED,
                  call.Run(&api_, server_.Url("/stall"), &stop));
        EXPECT_LT(MsSince(start), 2000);
    }
    SourceIOApi noInit = api_;
    noInit.Init = nullptr;
    EXPECT_EQ(KA_ERR_DOWNLOAD_OPEN, call.Run(nullptr, server_.Url("/doc")));
    EXPECT_EQ(KA_ERR_DOWNLOAD_OPEN, call.Run(&noInit, server_.Url("/doc")));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT,
              DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, nullptr, &call.buffer,
                               &call.capacity, &call.count, nullptr, 0, nullptr, nullptr));
}

TEST_F(DownloadTest, WithAllocatorFillsTheRecord) {
    uint32_t asked = 0;
    BufferAllocator allocator = {&asked, [](void* context, uint8_t** buffer, uint32_t size) {
                                     *static_cast<uint32_t*>(context) = size;
                                     *buffer = new uint8_t[size + 1];
                                 }};
    std::unique_ptr<DownloadRecord> record(new DownloadRecord());
    snprintf(record->url, sizeof(record->url), "%s", server_.Url("/doc").c_str());
    record->allocator = &allocator;
    EXPECT_EQ(0u, DownloadWithAllocator(&api_, nullptr, nullptr, nullptr, nullptr, record.get(),
                                        nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(3 * Document().size(), asked);
    EXPECT_EQ(asked, record->capacity);
    EXPECT_EQ(Document(), std::string(reinterpret_cast<char*>(record->buffer), record->size));
    EXPECT_EQ(server_.Url("/doc"), record->finalURL);
    delete[] record->buffer;

    record->buffer = nullptr;
    record->allocator = nullptr;
    EXPECT_EQ(KA_ERR_LOAD_FAILED,
              DownloadWithAllocator(&api_, nullptr, nullptr, nullptr, nullptr, record.get(),
                                    nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(nullptr, record->buffer);
}

// ---- ReadSourceData ----

TEST(ReadSourceData, FollowsTheReadRules) {
    constexpr uint64_t kAny = ~0ull;  // no retry limit: the retry count is never asked
    constexpr uint32_t kNoTime = 0xFFFFFFFFu;
    const struct {
        const char* name;
        std::vector<Step> steps;
        uint32_t target, stop;
        uint64_t maxRetries;
        uint32_t timeoutMs, retryResult, retryCount, expected, expectedCount;
        int queries;
    } cases[] = {
        // clang-format off
        {"whole", {{0, 10, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0, 10, 0},
        {"in pieces", {{0, 4, 0}, {0, 6, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0, 10, 0},
        {"not yet, then data", {{2, 0, 0}, {2, 0, 0}, {0, 10, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0, 10, 0},
        {"ends early", {{0, 2, 0}, {1, 3, 0}}, 10, 0, kAny, kNoTime, 0, 0, 1, 5, 0},
        // A failing read's own bytes are not counted.
        {"module failure", {{0, 2, 0}, {0x4242, 3, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0x4242, 2, 0},
        {"nothing wanted", {}, 0, 0, kAny, kNoTime, 0, 0, 0, 0, 0},
        {"nothing wanted, stopped", {}, 0, 1, kAny, kNoTime, 0, 0, KA_ERR_DOWNLOAD_FAILED, 0, 0},
        {"stopped with 1", {{0, 10, 0}}, 10, 1, kAny, kNoTime, 0, 0, KA_ERR_DOWNLOAD_FAILED, 0, 0},
        {"stopped with 2", {{0, 10, 0}}, 10, 2, kAny, kNoTime, 0, 0, 0, 0, 0},
        {"retries within the limit", {{0, 10, 0}}, 10, 0, 3, kNoTime, 0, 3, 0, 10, 1},
        {"retries over the limit", {{0, 10, 0}}, 10, 0, 3, kNoTime, 0, 4, KA_ERR_DOWNLOAD_TIMEOUT, 0, 1},
        {"retry limit 0 asks nothing", {{0, 10, 0}}, 10, 0, 0, kNoTime, 0, 5, 0, 10, 0},
        // A failed query counts as one retry; a last query answering 1 ends with 1.
        {"retry query failing", {{0, 10, 0}}, 10, 0, 3, kNoTime, 9, 5, 0, 10, 1},
        {"retry query answering 1", {{0, 10, 0}}, 10, 0, 3, kNoTime, 1, 0, 1, 10, 1},
        // Past the time limit the bytes of the late read are counted.
        {"past the time limit", {{0, 4, 30}, {0, 6, 0}}, 10, 0, kAny, 10, 0, 0, KA_ERR_DOWNLOAD_TIMEOUT, 4, 0},
        // clang-format on
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.name);
        Script script;
        script.steps = c.steps;
        script.retryResult = c.retryResult;
        script.retryCount = c.retryCount;
        gScript = &script;
        SourceIOApi api = ScriptTable();
        std::vector<uint8_t> buffer(c.target + 1, 0);
        uint32_t count = c.target;
        KA_BOOL stop = static_cast<KA_BOOL>(c.stop);
        EXPECT_EQ(c.expected,
                  ReadSourceData(&api, &script, buffer.data(), &count,
                                 c.stop == 0 ? nullptr : &stop, c.maxRetries, c.timeoutMs));
        EXPECT_EQ(c.expectedCount, count);
        EXPECT_EQ(c.queries, script.retryQueries);
        // Each piece lands behind the previous one.
        for (uint32_t i = 0; i < count; ++i) ASSERT_EQ(static_cast<uint8_t>(0xa0 + i), buffer[i]);
        gScript = nullptr;
    }
}

}  // namespace
