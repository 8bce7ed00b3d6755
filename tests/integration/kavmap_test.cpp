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
std::string Example(const char* name) { return Quote(std::string(KA_EXAMPLES_DIR) + name); }
std::string Data(const std::string& name) { return Quote(KA_TEST_DATA_DIR + name); }

std::string Text(const std::vector<char>& data) { return std::string(data.begin(), data.end()); }

// Runs kavmap with the given (already quoted) arguments, feeding it stdinFile.
RunResult RunKavmap(const std::string& args, const std::string& stdinFile = "/dev/null") {
    const std::string out = "/tmp/ka_kavmap_" + std::to_string(getpid());
    const int status = system((Quote(KA_KAVMAP_PATH) + " " + args + " <" + Quote(stdinFile) + " >" +
                               out + ".out 2>" + out + ".err")
                                  .c_str());
    RunResult result{WIFEXITED(status) ? WEXITSTATUS(status) : -1,
                     Text(katest::ReadFile(out + ".out")), Text(katest::ReadFile(out + ".err"))};
    unlink((out + ".out").c_str());
    unlink((out + ".err").c_str());
    return result;
}

// --json prints what the document tests expect, after their result line.
TEST(Kavmap, JsonIsWhatTheDocumentTestsExpect) {
    std::string modules = KA_MODULES_DIR;
    modules.pop_back();  // the folder without its trailing "/" is accepted as well
    const std::string playlist = "documents/vmap/vmap-playlist";
    const struct {
        std::string args;
        std::string stdinFile;
        std::string document;  // below tests/data/, without ".xml"
    } kCases[] = {
        {"--json " + Data(playlist + ".xml"), "/dev/null", playlist},
        {"--lib " + Quote(KA_LIB_PATH) + " --modules " + Quote(modules) + " --json " +
             Data(playlist + ".xml"),
         "/dev/null", playlist},
        {"--json -", std::string(KA_TEST_DATA_DIR) + playlist + ".xml", playlist},
        // Wrapped files resolve next to the document.
        {"--json --vast " + Data("documents/vast/wrapper-1.xml"), "/dev/null",
         "documents/vast/wrapper-1"},
        {"--json --vast --no-merge " + Data("documents/vast-no-merge/chain_three.xml"),
         "/dev/null", "documents/vast-no-merge/chain_three"},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.args);
        const RunResult run = RunKavmap(c.args, c.stdinFile);
        EXPECT_EQ(run.status, 0) << run.err;
        EXPECT_EQ(run.err, "");
        const std::string expected = Text(katest::ReadTestData(c.document + ".out"));
        ASSERT_FALSE(expected.empty());
        EXPECT_EQ(run.out, expected.substr(expected.find('\n') + 1));
    }
}

TEST(Kavmap, PrintsTheExpectedLines) {
    const std::string chain = Data("documents/vast/wrapper_relative.xml");
    const struct {
        std::string args;
        std::vector<const char*> lines;
    } kCases[] = {
        // clang-format off
        {Example("vmap-playlist.xml"),
         {"content URI: https://media.example.com/episodes/417/master.m3u8?token=ab12&lang=en\n",
          "6 ad breaks\n", "break 1: id preroll\n", "  time offset: start\n",
          "  time offset: 00:10:00.000 (600000 ms)\n", "  time offset: 50%\n",
          "  time offset: position #3\n", "  break type: linear,Skippable (9)\n",
          "  tracking breakStart: https://track.example.com/break?id=preroll&e=start\n"}},
        {Example("vmap-inline-vast.xml"),
         {"  linear duration: 45000 ms\n", "    ad 2: id pod-30, sequence 2, InLine\n",
          "handle's VAST container (the last inline document):\n"}},
        {"--vast " + Example("vast-inline-linear.xml"),
         {"VAST: 1 ads, depth 0, error URL -\n", "ad 1: id spring-sale, sequence 1, InLine\n",
          "  creative 1: id spring-30, sequence 1, adId SPR-030, linear\n",
          "    duration: 00:00:30.000 (30000 ms), skip offset: 5000 ms\n",
          "    custom click [coupon]: https://shop.example.com/coupon?c=spring-30\n",
          "    tracking progress at 75%: https://ads.example.com/track?e=75pct&c=spring-30\n",
          "  creative 3: id spring-companion, sequence 0, adId -, not read\n"}},
        {"--vast " + chain,
         {"ad 1: id wrapped, sequence 0, InLine\n", "  impression: http://imp.test/outer\n"}},
        {"--vast --no-merge " + chain,
         {"ad 1: id outer, sequence 0, Wrapper\n",
          "  wrapped document:\n    VAST: 1 ads, depth 1, error URL -\n"
          "    ad 1: id wrapped, sequence 0, InLine\n"}},
        // clang-format on
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.args);
        const RunResult run = RunKavmap(c.args);
        EXPECT_EQ(run.status, 0) << run.err;
        for (const char* line : c.lines) EXPECT_NE(run.out.find(line), std::string::npos) << line;
    }
}

TEST(Kavmap, FailuresExitNonZeroWithOneLine) {
    const struct {
        const char* what;
        std::string args;
        int status;
        const char* message;  // on standard error; "usage: kavmap" for bad arguments
    } kFailures[] = {
        // clang-format off
        {"not xml", Data("documents/vmap/invalid_not_xml.xml"), 1, "Process failed: 0x91001000"},
        {"truncated", Data("documents/vmap/invalid_truncated.xml"), 1, "Process failed: 0x91001000"},
        {"empty stdin", "-", 1, "Process failed: 0x91001000"},
        {"missing file", Data("documents/no_such_file.xml"), 1, "cannot open"},
        {"no modules", "--modules /nonexistent/ " + Example("vmap-playlist.xml"), 1,
         "Open failed: 0x90000001"},
        {"no library", "--lib /nonexistent/lib.so " + Example("vmap-playlist.xml"), 1,
         "cannot load"},
        {"unreachable url", "http://127.0.0.1:1/none", 1, "download of http://127.0.0.1:1/none"},
        {"no document", "", 2, "usage: kavmap"}, {"only an option", "--json", 2, "usage: kavmap"},
        {"unknown option", "--bogus x.xml", 2, "usage: kavmap"},
        {"option without value", "--lib", 2, "usage: kavmap"},
        {"two documents", "a.xml b.xml", 2, "usage: kavmap"},
        // clang-format on
    };
    for (const auto& f : kFailures) {
        SCOPED_TRACE(f.what);
        const RunResult run = RunKavmap(f.args);
        EXPECT_EQ(run.status, f.status);
        EXPECT_NE(run.err.find(f.message), std::string::npos) << run.err;
        EXPECT_EQ(run.out, "");
        EXPECT_TRUE(f.status == 2 || run.err.find('\n') == run.err.size() - 1) << "one line";
    }
}

// One response from a loopback port; the local file the fetched wrapper names must not be read.
TEST(Kavmap, UrlDocumentIsFetchedWithoutFileAccess) {
    const std::string body = katest::WrapperTo();
    const std::string response =
        "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) +
        "\r\nConnection: close\r\n\r\n" + body;
    const int listener = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t length = sizeof(address);
    ASSERT_EQ(bind(listener, reinterpret_cast<sockaddr*>(&address), length), 0);
    ASSERT_EQ(listen(listener, 1), 0);
    ASSERT_EQ(getsockname(listener, reinterpret_cast<sockaddr*>(&address), &length), 0);
    std::thread server([listener, &response] {
        pollfd waiting = {listener, POLLIN, 0};
        const int client = poll(&waiting, 1, 10000) == 1 ? accept(listener, nullptr, nullptr) : -1;
        if (client < 0) return;
        // The whole request is read first: closing on unread bytes would reset the connection.
        std::string request;
        char chunk[1024];
        pollfd readable = {client, POLLIN, 0};
        ssize_t n = 1;
        while (n > 0 && request.find("\r\n\r\n") == std::string::npos &&
               poll(&readable, 1, 5000) == 1) {
            n = read(client, chunk, sizeof(chunk));
            if (n > 0) request.append(chunk, static_cast<size_t>(n));
        }
        EXPECT_EQ(send(client, response.data(), response.size(), MSG_NOSIGNAL),
                  static_cast<ssize_t>(response.size()));
        close(client);
    });
    const RunResult run =
        RunKavmap("--vast http://127.0.0.1:" + std::to_string(ntohs(address.sin_port)) + "/v.xml");
    server.join();
    close(listener);
    EXPECT_EQ(run.status, 0) << run.err;
    EXPECT_NE(run.out.find("ad 1: id outer, sequence 0, Wrapper\n"), std::string::npos) << run.out;
    EXPECT_EQ(run.out.find("Wrapped Spot"), std::string::npos);
}

}  // namespace
