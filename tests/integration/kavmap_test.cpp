// The command-line host run as a user runs it: exit status, standard output and the one-line
// failure message.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <netinet/in.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <string>
#include <thread>

#include "api_support.h"

namespace {

struct RunResult {
    int status;  // exit status, or -1 when the program did not exit normally
    std::string out;
    std::string err;
};

std::string Quote(const std::string& arg) { return "'" + arg + "'"; }

// Runs kavmap with the given (already quoted) arguments, optionally feeding stdinFile.
RunResult RunKavmap(const std::string& args, const std::string& stdinFile = "/dev/null") {
    char errPath[] = "/tmp/ka_kavmap_err_XXXXXX";
    const int fd = mkstemp(errPath);
    RunResult result{-1, "", ""};
    if (fd < 0) return result;
    close(fd);
    const std::string command =
        Quote(KA_KAVMAP_PATH) + " " + args + " <" + Quote(stdinFile) + " 2>" + Quote(errPath);
    FILE* pipe = popen(command.c_str(), "r");
    if (pipe != nullptr) {
        char chunk[4096];
        size_t n;
        while ((n = fread(chunk, 1, sizeof(chunk), pipe)) > 0) result.out.append(chunk, n);
        const int status = pclose(pipe);
        result.status = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    const std::vector<char> err = katest::ReadFile(errPath);
    result.err.assign(err.begin(), err.end());
    unlink(errPath);
    return result;
}

std::string Example(const char* name) { return Quote(std::string(KA_EXAMPLES_DIR) + name); }
std::string Data(const char* name) { return Quote(std::string(KA_TEST_DATA_DIR) + name); }

std::string ReadText(const std::string& path) {
    const std::vector<char> data = katest::ReadFile(path);
    return std::string(data.begin(), data.end());
}

TEST(Kavmap, JsonOfTheExampleIsExact) {
    const RunResult run = RunKavmap("--json " + Example("vmap-playlist.xml"));
    EXPECT_EQ(run.status, 0) << run.err;
    EXPECT_EQ(run.err, "");
    const std::string expected =
        ReadText(std::string(KA_TEST_DATA_DIR) + "vmap/vmap-playlist.expected.json");
    ASSERT_FALSE(expected.empty());
    EXPECT_EQ(run.out, expected);
}

TEST(Kavmap, ExplicitLibraryAndModulesGiveTheSameOutput) {
    const RunResult byDefault = RunKavmap("--json " + Example("vmap-playlist.xml"));
    // The modules folder without its trailing "/" is accepted as well.
    std::string modules = KA_MODULES_DIR;
    modules.pop_back();
    const RunResult explicitPaths =
        RunKavmap("--lib " + Quote(KA_LIB_PATH) + " --modules " + Quote(modules) + " --json " +
                  Example("vmap-playlist.xml"));
    EXPECT_EQ(explicitPaths.status, 0) << explicitPaths.err;
    EXPECT_EQ(explicitPaths.out, byDefault.out);
}

TEST(Kavmap, StandardInputReadsTheSame) {
    const RunResult fromFile = RunKavmap("--json " + Example("vmap-live-repeating.xml"));
    const RunResult fromStdin =
        RunKavmap("--json -", std::string(KA_EXAMPLES_DIR) + "vmap-live-repeating.xml");
    EXPECT_EQ(fromStdin.status, 0) << fromStdin.err;
    EXPECT_EQ(fromStdin.out, fromFile.out);
    EXPECT_NE(fromStdin.out.find("\"repeatAfter\": 600000"), std::string::npos);
}

TEST(Kavmap, ReadableTreeByDefault) {
    const RunResult run = RunKavmap(Example("vmap-playlist.xml"));
    EXPECT_EQ(run.status, 0) << run.err;
    for (const char* line :
         {"content URI: https://media.example.com/episodes/417/master.m3u8?token=ab12&lang=en\n",
          "6 ad breaks\n", "break 1: id preroll\n", "  time offset: start\n",
          "  time offset: 00:10:00.000 (600000 ms)\n", "  time offset: 50%\n",
          "  time offset: position #3\n", "  time offset: end\n",
          "  break type: linear,Skippable (9)\n",
          "    ad tag URI: https://ads.example.com/vast?slot=pre&size=640x360&cb=[CACHEBUSTING]\n",
          "  tracking breakStart: https://track.example.com/break?id=preroll&e=start\n"}) {
        EXPECT_NE(run.out.find(line), std::string::npos) << line;
    }
}

struct Failure {
    const char* what;
    std::string args;
    int status;
    const char* message;  // must appear on standard error
};

TEST(Kavmap, FailuresExitNonZeroWithOneLine) {
    const Failure kFailures[] = {
        {"not xml", Data("vmap/invalid/not_xml.txt"), 1, "Process failed: 0x91001000"},
        {"truncated", Data("vmap/invalid/truncated.xml"), 1, "Process failed: 0x91001000"},
        {"empty stdin", "-", 1, "Process failed: 0x91001000"},
        {"missing file", Data("vmap/no_such_file.xml"), 1, "cannot open"},
        {"no modules", "--modules /nonexistent/ " + Example("vmap-playlist.xml"), 1,
         "Open failed: 0x90000001"},
        {"no library", "--lib /nonexistent/lib.so " + Example("vmap-playlist.xml"), 1,
         "cannot load"},
        {"unreachable url", "http://127.0.0.1:1/none", 1, "download of http://127.0.0.1:1/none"},
    };
    for (const Failure& f : kFailures) {
        const RunResult run = RunKavmap(f.args);
        EXPECT_EQ(run.status, f.status) << f.what;
        EXPECT_NE(run.err.find(f.message), std::string::npos) << f.what << ": " << run.err;
        EXPECT_EQ(run.out, "") << f.what;
        // One line: the message ends the output.
        EXPECT_EQ(run.err.find('\n'), run.err.size() - 1) << f.what << ": " << run.err;
    }
}

TEST(Kavmap, BadArgumentsPrintUsage) {
    for (const std::string& args :
         {std::string(""), std::string("--json"), std::string("--bogus x.xml"),
          std::string("--lib"), std::string("a.xml b.xml"), std::string("--modules")}) {
        const RunResult run = RunKavmap(args);
        EXPECT_EQ(run.status, 2) << args;
        EXPECT_NE(run.err.find("usage: kavmap"), std::string::npos) << args;
        EXPECT_EQ(run.out, "") << args;
    }
}

TEST(Kavmap, VastOptionPrintsTheBareDocument) {
    const RunResult run = RunKavmap("--vast " + Example("vast-inline-linear.xml"));
    EXPECT_EQ(run.status, 0) << run.err;
    EXPECT_EQ(run.err, "");
    EXPECT_EQ(run.out.find("ad break"), std::string::npos) << "no VMAP records in VAST mode";
    for (const char* line :
         {"VAST: 1 ads, depth 0, error URL -\n", "ad 1: id spring-sale, sequence 1, InLine\n",
          "  title: Spring Sale: 30 and 15 second spots\n", "  2 impressions, 3 creatives\n",
          "  creative 1: id spring-30, sequence 1, adId SPR-030, linear\n",
          "    duration: 00:00:30.000 (30000 ms), skip offset: 5000 ms\n",
          "      https://cdn.example.com/spring/30s_720p.mp4\n",
          "    custom click [coupon]: https://shop.example.com/coupon?c=spring-30\n",
          "    tracking progress at 75%: https://ads.example.com/track?e=75pct&c=spring-30\n",
          "    duration: 00:00:15.000 (15000 ms), skip offset: 3750 ms\n",
          "  creative 3: id spring-companion, sequence 0, adId -, not read\n"}) {
        EXPECT_NE(run.out.find(line), std::string::npos) << line;
    }
}

TEST(Kavmap, InlineVastIsPrintedUnderItsSource) {
    const RunResult run = RunKavmap(Example("vmap-inline-vast.xml"));
    EXPECT_EQ(run.status, 0) << run.err;
    for (const char* line :
         {"  linear duration: 45000 ms\n", "    VAST: 2 ads, depth 0, error URL -\n",
          "    ad 2: id pod-30, sequence 2, InLine\n", "  linear duration: 20000 ms\n",
          "handle's VAST container (the last inline document):\n",
          "  ad 1: id mid-20, sequence 0, InLine\n"}) {
        EXPECT_NE(run.out.find(line), std::string::npos) << line;
    }
}

TEST(Kavmap, JsonOfTheInlineVastExampleIsExact) {
    const RunResult run = RunKavmap("--json " + Example("vmap-inline-vast.xml"));
    EXPECT_EQ(run.status, 0) << run.err;
    const std::string expected =
        ReadText(std::string(KA_TEST_DATA_DIR) + "handoff/vmap-inline-vast.expected.json");
    ASSERT_FALSE(expected.empty());
    EXPECT_EQ(run.out, expected);
}

TEST(Kavmap, JsonNamesEveryRecordField) {
    // The inline example holds InLine ads; the unmerged relative wrapper adds a Wrapper body
    // and its nested parser's document.
    const std::string json =
        RunKavmap("--json " + Example("vmap-inline-vast.xml")).out +
        RunKavmap("--json --vast --no-merge " + Data("handoff/wrapper_relative.xml")).out;
    const char* const kFields[] = {
        // VastAdData, AdData
        "adCount", "firstAd", "errorUrl", "depth", "id", "sequence", "type", "body",
        // AdInLine
        "adSystem", "adTitle", "impressionCount", "impressions", "description", "advertiser",
        "survey", "error", "extensions", "creativeCount", "creatives",
        // AdWrapper
        "vastAdTagUri", "nestedParser",
        // AdImpression, AdCreative
        "url", "adId", "kind", "content",
        // AdLinear
        "duration", "skipOffset", "mediaFileCount", "mediaFiles", "videoClicksCount", "videoClicks",
        "adParametersCount", "adParameters", "trackingCount", "trackingEvents", "iconCount",
        "icons",
        // AdMediaFile
        "delivery", "width", "height", "codec", "bitrate", "minBitrate", "maxBitrate", "scalable",
        "maintainAspectRatio",
        // AdVideoClicks
        "clickThroughCount", "clickThroughs", "clickTrackingCount", "clickTrackings",
        "customClickCount", "customClicks",
        // AdTracking
        "event", "offsetKind", "offset"};
    for (const char* field : kFields) {
        EXPECT_NE(json.find("\"" + std::string(field) + "\": "), std::string::npos) << field;
    }
    EXPECT_NE(json.find("\"nestedParser\": {"), std::string::npos);
}

TEST(Kavmap, WrappedFilesResolveNextToTheDocument) {
    const RunResult merged = RunKavmap("--vast " + Data("handoff/wrapper_relative.xml"));
    EXPECT_EQ(merged.status, 0) << merged.err;
    EXPECT_NE(merged.out.find("ad 1: id wrapped, sequence 0, InLine\n"), std::string::npos)
        << merged.out;
    EXPECT_NE(merged.out.find("  impression: http://imp.test/outer\n"), std::string::npos);

    const RunResult nested = RunKavmap("--vast --no-merge " + Data("handoff/wrapper_relative.xml"));
    EXPECT_EQ(nested.status, 0) << nested.err;
    EXPECT_NE(nested.out.find("ad 1: id outer, sequence 0, Wrapper\n"), std::string::npos);
    EXPECT_NE(nested.out.find("  wrapped document:\n    VAST: 1 ads, depth 1, error URL -\n"
                              "    ad 1: id wrapped, sequence 0, InLine\n"),
              std::string::npos)
        << nested.out;
}

// Serves one HTTP response with body to the first connection on a loopback port.
class OneShotServer {
public:
    explicit OneShotServer(std::string body) : mBody(std::move(body)), mPort(0) {
        mSocket = socket(AF_INET, SOCK_STREAM, 0);
        sockaddr_in address = {};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t length = sizeof(address);
        if (mSocket < 0 || bind(mSocket, reinterpret_cast<sockaddr*>(&address), length) != 0 ||
            listen(mSocket, 1) != 0 ||
            getsockname(mSocket, reinterpret_cast<sockaddr*>(&address), &length) != 0) {
            return;
        }
        mPort = ntohs(address.sin_port);
        mThread = std::thread([this] { Serve(); });
    }
    ~OneShotServer() {
        if (mThread.joinable()) mThread.join();
        if (mSocket >= 0) close(mSocket);
    }
    int port() const { return mPort; }

private:
    void Serve() {
        pollfd waiting = {mSocket, POLLIN, 0};
        if (poll(&waiting, 1, 10000) != 1) return;
        const int client = accept(mSocket, nullptr, nullptr);
        if (client < 0) return;
        std::string request;
        char chunk[1024];
        while (request.find("\r\n\r\n") == std::string::npos) {
            pollfd readable = {client, POLLIN, 0};
            if (poll(&readable, 1, 5000) != 1) break;
            const ssize_t n = read(client, chunk, sizeof(chunk));
            if (n <= 0) break;
            request.append(chunk, static_cast<size_t>(n));
        }
        const std::string response =
            "HTTP/1.1 200 OK\r\nContent-Type: application/xml\r\n"
            "Content-Length: " +
            std::to_string(mBody.size()) + "\r\nConnection: close\r\n\r\n" + mBody;
        size_t sent = 0;
        while (sent < response.size()) {
            const ssize_t n = write(client, response.data() + sent, response.size() - sent);
            if (n <= 0) break;
            sent += static_cast<size_t>(n);
        }
        close(client);
    }

    std::string mBody;
    int mSocket;
    int mPort;
    std::thread mThread;
};

TEST(Kavmap, UrlDocumentIsFetchedWithoutFileAccess) {
    // A file named by a fetched document must not be read from the disk.
    OneShotServer server("<VAST><Ad id=\"outer\"><Wrapper><VASTAdTagURI>" +
                         std::string(KA_TEST_DATA_DIR) +
                         "handoff/wrapped_inline.xml</VASTAdTagURI></Wrapper></Ad></VAST>");
    ASSERT_NE(server.port(), 0);
    const RunResult run =
        RunKavmap("--vast http://127.0.0.1:" + std::to_string(server.port()) + "/vast.xml");
    EXPECT_EQ(run.status, 0) << run.err;
    EXPECT_NE(run.out.find("ad 1: id outer, sequence 0, Wrapper\n"), std::string::npos) << run.out;
    EXPECT_EQ(run.out.find("Wrapped Spot"), std::string::npos);
}

}  // namespace
