// Downloads through the real source-IO stand-in against a loopback HTTP server started in this
// process (127.0.0.1 only), and the read loop against scripted tables.
#include "ka/download.h"

#include <arpa/inet.h>
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <httplib.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ka/result_codes.h"
#include "net/download.h"
#include "net/source_io_api.h"

namespace {

using Clock = std::chrono::steady_clock;

int64_t MsBetween(Clock::time_point from, Clock::time_point to) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(to - from).count();
}

std::string Pattern(size_t size) {
    std::string text(size, '\0');
    for (size_t i = 0; i < size; ++i) text[i] = static_cast<char>((i * 131 + 7) & 0xff);
    return text;
}

const std::string& Document() {
    static const std::string doc = Pattern(100 * 1024 + 17);
    return doc;
}

// An HTTP server on 127.0.0.1 with a fixed set of routes; stalled requests are held until the
// test ends or ten seconds pass, whichever comes first.
class LoopbackServer {
  public:
    LoopbackServer() {
        server_.Get("/doc", [](const httplib::Request&, httplib::Response& res) {
            res.set_content(Document(), "application/xml");
        });
        server_.Get("/dir/doc", [](const httplib::Request&, httplib::Response& res) {
            res.set_content("in the directory", "text/plain");
        });
        server_.Get("/empty", [](const httplib::Request&, httplib::Response& res) {
            res.set_content("", "text/plain");
        });
        server_.Get("/status/(\\d+)", [](const httplib::Request& req, httplib::Response& res) {
            res.status = std::stoi(req.matches[1]);
            res.set_content("error page", "text/plain");
        });
        server_.Get("/stall", [this](const httplib::Request&, httplib::Response& res) {
            std::unique_lock<std::mutex> lock(mutex_);
            released_.wait_for(lock, std::chrono::seconds(10), [this] { return release_; });
            res.set_content("late", "text/plain");
        });
        server_.Get("/size/(\\d+)", [](const httplib::Request& req, httplib::Response& res) {
            res.set_content(std::string(std::stoul(req.matches[1]), 'v'), "text/plain");
        });
        server_.Get("/redirect", [](const httplib::Request&, httplib::Response& res) {
            res.set_redirect("/doc");
        });
        server_.Get("/hop/(\\d+)", [](const httplib::Request& req, httplib::Response& res) {
            const int left = std::stoi(req.matches[1]);
            res.set_redirect(left == 0 ? "/dir/doc" : "/hop/" + std::to_string(left - 1));
        });
        server_.Get("/to-file", [](const httplib::Request&, httplib::Response& res) {
            res.set_redirect("file://" KA_TEST_DATA_DIR "net/local_document.xml");
        });
        server_.Get("/agent", [](const httplib::Request& req, httplib::Response& res) {
            res.set_content(req.get_header_value("User-Agent"), "text/plain");
        });

        port_ = server_.bind_to_any_port("127.0.0.1");
        if (port_ > 0) {
            thread_ = std::thread([this] { server_.listen_after_bind(); });
            // stop() only reaches a server that is already running.
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

  private:
    httplib::Server server_;
    std::thread thread_;
    int port_ = -1;
    std::mutex mutex_;
    std::condition_variable released_;
    bool release_ = false;
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

// The stand-in module as the host holds it: loaded once, its module-wide settings reset before
// every test. The library's own loads of the module reach this same loaded object.
class DownloadTest : public ::testing::Test {
  protected:
    static void SetUpTestSuite() {
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
        SetModule(ka::kSioMaxRedirects, ka::kSioDefaultMaxRedirects);
        SetModule(ka::kSioAllowFiles, 0);
        api_.SetParam(nullptr, ka::kSioFileBaseDir, nullptr);
    }

    static void SetModule(uint32_t id, uint32_t value) {
        ASSERT_EQ(0u, api_.SetParam(nullptr, id, &value));
    }

    struct Result {
        uint32_t code = 0;
        unsigned char* data = nullptr;
        uint32_t size = 0;
        int64_t ms = 0;
        std::string Text() const {
            return data == nullptr ? std::string()
                                   : std::string(reinterpret_cast<char*>(data), size);
        }
    };

    // ka_download_by_url with the built modules; the buffer is released by the Result's owner.
    static Result Fetch(const std::string& url, KA_BOOL* stop = nullptr,
                        const char* workPath = KA_MODULES_DIR) {
        std::vector<char> u(url.begin(), url.end());
        u.push_back('\0');
        std::string path = workPath;
        Result r;
        const auto start = Clock::now();
        r.code = ka_download_by_url(u.data(), &r.data, &r.size, &path[0], stop);
        r.ms = MsBetween(start, Clock::now());
        return r;
    }

    static void Release(Result* r) {
        delete[] r->data;
        r->data = nullptr;
    }

    static DownloadRecord* NewRecord(const std::string& url, const std::string& base = "") {
        auto* record = new DownloadRecord();
        snprintf(record->url, sizeof(record->url), "%s", url.c_str());
        snprintf(record->baseURL, sizeof(record->baseURL), "%s", base.c_str());
        return record;
    }

    static void* module_;
    static SourceIOApi api_;
    LoopbackServer server_;
};

void* DownloadTest::module_ = nullptr;
SourceIOApi DownloadTest::api_;

// ---- ka_download_by_url ----

TEST_F(DownloadTest, DeliversTheExactBytes) {
    KA_BOOL stop = 0;
    Result r = Fetch(server_.Url("/doc"), &stop);
    EXPECT_EQ(0u, r.code);
    ASSERT_EQ(Document().size(), r.size);
    EXPECT_EQ(Document(), r.Text());
    Release(&r);
}

TEST_F(DownloadTest, EmptyBodyGivesAnEmptyBuffer) {
    Result r = Fetch(server_.Url("/empty"));
    EXPECT_EQ(0u, r.code);
    EXPECT_NE(nullptr, r.data);
    EXPECT_EQ(0u, r.size);
    Release(&r);
}

TEST_F(DownloadTest, HttpErrorsFailBeforeTheReadStage) {
    for (int status : {400, 403, 404, 410, 500, 503}) {
        Result r = Fetch(server_.Url("/status/" + std::to_string(status)));
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code) << status;
        EXPECT_EQ(nullptr, r.data) << status;
        EXPECT_EQ(0u, r.size) << status;
        Release(&r);
    }
}

TEST_F(DownloadTest, UnknownPathIsAFailure) {
    Result r = Fetch(server_.Url("/nothing/here"));
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    Release(&r);
}

TEST_F(DownloadTest, ConnectionRefusedFailsQuickly) {
    const int port = ClosedPort();
    ASSERT_GT(port, 0);
    Result r = Fetch("http://127.0.0.1:" + std::to_string(port) + "/doc");
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    EXPECT_EQ(nullptr, r.data);
    EXPECT_LT(r.ms, 5000);
}

TEST_F(DownloadTest, StalledServerEndsAtTheModulesTimeLimit) {
    SetModule(ka::kSioTotalTimeoutMs, 300);
    Result r = Fetch(server_.Url("/stall"));
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    EXPECT_GE(r.ms, 250);
    EXPECT_LT(r.ms, 5000);
    Release(&r);
}

TEST_F(DownloadTest, BodyOverTheCapFails) {
    Result r = Fetch(server_.Url("/size/" + std::to_string(ka::kSioMaxBodySize + 1)));
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    EXPECT_EQ(nullptr, r.data);
    Release(&r);

    r = Fetch(server_.Url("/size/" + std::to_string(ka::kSioMaxBodySize)));
    EXPECT_EQ(0u, r.code);
    EXPECT_EQ(ka::kSioMaxBodySize, r.size);
    Release(&r);
}

TEST_F(DownloadTest, RedirectsAreFollowedUpToTheLimit) {
    Result r = Fetch(server_.Url("/redirect"));
    EXPECT_EQ(0u, r.code);
    EXPECT_EQ(Document(), r.Text());
    Release(&r);

    r = Fetch(server_.Url("/hop/4"));  // five redirects
    EXPECT_EQ(0u, r.code);
    EXPECT_EQ("in the directory", r.Text());
    Release(&r);

    r = Fetch(server_.Url("/hop/5"));  // six
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    Release(&r);

    SetModule(ka::kSioMaxRedirects, 0);
    r = Fetch(server_.Url("/redirect"));
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    Release(&r);
}

TEST_F(DownloadTest, StopFlagFromAnotherThreadEndsAStalledDownload) {
    KA_BOOL stop = 0;
    std::atomic<int64_t> storedAt{0};
    const auto origin = Clock::now();
    std::thread stopper([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        storedAt = MsBetween(origin, Clock::now());
        __atomic_store_n(&stop, 1, __ATOMIC_RELAXED);
    });
    std::vector<char> url;
    const std::string text = server_.Url("/stall");
    url.assign(text.begin(), text.end());
    url.push_back('\0');
    std::string path = KA_MODULES_DIR;
    unsigned char* data = nullptr;
    uint32_t size = 0;
    const uint32_t code = ka_download_by_url(url.data(), &data, &size, &path[0], &stop);
    const int64_t returnedAt = MsBetween(origin, Clock::now());
    stopper.join();

    const int64_t latency = returnedAt - storedAt.load();
    printf("stop flag latency: %lld ms from the store to the return\n",
           static_cast<long long>(latency));
    // No size was known: a zero-length buffer and the stopped result.
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, code);
    EXPECT_NE(nullptr, data);
    EXPECT_EQ(0u, size);
    EXPECT_GE(latency, 0);
    EXPECT_LT(latency, 2000);
    delete[] data;
}

TEST_F(DownloadTest, StopFlagAlreadySetSkipsTheWait) {
    KA_BOOL stop = 1;
    Result r = Fetch(server_.Url("/stall"), &stop);
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    EXPECT_EQ(0u, r.size);
    EXPECT_LT(r.ms, 2000);
    Release(&r);

    // A flag of 2 stops the wait just the same but is not the stopping value.
    stop = 2;
    r = Fetch(server_.Url("/stall"), &stop);
    EXPECT_EQ(0u, r.code);
    EXPECT_EQ(0u, r.size);
    Release(&r);
}

TEST_F(DownloadTest, OnlyHttpAndHttpsByDefault) {
    const std::string local = KA_TEST_DATA_DIR "net/local_document.xml";
    for (const std::string& url :
         {"file://" + local, local, std::string("net/local_document.xml"),
          std::string("ftp://127.0.0.1:1/x"), std::string("gopher://127.0.0.1:1/"),
          std::string("dict://127.0.0.1:1/x"), std::string("data:text/plain,abc"),
          std::string("")}) {
        Result r = Fetch(url);
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code) << url;
        EXPECT_EQ(nullptr, r.data) << url;
        Release(&r);
    }
}

TEST_F(DownloadTest, FilesWhenEnabledModuleWide) {
    std::ifstream in(KA_TEST_DATA_DIR "net/local_document.xml", std::ios::binary);
    const std::string expected((std::istreambuf_iterator<char>(in)), {});
    ASSERT_FALSE(expected.empty());
    SetModule(ka::kSioAllowFiles, 1);

    const std::string local = KA_TEST_DATA_DIR "net/local_document.xml";
    for (const std::string& url : {"file://" + local, "file://localhost" + local, local}) {
        Result r = Fetch(url);
        EXPECT_EQ(0u, r.code) << url;
        EXPECT_EQ(expected, r.Text()) << url;
        Release(&r);
    }

    // Relative references are read against the base directory, and stay inside it.
    api_.SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(KA_TEST_DATA_DIR "net"));
    Result r = Fetch("local_document.xml");
    EXPECT_EQ(0u, r.code);
    EXPECT_EQ(expected, r.Text());
    Release(&r);
    for (const char* url : {"../net/local_document.xml", "x/../../net/local_document.xml",
                            "missing.xml", "file://relative.xml", "ftp://127.0.0.1:1/x"}) {
        r = Fetch(url);
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code) << url;
        Release(&r);
    }
    // Only regular files: no devices, no directories.
    for (const char* url : {"/dev/zero", "/dev/null", KA_TEST_DATA_DIR "net"}) {
        r = Fetch(url);
        EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code) << url;
        Release(&r);
    }
    // A server cannot send the module to a local file.
    r = Fetch(server_.Url("/to-file"));
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED, r.code);
    Release(&r);
}

TEST_F(DownloadTest, ArgumentAndModuleFailures) {
    std::string path = KA_MODULES_DIR;
    unsigned char* data = nullptr;
    uint32_t size = 0;
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(nullptr, &data, &size, &path[0], nullptr));

    // No module service and no module in this folder.
    Result r = Fetch(server_.Url("/doc"), nullptr, KA_TEST_DATA_DIR "net/");
    EXPECT_EQ(KA_ERR_LOAD_FAILED, r.code);
    EXPECT_EQ(nullptr, r.data);
}

// ---- DownloadToBuffer and DownloadWithAllocator ----

TEST_F(DownloadTest, ToBufferReportsTheFinalUrlAfterRedirects) {
    DownloadRecord* record = NewRecord(server_.Url("/redirect"));
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0;
    uint32_t count = 0;
    ka::SourceResponseInfo info = {};
    EXPECT_EQ(0u, DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                                   &capacity, &count, nullptr, 0, &info, nullptr));
    EXPECT_EQ(server_.Url("/doc"), record->finalURL);
    ASSERT_EQ(Document().size(), count);
    EXPECT_EQ(Document(), std::string(reinterpret_cast<char*>(buffer), count));
    EXPECT_EQ(3 * count, capacity);
    EXPECT_EQ(buffer, record->buffer);
    EXPECT_EQ(count, record->size);
    EXPECT_EQ(capacity, record->capacity);
    EXPECT_EQ(200u, info.httpStatus);
    EXPECT_EQ(1u, info.redirects);
    EXPECT_EQ(Document().size(), info.bodySize);

    // A buffer large enough is kept.
    uint8_t* const kept = buffer;
    snprintf(record->url, sizeof(record->url), "%s", server_.Url("/dir/doc").c_str());
    EXPECT_EQ(0u, DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                                   &capacity, &count, nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(kept, buffer);
    EXPECT_EQ(3 * Document().size(), capacity);
    EXPECT_EQ("in the directory", std::string(reinterpret_cast<char*>(buffer), count));
    EXPECT_EQ(server_.Url("/dir/doc"), record->finalURL);
    delete[] buffer;
    delete record;
}

TEST_F(DownloadTest, ToBufferJoinsTheBaseOnlyWhenAsked) {
    DownloadRecord* record = NewRecord("doc", server_.Url("/dir/index.xml?u=a/b"));
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0;
    uint32_t count = 0;
    EXPECT_EQ(0u, DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                                   &capacity, &count, nullptr, 1, nullptr, nullptr));
    EXPECT_EQ("in the directory", std::string(reinterpret_cast<char*>(buffer), count));
    EXPECT_EQ(server_.Url("/dir/doc"), record->finalURL);

    // Without the base the reference is used as given, and "doc" is no http URL.
    EXPECT_EQ(KA_ERR_DOWNLOAD_FAILED,
              DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                               &capacity, &count, nullptr, 0, nullptr, nullptr));
    delete[] buffer;
    delete record;
}

TEST_F(DownloadTest, ToBufferPassesTheHostsText) {
    DownloadRecord* record = NewRecord(server_.Url("/agent"));
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0;
    uint32_t count = 0;
    int request = 0;
    char agent[] = "TestPlayer/2.1";
    EXPECT_EQ(0u, DownloadToBuffer(&api_, &request, &request, &request, &request, record, &buffer,
                                   &capacity, &count, nullptr, 0, nullptr, agent));
    EXPECT_EQ("TestPlayer/2.1", std::string(reinterpret_cast<char*>(buffer), count));
    delete[] buffer;
    delete record;
}

TEST_F(DownloadTest, ToBufferSizeLimits) {
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0;
    uint32_t count = 0;
    DownloadRecord* record =
        NewRecord(server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE)));
    EXPECT_EQ(0u, DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                                   &capacity, &count, nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(KA_DOWNLOAD_MAX_SIZE, count);
    EXPECT_EQ(3 * KA_DOWNLOAD_MAX_SIZE, capacity);

    snprintf(record->url, sizeof(record->url), "%s",
             server_.Url("/size/" + std::to_string(KA_DOWNLOAD_MAX_SIZE + 1)).c_str());
    EXPECT_NE(0u, DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                                   &capacity, &count, nullptr, 0, nullptr, nullptr));
    delete[] buffer;
    delete record;
}

TEST_F(DownloadTest, ToBufferStoppedIsAFailureWhateverTheFlagsValue) {
    for (KA_BOOL value : {1, 2}) {
        KA_BOOL stop = value;
        DownloadRecord* record = NewRecord(server_.Url("/stall"));
        uint8_t* buffer = nullptr;
        uint32_t capacity = 0;
        uint32_t count = 0;
        const auto start = Clock::now();
        const uint32_t code =
            DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, record, &buffer, &capacity,
                             &count, &stop, 0, nullptr, nullptr);
        // 1 ends in the read as stopped; 2 reads nothing and fails after it.
        EXPECT_EQ(value == 1 ? KA_ERR_DOWNLOAD_FAILED : KA_ERR_LOAD_FAILED, code);
        EXPECT_LT(MsBetween(start, Clock::now()), 2000);
        delete[] buffer;
        delete record;
    }
}

TEST_F(DownloadTest, ToBufferArgumentFailures) {
    DownloadRecord* record = NewRecord(server_.Url("/doc"));
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0;
    uint32_t count = 0;
    EXPECT_EQ(KA_ERR_DOWNLOAD_OPEN,
              DownloadToBuffer(nullptr, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                               &capacity, &count, nullptr, 0, nullptr, nullptr));
    SourceIOApi noInit = api_;
    noInit.Init = nullptr;
    EXPECT_EQ(KA_ERR_DOWNLOAD_OPEN,
              DownloadToBuffer(&noInit, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                               &capacity, &count, nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT,
              DownloadToBuffer(&api_, nullptr, nullptr, nullptr, nullptr, nullptr, &buffer,
                               &capacity, &count, nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(nullptr, buffer);
    delete record;
}

struct CountingAllocator {
    int calls = 0;
    uint32_t lastSize = 0;
    static void Allocate(void* context, uint8_t** buffer, uint32_t size) {
        auto* self = static_cast<CountingAllocator*>(context);
        ++self->calls;
        self->lastSize = size;
        *buffer = new uint8_t[size == 0 ? 1 : size];
    }
};

TEST_F(DownloadTest, WithAllocatorFillsTheRecord) {
    CountingAllocator counting;
    BufferAllocator allocator = {&counting, CountingAllocator::Allocate};
    DownloadRecord* record = NewRecord(server_.Url("/doc"));
    record->allocator = &allocator;
    EXPECT_EQ(0u, DownloadWithAllocator(&api_, nullptr, nullptr, nullptr, nullptr, record, nullptr,
                                        0, nullptr, nullptr));
    EXPECT_EQ(1, counting.calls);
    EXPECT_EQ(3 * Document().size(), counting.lastSize);
    ASSERT_EQ(Document().size(), record->size);
    EXPECT_EQ(3 * record->size, record->capacity);
    EXPECT_EQ(Document(), std::string(reinterpret_cast<char*>(record->buffer), record->size));
    EXPECT_EQ(server_.Url("/doc"), record->finalURL);
    delete[] record->buffer;

    record->buffer = nullptr;
    record->allocator = nullptr;
    EXPECT_EQ(KA_ERR_LOAD_FAILED, DownloadWithAllocator(&api_, nullptr, nullptr, nullptr, nullptr,
                                                        record, nullptr, 0, nullptr, nullptr));
    EXPECT_EQ(nullptr, record->buffer);
    delete record;
}

// ---- ReadSourceData against scripted tables ----

// One scripted Read answer: result, bytes delivered (taken from a counter pattern), and a
// delay before answering.
struct Step {
    uint32_t result;
    uint32_t bytes;
    uint32_t delayMs;
};

struct Script {
    std::vector<Step> steps;
    size_t next = 0;
    uint32_t retryResult = 0;
    uint64_t retryCount = 0;
    int retryQueries = 0;
};
Script* gScript = nullptr;

uint32_t ScriptRead(void*, uint8_t* dst, uint32_t wanted, uint32_t* got) {
    if (gScript->next >= gScript->steps.size()) return 0x5eed;
    const Step step = gScript->steps[gScript->next++];
    if (step.delayMs != 0) std::this_thread::sleep_for(std::chrono::milliseconds(step.delayMs));
    const uint32_t n = step.bytes < wanted ? step.bytes : wanted;
    for (uint32_t i = 0; i < n; ++i) dst[i] = static_cast<uint8_t>(0xa0 + i);
    *got = n;
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
    api.Read = ScriptRead;
    api.GetParam = ScriptGetParam;
    return api;
}

struct ReadCase {
    const char* name;
    std::vector<Step> steps;
    uint32_t target;
    KA_BOOL stop;
    uint64_t maxRetries;
    uint32_t timeoutMs;
    uint32_t retryResult;
    uint64_t retryCount;
    uint32_t expected;
    uint32_t expectedCount;
};

class ReadSourceDataTest : public ::testing::TestWithParam<ReadCase> {};

TEST_P(ReadSourceDataTest, EndsAsScripted) {
    const ReadCase& c = GetParam();
    Script script;
    script.steps = c.steps;
    script.retryResult = c.retryResult;
    script.retryCount = c.retryCount;
    gScript = &script;
    SourceIOApi api = ScriptTable();
    std::vector<uint8_t> buffer(c.target + 1, 0);
    uint32_t count = c.target;
    KA_BOOL stop = c.stop;
    EXPECT_EQ(c.expected, ReadSourceData(&api, &script, buffer.data(), &count, &stop, c.maxRetries,
                                         c.timeoutMs))
        << c.name;
    EXPECT_EQ(c.expectedCount, count) << c.name;
    gScript = nullptr;
}

constexpr uint64_t kNoLimit = ~0ull;
constexpr uint32_t kNoTime = 0xFFFFFFFFu;

INSTANTIATE_TEST_SUITE_P(
    Cases, ReadSourceDataTest,
    ::testing::Values(
        ReadCase{"whole", {{0, 10, 0}}, 10, 0, kNoLimit, kNoTime, 0, 0, 0, 10},
        ReadCase{"in pieces", {{0, 4, 0}, {0, 6, 0}}, 10, 0, kNoLimit, kNoTime, 0, 0, 0, 10},
        ReadCase{"not yet, then data",
                 {{2, 0, 0}, {2, 0, 0}, {0, 10, 0}},
                 10,
                 0,
                 kNoLimit,
                 kNoTime,
                 0,
                 0,
                 0,
                 10},
        ReadCase{"ends early", {{0, 2, 0}, {1, 3, 0}}, 10, 0, kNoLimit, kNoTime, 0, 0, 1, 5},
        ReadCase{"module failure",
                 {{0, 2, 0}, {0x4242, 3, 0}},
                 10,
                 0,
                 kNoLimit,
                 kNoTime,
                 0,
                 0,
                 0x4242,
                 2},
        ReadCase{"nothing wanted", {}, 0, 0, kNoLimit, kNoTime, 0, 0, 0, 0},
        ReadCase{"nothing wanted, stopped",
                 {},
                 0,
                 1,
                 kNoLimit,
                 kNoTime,
                 0,
                 0,
                 KA_ERR_DOWNLOAD_FAILED,
                 0},
        ReadCase{"stopped with 1",
                 {{0, 10, 0}},
                 10,
                 1,
                 kNoLimit,
                 kNoTime,
                 0,
                 0,
                 KA_ERR_DOWNLOAD_FAILED,
                 0},
        ReadCase{"stopped with 2", {{0, 10, 0}}, 10, 2, kNoLimit, kNoTime, 0, 0, 0, 0},
        ReadCase{"retries within the limit", {{0, 10, 0}}, 10, 0, 3, kNoTime, 0, 3, 0, 10},
        ReadCase{"retries over the limit",
                 {{0, 10, 0}},
                 10,
                 0,
                 3,
                 kNoTime,
                 0,
                 4,
                 KA_ERR_DOWNLOAD_TIMEOUT,
                 0},
        ReadCase{"retry query answering 1", {{0, 10, 0}}, 10, 0, 3, kNoTime, 1, 0, 1, 10},
        ReadCase{"past the time limit",
                 {{0, 4, 30}, {0, 6, 0}},
                 10,
                 0,
                 kNoLimit,
                 10,
                 0,
                 0,
                 KA_ERR_DOWNLOAD_TIMEOUT,
                 4}),
    [](const ::testing::TestParamInfo<ReadCase>& info) {
        std::string name = info.param.name;
        for (char& ch : name) {
            if (!isalnum(static_cast<unsigned char>(ch))) ch = '_';
        }
        return name;
    });

TEST(ReadSourceData, NoRetryQueryWithoutALimit) {
    Script script;
    script.steps = {{0, 10, 0}};
    gScript = &script;
    SourceIOApi api = ScriptTable();
    uint8_t buffer[10];
    uint32_t count = sizeof(buffer);
    EXPECT_EQ(0u, ReadSourceData(&api, &script, buffer, &count, nullptr, kNoLimit));
    EXPECT_EQ(0, script.retryQueries);
    EXPECT_EQ(0xa9, buffer[9]);
    gScript = nullptr;
}

}  // namespace
