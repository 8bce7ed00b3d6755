// Downloads through the real source-IO stand-in against a loopback HTTP server started in this
// process (127.0.0.1 only), and the read loop against a scripted module.
#include "ka/download.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "ka/result_codes.h"
#include "loopback.h"
#include "net/download.h"
#include "source_io_api.h"

namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;
using loopback::SetModule;

int64_t MsSince(Clock::time_point from) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - from).count();
}

// Every byte value, zero included.
const std::string kDocument = [] {
    std::string text(100 * 1024 + 17, '\0');
    for (size_t i = 0; i < text.size(); ++i) text[i] = static_cast<char>((i * 131 + 7) & 0xff);
    return text;
}();
const std::string kLocal = KA_TEST_DATA_DIR "net/local_document.xml";

// ka_download_by_url with the modules of workPath: its code, "<none>" when it gave no buffer or
// else the bytes, and the time it took.
struct Fetched {
    uint32_t code = 0;
    std::string text;
    int64_t ms = 0;
};
Fetched Fetch(std::string url, KA_BOOL* stop = nullptr, std::string workPath = KA_MODULES_DIR) {
    Fetched r;
    unsigned char* data = nullptr;
    uint32_t size = 0;
    const auto start = Clock::now();
    r.code = ka_download_by_url(&url[0], &data, &size, &workPath[0], stop);
    r.ms = MsSince(start);
    r.text = data != nullptr ? std::string(reinterpret_cast<char*>(data), size) : "<none>";
    delete[] data;
    return r;
}

// DownloadToBuffer calls sharing one record and one reusable buffer.
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

// A scripted module: each Read answers with a step's result and bytes after its delay; the bytes
// follow one running counter, so misplaced pieces show.
struct Step {
    uint32_t result, bytes, delayMs;
};
struct Script {
    std::vector<Step> steps;
    size_t next = 0;
    uint32_t written = 0, retryResult = 0;
    uint64_t retryCount = 0, size = 0;  // size: what GetSourceSize reports
    int retryQueries = 0;
};
Script* gScript = nullptr;

SourceIOApi ScriptTable(Script* script) {
    gScript = script;
    SourceIOApi api = {};
    api.Init = [](void** handle, char*, uint32_t, void*) { return *handle = gScript, 0u; };
    api.Uninit = api.Close = [](void*) { return 0u; };
    api.Open = [](void*, uint32_t) { return 0u; };
    api.SetParam = [](void*, uint32_t, void*) { return 0u; };
    api.GetSourceSize = [](void*, uint64_t* size) { return *size = gScript->size, 0u; };
    api.Read = [](void*, uint8_t* dst, uint32_t wanted, uint32_t* got) -> uint32_t {
        if (gScript->next >= gScript->steps.size()) return 0x5eed;
        const Step step = gScript->steps[gScript->next++];
        std::this_thread::sleep_for(std::chrono::milliseconds(step.delayMs));
        *got = std::min(step.bytes, wanted);
        for (uint32_t i = 0; i < *got; ++i)
            dst[i] = static_cast<uint8_t>(0xa0 + gScript->written++);
        return step.result;
    };
    api.GetParam = [](void*, uint32_t id, void* value) -> uint32_t {
        if (id != ka::kSioRetryCount) return 0x7777;
        ++gScript->retryQueries;
        *static_cast<uint64_t*>(value) = gScript->retryCount;
        return gScript->retryResult;
    };
    return api;
}

// The stand-in's module-wide settings the tests change are reset before every test.
class DownloadTest : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(server_.Running());
        server_.Put("doc", kDocument);
        server_.Put("dir/doc", "in dir");
        SetModule(ka::kSioTotalTimeoutMs, 0);
        SetModule(ka::kSioAllowFiles, 0);
        api_.SetParam(nullptr, ka::kSioFileBaseDir, nullptr);
    }
    SourceIOApi& api_ = loopback::SourceIo();
    loopback::Server server_;
};

TEST_F(DownloadTest, ByUrl) {
    // Failures before the read stage give no buffer; once there, a buffer comes back.
    const std::string none = "<none>", big = std::to_string(ka::kSioMaxBodySize + 1);
    // URLs of 2047 characters (the longest that fits) and 2048, which cut would be the first.
    const std::string name(KA_DOWNLOAD_URL_SIZE - 1 - server_.Url("/d/").size(), 'n');
    const std::string fits = server_.Put(name, "fits"), over = server_.Put(name + "n", "over");
    const struct {
        std::string url;
        KA_BOOL stop;
        uint32_t code;
        std::string text;
        uint32_t totalTimeoutMs = 0;  // 0: the module's default
        const char* workPath = KA_MODULES_DIR;
    } cases[] = {
        {server_.Url("/d/doc"), 0, 0, kDocument},
        {server_.Url("/size/0"), 0, 0, ""},
        {server_.Url("/d/missing"), 0, KA_ERR_DOWNLOAD_FAILED, none},
        {loopback::RefusedUrl(), 0, KA_ERR_DOWNLOAD_FAILED, none},
        {server_.Url("/size/" + big), 0, KA_ERR_DOWNLOAD_FAILED, none},
        {server_.Url("/stall"), 0, KA_ERR_DOWNLOAD_FAILED, none, 300},
        {server_.Url("/d/doc"), 0, KA_ERR_LOAD_FAILED, none, 0, KA_TEST_DATA_DIR "net/"},
        {fits, 0, 0, "fits"},
        {over, 0, KA_ERR_DOWNLOAD_FAILED, none},
        // Stopped with no size known: a zero-length buffer. 2 stops as 1 does but reads as success.
        {server_.Url("/stall"), 1, KA_ERR_DOWNLOAD_FAILED, ""},
        {server_.Url("/stall"), 2, 0, ""},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.url.substr(0, 80) + " stop " + std::to_string(c.stop) + " " + c.workPath);
        SetModule(ka::kSioTotalTimeoutMs, c.totalTimeoutMs);
        KA_BOOL stop = c.stop;
        Fetched r = Fetch(c.url, &stop, c.workPath);
        EXPECT_EQ(c.code, r.code);
        EXPECT_EQ(c.text, r.text);
        EXPECT_GE(r.ms + 50, c.totalTimeoutMs);  // at the module's time limit, not before
        EXPECT_LT(r.ms, 2000 + c.totalTimeoutMs);
    }
    unsigned char* data = nullptr;
    uint32_t size = 0;
    std::string url = server_.Url("/d/doc");
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(nullptr, &data, &size, nullptr, nullptr));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(&url[0], nullptr, &size, nullptr, nullptr));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(&url[0], &data, nullptr, nullptr, nullptr));
}

TEST_F(DownloadTest, FilesOnlyWhenEnabledAndInsideTheBase) {
    // base/ holds the document, a symlink to it and a symlink leading out; base2/ shares the
    // base's name as a prefix.
    char pattern[] = "/tmp/ka_sio_XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    const std::string tmp = pattern, base = tmp + "/base", in = base + "/local_document.xml";
    fs::create_directories(base);
    fs::create_directories(tmp + "/base2");
    fs::copy_file(kLocal, in);
    fs::copy_file(kLocal, tmp + "/base2/local_document.xml");
    fs::copy_file(kLocal, tmp + "/outside.xml");
    fs::create_symlink("local_document.xml", base + "/alias.xml");
    fs::create_symlink(tmp + "/outside.xml", base + "/escape.xml");
    std::ifstream stream(kLocal, std::ios::binary);
    const std::string local((std::istreambuf_iterator<char>(stream)), {});
    ASSERT_FALSE(local.empty());
    const std::string toFile = server_.Url("/redirect?to=file://" + in);
    // {URL, read when files are allowed}
    const struct {
        std::string url;
        bool readable;
    } cases[] = {{"file://" + in, true},
                 {"file://localhost" + in, true},
                 {in, true},
                 {"local_document.xml", true},
                 {"alias.xml", true},  // a symlink that stays inside
                 // Outside the base: absolute, as a file URL, climbing out, through a symlink, in a
                 // sibling whose name starts with the base's.
                 {tmp + "/outside.xml", false},
                 {"file://" + tmp + "/outside.xml", false},
                 {"file://" + base + "/../outside.xml", false},
                 {"escape.xml", false},
                 {tmp + "/base2/local_document.xml", false},
                 {kLocal, false},
                 // Relative references never climb; only regular files; no redirect to a file.
                 {"../base/local_document.xml", false},
                 {"x/../../base/local_document.xml", false},
                 {"net/x.xml", false},
                 {"missing.xml", false},
                 {"file://relative.xml", false},
                 {"/dev/zero", false},
                 {base, false},
                 {toFile, false},
                 {"data:,abc", false},
                 {"", false},
                 {"ftp://127.0.0.1:1/x", false},
                 {"gopher://127.0.0.1:1/", false},
                 {"dict://127.0.0.1:1/x", false}};
    for (bool allowed : {false, true}) {
        SetModule(ka::kSioAllowFiles, allowed);
        api_.SetParam(nullptr, ka::kSioFileBaseDir,
                      allowed ? const_cast<char*>(base.c_str()) : nullptr);
        for (const auto& c : cases) {
            const bool readable = allowed && c.readable;
            Fetched r = Fetch(c.url);
            EXPECT_EQ(readable ? 0u : KA_ERR_DOWNLOAD_FAILED, r.code) << c.url << " " << allowed;
            EXPECT_TRUE(!readable || local == r.text) << c.url;
        }
    }
    fs::remove_all(tmp);
}

TEST_F(DownloadTest, ToBufferReportsTheFinalUrlKeepsItsBufferAndJoinsTheBase) {
    BufferCall call;
    ka::SourceResponseInfo info = {};
    EXPECT_EQ(0u, call.Run(&api_, server_.Url("/redirect?to=/d/doc"), nullptr, 0, &info));
    EXPECT_EQ(server_.Url("/d/doc"), call.record->finalURL);
    EXPECT_EQ(1u, info.redirects);
    EXPECT_EQ(kDocument, call.Text());
    EXPECT_EQ(3 * call.count, call.capacity);
    EXPECT_EQ(call.buffer, call.record->buffer);
    EXPECT_EQ(call.count, call.record->size);
    EXPECT_EQ(call.capacity, call.record->capacity);

    // A smaller document reuses the buffer; the host's text is the User-Agent.
    uint8_t* const kept = call.buffer;
    char agent[] = "TestPlayer/2.1";
    int request = 0;
    EXPECT_EQ(0u, call.Run(&api_, server_.Url("/agent"), nullptr, 0, nullptr, agent, &request));
    EXPECT_EQ(kept, call.buffer);
    EXPECT_EQ(3 * kDocument.size(), call.capacity);
    EXPECT_EQ("TestPlayer/2.1", call.Text());

    snprintf(call.record->baseURL, KA_DOWNLOAD_URL_SIZE, "%s",
             server_.Url("/d/dir/index.xml?u=a/b").c_str());
    EXPECT_EQ(0u, call.Run(&api_, "doc", nullptr, 1));
    EXPECT_EQ("in dir", call.Text());
    EXPECT_EQ(server_.Url("/d/dir/doc"), call.record->finalURL);
    // Without the base the reference is used as given, and "doc" is no URL of the module.
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, call.Run(&api_, "doc", nullptr, 0));

    // A reference that, joined to its base, takes 2048 characters fails; cut, it would be the
    // 2047-character URL that the reference one character shorter reaches.
    const std::string dir(1900, 'd'), prefix = server_.Url("/d/" + dir + "/");
    const std::string ref(KA_DOWNLOAD_URL_SIZE - prefix.size(), 'r');
    server_.Put(dir + "/" + ref.substr(1), "fits");
    snprintf(call.record->baseURL, KA_DOWNLOAD_URL_SIZE, "%s", (prefix + "index.xml").c_str());
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, call.Run(&api_, ref, nullptr, 1));
    EXPECT_EQ(0u, call.Run(&api_, ref.substr(1), nullptr, 1));
    EXPECT_EQ("fits", call.Text());
}

TEST_F(DownloadTest, ToBufferLimitsAndFailures) {
    BufferCall call;
    EXPECT_EQ(0u, call.Run(&api_, server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE))));
    EXPECT_EQ(KA_DOWNLOAD_MAX_SIZE, call.count);
    EXPECT_EQ(3 * KA_DOWNLOAD_MAX_SIZE, call.capacity);
    // The stand-in refuses bigger bodies itself; a scripted module reports one byte more.
    Script script;
    script.size = KA_DOWNLOAD_MAX_SIZE + 1;
    SourceIOApi scripted = ScriptTable(&script);
    BufferCall over;
    EXPECT_EQ(KA_ERR_LOAD_FAILED, over.Run(&scripted, "http://host/big"));
    EXPECT_EQ(nullptr, over.buffer);

    // Stop flag 1 ends in the read as stopped; 2 reads nothing and fails after it.
    for (KA_BOOL stop : {1, 2}) {
        const auto start = Clock::now();
        EXPECT_EQ(stop == 1 ? KA_ERR_DOWNLOAD_FAILED : KA_ERR_LOAD_FAILED,
                  call.Run(&api_, server_.Url("/stall"), &stop));
        EXPECT_LT(MsSince(start), 2000);
    }
    SourceIOApi noInit = api_;
    noInit.Init = nullptr;
    EXPECT_EQ(KA_ERR_DOWNLOAD_OPEN, call.Run(nullptr, server_.Url("/d/doc")));
    EXPECT_EQ(KA_ERR_DOWNLOAD_OPEN, call.Run(&noInit, server_.Url("/d/doc")));
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
    snprintf(record->url, sizeof(record->url), "%s", server_.Url("/d/doc").c_str());
    auto download = [&] {
        return DownloadWithAllocator(&api_, nullptr, nullptr, nullptr, nullptr, record.get(),
                                     nullptr, 0, nullptr, nullptr);
    };
    record->allocator = &allocator;
    EXPECT_EQ(0u, download());
    EXPECT_EQ(3 * kDocument.size(), asked);
    EXPECT_EQ(asked, record->capacity);
    EXPECT_EQ(kDocument, std::string(reinterpret_cast<char*>(record->buffer), record->size));
    EXPECT_EQ(server_.Url("/d/doc"), record->finalURL);
    delete[] record->buffer;
    record->buffer = nullptr;
    record->allocator = nullptr;  // no allocator: no buffer
    EXPECT_EQ(KA_ERR_LOAD_FAILED, download());
    EXPECT_EQ(nullptr, record->buffer);
}

TEST(ReadSourceData, FollowsTheReadRules) {
    constexpr uint64_t kAny = ~0ull;  // no retry limit: the retry count is never asked
    constexpr uint32_t kNoTime = 0xFFFFFFFFu;
    const struct {
        std::vector<Step> steps;
        uint32_t target, stop;
        uint64_t maxRetries;
        uint32_t timeoutMs, retryResult, retryCount, expected, expectedCount;
        int queries;
    } cases[] = {
        // clang-format off
        {{{0, 4, 0}, {0, 6, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0, 10, 0},
        {{{2, 0, 0}, {2, 0, 0}, {0, 10, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0, 10, 0},  // not ready yet
        {{{0, 2, 0}, {1, 3, 0}}, 10, 0, kAny, kNoTime, 0, 0, 1, 5, 0},  // the source ends early
        // A failing read's own bytes are not counted.
        {{{0, 2, 0}, {0x4242, 3, 0}}, 10, 0, kAny, kNoTime, 0, 0, 0x4242, 2, 0},
        {{}, 0, 0, kAny, kNoTime, 0, 0, 0, 0, 0},
        {{{0, 10, 0}}, 10, 1, kAny, kNoTime, 0, 0, KA_ERR_DOWNLOAD_FAILED, 0, 0},
        {{{0, 10, 0}}, 10, 2, kAny, kNoTime, 0, 0, 0, 0, 0},
        {{{0, 10, 0}}, 10, 0, 3, kNoTime, 0, 3, 0, 10, 1},  // retries within the limit
        {{{0, 10, 0}}, 10, 0, 3, kNoTime, 0, 4, KA_ERR_DOWNLOAD_TIMEOUT, 0, 1},
        {{{0, 10, 0}}, 10, 0, 0, kNoTime, 0, 5, 0, 10, 0},  // retry limit 0 asks nothing
        // A failed query counts as one retry; a last query answering 1 ends with 1.
        {{{0, 10, 0}}, 10, 0, 3, kNoTime, 9, 5, 0, 10, 1},
        {{{0, 10, 0}}, 10, 0, 3, kNoTime, 1, 0, 1, 10, 1},
        // Past the time limit the bytes of the late read are counted.
        {{{0, 4, 30}, {0, 6, 0}}, 10, 0, kAny, 10, 0, 0, KA_ERR_DOWNLOAD_TIMEOUT, 4, 0},
        // clang-format on
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(&c - cases);
        Script script;
        script.steps = c.steps;
        script.retryResult = c.retryResult;
        script.retryCount = c.retryCount;
        SourceIOApi api = ScriptTable(&script);
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
    }
}

}  // namespace
