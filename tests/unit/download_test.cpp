// Downloads through the source-IO stand-in from a loopback HTTP server in this process (127.0.0.1
// only), and the read loop against a scripted module playing tests/data/net/read_cases.txt.
#include "ka/download.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "case_file.h"
#include "ka/result_codes.h"
#include "loopback.h"
#include "net/download.h"
#include "source_io_module.h"

namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

// Every byte value, zero included.
const std::string kDocument = [] {
    std::string text(100 * 1024 + 17, '\0');
    for (size_t i = 0; i < text.size(); ++i) text[i] = static_cast<char>((i * 131 + 7) & 0xff);
    return text;
}();
const std::string kLocal = KA_TEST_DATA_DIR "net/local_document.xml";

// ka_download_by_url with the modules of workPath into *code: "<none>" when it gave no buffer,
// else the bytes.
std::string Fetch(std::string url, uint32_t* code, KA_BOOL* stop = nullptr,
                  std::string workPath = KA_MODULES_DIR) {
    unsigned char* data = nullptr;
    uint32_t size = 0;
    *code = ka_download_by_url(&url[0], &data, &size, &workPath[0], stop);
    std::string text =
        data != nullptr ? std::string(reinterpret_cast<char*>(data), size) : "<none>";
    delete[] data;
    return text;
}

// Downloads in a row on one record, DownloadToBuffer on one reusable buffer; then files, which
// the stand-in reads only when enabled and inside its base.
TEST(Download, FromTheLoopbackServer) {
    loopback::Server server;
    SourceIOApi& api = katest::SourceIo();
    ASSERT_TRUE(server.Running() && api.SetParam != nullptr);
    server.Put("doc", kDocument);
    server.Put("dir/doc", "in dir");
    DownloadRecord storage = {}, *record = &storage;
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0, count = 0, asked = 0;
    BufferAllocator allocator = {&asked, [](void* context, uint8_t** out, uint32_t size) {
                                     static std::vector<uint8_t> held;
                                     held.assign(size + 1, 0);
                                     *static_cast<uint32_t*>(context) = size;
                                     *out = held.data();
                                 }};
    ka::SourceResponseInfo info = {};
    char agent[] = "TestPlayer/2.1";
    int request = 0;
    snprintf(record->baseURL, KA_DOWNLOAD_URL_SIZE, "%s",
             server.Url("/d/dir/index.xml?u=a/b").c_str());
    // The stand-in refuses bodies over the limit itself; this table reports one byte more.
    SourceIOApi over = api, noInit = api, noUninit = api, noFinal = api;
    over.GetSourceSize = [](void*, uint64_t* size) { return *size = KA_DOWNLOAD_MAX_SIZE + 1, 0u; };
    noInit.Init = nullptr;
    noUninit.Uninit = nullptr;
    noFinal.GetParam = [](void* handle, uint32_t id, void* value) {
        return id == ka::kSioFinalUrl ? 5u : katest::SourceIo().GetParam(handle, id, value);
    };
    // URLs of 2047 characters (the longest that fits) and 2048, which cut would be the first.
    const std::string name(KA_DOWNLOAD_URL_SIZE - 1 - server.Url("/d/").size(), 'n');
    // Text and binary values last, so that no name is looked for inside them.
    const std::vector<std::pair<std::string, std::string>> names = {
        {"$SERVER", server.Url("")},
        {"$REFUSED", loopback::Server().Url("")},
        {"$FITS", server.Put(name, "fits")},
        {"$OVERLONG", server.Put(name + "n", "over")},
        {"$MAX", std::to_string(KA_DOWNLOAD_MAX_SIZE)},
        {"$BIG", std::to_string(ka::kSioMaxBodySize + 1)},
        {"$MODULES", KA_MODULES_DIR},
        {"$DATA/", KA_TEST_DATA_DIR},
        {"$DOCUMENT", kDocument},
        {"$SPACES", std::string(KA_DOWNLOAD_MAX_SIZE, ' ')}};
    const std::map<std::string, SourceIOApi*> modules = {
        {"-", &api},         {"null", nullptr},       {"over", &over},
        {"noInit", &noInit}, {"noUninit", &noUninit}, {"noFinal", &noFinal}};
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "net/download_cases.txt");
    for (auto row : rows) {
        SCOPED_TRACE(row[0] + " " + row[1] + " stop " + row[2]);
        for (std::string& field : row) field = katest::Expand(field, names);
        const char via = row[0][0];
        uint32_t limit = static_cast<uint32_t>(std::stoul(row[9]));
        const KA_BOOL useBase = static_cast<KA_BOOL>(std::stoi(row[7]));
        ASSERT_EQ(0u, api.SetParam(nullptr, ka::kSioTotalTimeoutMs, &limit));
        snprintf(record->url, sizeof(record->url), "%s", row[1].c_str());
        record->allocator = via == 'a' ? &allocator : nullptr;
        if (via != 'b') record->buffer = nullptr;
        const uint8_t *const before = buffer, *const recordBefore = record->buffer;
        const uint32_t roomBefore = capacity;
        KA_BOOL stop = static_cast<KA_BOOL>(std::stoi(row[2]));
        uint32_t code = 0;
        std::string text = "<none>";
        info = {};
        const auto start = Clock::now();
        if (via == 'u') text = Fetch(row[1], &code, &stop, row[10]);
        if (via == 'b') {
            code =
                DownloadToBuffer(modules.at(row[8]), &request, &request, &request, &request, record,
                                 &buffer, &capacity, &count, &stop, useBase, &info, agent);
        }
        if (via == 'a' || via == 'n') {
            code = DownloadWithAllocator(modules.at(row[8]), nullptr, nullptr, nullptr, nullptr,
                                         record, &stop, useBase, nullptr, nullptr);  // no options
        }
        const auto ms = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start);
        EXPECT_GE(ms.count() + 50, limit);  // at the module's time limit, not before
        EXPECT_LT(ms.count(), 5000 + limit);
        EXPECT_EQ(std::stoul(row[3], nullptr, 0), code);
        if (via != 'u' && code == 0) {
            text = std::string(reinterpret_cast<char*>(record->buffer), record->size);
        }
        EXPECT_EQ(row[4], text);
        if (via == 'u') continue;
        // A failure takes no buffer and gives none.
        EXPECT_TRUE(code == 0 || (roomBefore == capacity && recordBefore == record->buffer));
        if (code != 0) continue;
        EXPECT_EQ(row[5], record->finalURL);
        EXPECT_EQ(std::stoul(row[6]), info.redirects);
        EXPECT_EQ(3 * record->size, record->capacity);
        EXPECT_TRUE(via != 'a' || asked == record->capacity);
        if (via != 'b') continue;
        EXPECT_TRUE(3 * count > roomBefore || before == buffer);  // a smaller document reuses it
        EXPECT_EQ(std::max<size_t>(roomBefore, 3 * count), capacity);
        EXPECT_EQ(buffer, record->buffer);
        EXPECT_EQ(count, record->size);
    }
    EXPECT_EQ(rows.size(), 25u);
    char* const url = record->url;
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(nullptr, &buffer, &count, nullptr, nullptr));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(url, nullptr, &count, nullptr, nullptr));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT, ka_download_by_url(url, &buffer, nullptr, nullptr, nullptr));
    EXPECT_EQ(KA_ERR_NULL_ARGUMENT,
              DownloadToBuffer(&api, nullptr, nullptr, nullptr, nullptr, nullptr, &buffer,
                               &capacity, &count, nullptr, 0, nullptr, nullptr));
    // A reference that, joined to its base, takes 2048 characters fails; cut, it would be the
    // 2047-character URL that the reference one character shorter reaches.
    const std::string dir(1900, 'd'), prefix = server.Url("/d/" + dir + "/");
    const std::string ref(KA_DOWNLOAD_URL_SIZE - prefix.size(), 'r');
    server.Put(dir + "/" + ref.substr(1), "fits");
    snprintf(record->baseURL, KA_DOWNLOAD_URL_SIZE, "%s", (prefix + "index.xml").c_str());
    for (const std::string& reference : {ref, ref.substr(1)}) {
        snprintf(record->url, sizeof(record->url), "%s", reference.c_str());
        EXPECT_EQ(reference == ref ? KA_ERR_DOWNLOAD_FAILED : 0u,
                  DownloadToBuffer(&api, nullptr, nullptr, nullptr, nullptr, record, &buffer,
                                   &capacity, &count, nullptr, 1, nullptr, nullptr));
    }
    EXPECT_EQ("fits", std::string(reinterpret_cast<char*>(buffer), count));
    delete[] buffer;

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
    const std::vector<std::pair<std::string, std::string>> paths = {
        {"$BASE", base}, {"$TMP", tmp}, {"$LOCAL", kLocal}, {"$SERVER", server.Url("")}};
    const auto files = katest::ReadCases(KA_TEST_DATA_DIR "net/file_cases.txt");
    EXPECT_EQ(files.size(), 24u);
    for (bool allowed : {true, false}) {  // ends with the defaults
        uint32_t on = allowed;
        ASSERT_EQ(0u, api.SetParam(nullptr, ka::kSioAllowFiles, &on));
        api.SetParam(nullptr, ka::kSioFileBaseDir,
                     allowed ? const_cast<char*>(base.c_str()) : nullptr);
        for (const auto& f : files) {
            const bool readable = allowed && f[1] == "yes";
            const std::string url = katest::Expand(f[0], paths);
            uint32_t code = 0;
            EXPECT_EQ(readable ? local : "<none>", Fetch(url, &code)) << url << " " << allowed;
            EXPECT_EQ(readable ? 0u : KA_ERR_DOWNLOAD_FAILED, code) << url << " " << allowed;
        }
    }
    fs::remove_all(tmp);
}

// A scripted module playing one line of read_cases.txt, whose numbers it holds.
struct Script {
    std::vector<uint64_t> n;
    size_t next = 9;  // the next Read's answer in n
    uint32_t written = 0;
    uint64_t queries = 0;
} gScript;

TEST(ReadSourceData, FollowsTheReadRules) {
    SourceIOApi api = {};
    // Bytes follow one running counter, so misplaced pieces show.
    api.Read = [](void*, uint8_t* dst, uint32_t wanted, uint32_t* got) -> uint32_t {
        if (gScript.next + 3 > gScript.n.size()) return 0x5eed;
        const uint64_t* step = &gScript.n[gScript.next];
        gScript.next += 3;
        std::this_thread::sleep_for(std::chrono::milliseconds(step[2]));
        *got = std::min(static_cast<uint32_t>(step[1]), wanted);
        for (uint32_t i = 0; i < *got; ++i) dst[i] = static_cast<uint8_t>(0xa0 + gScript.written++);
        return static_cast<uint32_t>(step[0]);
    };
    api.GetParam = [](void*, uint32_t, void* value) -> uint32_t {  // only the retry count
        ++gScript.queries;
        *static_cast<uint64_t*>(value) = gScript.n[5];
        return static_cast<uint32_t>(gScript.n[4]);
    };
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "net/read_cases.txt");
    for (const auto& row : rows) {
        std::string line;
        for (const std::string& f : row) line += f + " ";
        SCOPED_TRACE(line);
        for (char& ch : line) ch = ch == '/' || ch == '|' ? ' ' : ch;
        std::istringstream in(line);
        gScript = Script();
        for (std::string f; in >> f;) gScript.n.push_back(f == "-" ? ~0ull : stoull(f, nullptr, 0));
        const std::vector<uint64_t>& n = gScript.n;
        uint32_t count = static_cast<uint32_t>(n[0]);
        std::vector<uint8_t> buffer(count + 1, 0);
        KA_BOOL stop = static_cast<KA_BOOL>(n[1]);
        EXPECT_EQ(n[6],
                  ReadSourceData(&api, &gScript, buffer.data(), &count, stop == 0 ? nullptr : &stop,
                                 n[2], static_cast<uint32_t>(n[3])));
        EXPECT_EQ(n[7], count);
        EXPECT_EQ(n[8], gScript.queries);
        for (uint32_t i = 0; i < count; ++i) ASSERT_EQ(static_cast<uint8_t>(0xa0 + i), buffer[i]);
    }
    EXPECT_EQ(13u, rows.size());
}

}  // namespace
