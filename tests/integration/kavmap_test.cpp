// The command-line host run as a user runs it: exit status, standard output and the one-line
// failure message.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include "api_support.h"
#include "loopback.h"

namespace {

struct RunResult {
    int status;  // exit status, or -1 when the program did not exit normally
    std::string out, err;
};

std::string Quote(const std::string& arg) { return "'" + arg + "'"; }
std::string Example(const char* name) { return Quote(std::string(KA_EXAMPLES_DIR) + name); }
std::string Data(const std::string& name) { return Quote(KA_TEST_DATA_DIR + name); }

std::string Text(const std::string& path) {
    const std::vector<char> data = katest::ReadFile(path);
    return std::string(data.begin(), data.end());
}

RunResult RunKavmap(const std::string& args, const std::string& stdinFile = "/dev/null") {
    const std::string out = "/tmp/ka_kavmap_" + std::to_string(getpid());
    const int status = system((Quote(KA_KAVMAP_PATH) + " " + args + " <" + Quote(stdinFile) + " >" +
                               out + ".out 2>" + out + ".err")
                                  .c_str());
    RunResult result{WIFEXITED(status) ? WEXITSTATUS(status) : -1, Text(out + ".out"),
                     Text(out + ".err")};
    unlink((out + ".out").c_str());
    unlink((out + ".err").c_str());
    return result;
}

// Each run exits 0 and prints nothing on standard error. With --json it prints what the document
// tests expect after their result line (document: below tests/data/, without ".xml"); otherwise
// its output holds the given lines.
TEST(Kavmap, PrintsTheRecords) {
    std::string modules = KA_MODULES_DIR;
    modules.pop_back();  // the folder without its trailing "/" is accepted as well
    const std::string playlist = "documents/vmap/vmap-playlist", chain = "documents/vast/";
    loopback::Server server;
    const std::string url = server.Put(
        "v.xml", "<VAST><Ad id=\"outer\"><Wrapper><VASTAdTagURI>" KA_TEST_DATA_DIR
                 "documents/vast/wrapped_inline.wrapped.xml</VASTAdTagURI></Wrapper></Ad></VAST>");
    const struct {
        std::string args, stdinFile, document;
        std::vector<const char*> lines;
    } kCases[] = {
        // clang-format off
        {"--json " + Data(playlist + ".xml"), "/dev/null", playlist, {}},
        {"--lib " + Quote(KA_LIB_PATH) + " --modules " + Quote(modules) + " --json " +
             Data(playlist + ".xml"), "/dev/null", playlist, {}},
        {"--json -", KA_TEST_DATA_DIR + playlist + ".xml", playlist, {}},
        {"--json --vast " + Data(chain + "wrapper-1.xml"), "/dev/null", chain + "wrapper-1", {}},
        {"--json --vast --no-merge " + Data("documents/vast-no-merge/chain_three.xml"), "/dev/null",
         "documents/vast-no-merge/chain_three", {}},
        {Example("vmap-playlist.xml"), "/dev/null", "",
         {"content URI: https://media.example.com/episodes/417/master.m3u8?token=ab12&lang=en\n",
          "6 ad breaks\n", "break 1: id preroll\n", "  time offset: start\n",
          "  time offset: 00:10:00.000 (600000 ms)\n", "  time offset: 50%\n",
          "  time offset: position #3\n", "  break type: linear,Skippable (9)\n",
          "  tracking breakStart: https://track.example.com/break?id=preroll&e=start\n"}},
        {Example("vmap-inline-vast.xml"), "/dev/null", "",
         {"  linear duration: 45000 ms\n", "    ad 2: id pod-30, sequence 2, InLine\n",
          "handle's VAST container (the last inline document):\n"}},
        {"--vast " + Example("vast-inline-linear.xml"), "/dev/null", "",
         {"VAST: 1 ads, depth 0, error URL -\n", "ad 1: id spring-sale, sequence 1, InLine\n",
          "  creative 1: id spring-30, sequence 1, adId SPR-030, linear\n",
          "    duration: 00:00:30.000 (30000 ms), skip offset: 5000 ms\n",
          "    custom click [coupon]: https://shop.example.com/coupon?c=spring-30\n",
          "    tracking progress at 75%: https://ads.example.com/track?e=75pct&c=spring-30\n",
          "  creative 3: id spring-companion, sequence 0, adId -, not read\n"}},
        {"--vast " + Data(chain + "wrapper_relative.xml"), "/dev/null", "",
         {"ad 1: id wrapped, sequence 0, InLine\n", "  impression: http://imp.test/outer\n"}},
        {"--vast --no-merge " + Data(chain + "wrapper_relative.xml"), "/dev/null", "",
         {"ad 1: id outer, sequence 0, Wrapper\n",
          "  wrapped document:\n    VAST: 1 ads, depth 1, error URL -\n"
          "    ad 1: id wrapped, sequence 0, InLine\n"}},
        {"--vast " + Data("documents/vast/raw_bytes.xml"), "/dev/null", "",
         {"ad 1: id \\x1b[31mred\\x1b[0m, sequence 0, InLine\n",
          "  ad system: bell\\x07 escape\\x1b]0;title\\x07 del\\x7f c1\\xc2\\x9b end\n",
          "  impression: http://imp.test/\\x1b[2J\\x08?q="}},
        {"--vast " + url, "/dev/null", "",
         {"VAST: 1 ads, depth 0, error URL -\nad 1: id outer, sequence 0, Wrapper\n"}},
        {"--trace --vast " + Data(chain + "chain_failures.xml"), "/dev/null", "",
         {"chain outcomes:\n  ad 1 (id no-uri): wrapper, VAST error 101 (a Wrapper without "
          "VASTAdTagURI)\n    error URL: err-w0\n  ad 2 (id next-no-uri): not wrapped",
          "  ad 7 (id -): emptied, VAST error 100 (the document is not XML)\n    file://localhost"}},
        {"--json --trace --vast " + Data(chain + "chain_failures.xml"), "/dev/null", "",
         {"\"chainOutcomes\": [\n    {\n      \"adId\": \"no-uri\",\n      \"state\": 2,\n"
          "      \"vastError\": 101,\n      \"reason\": 1,\n      \"hops\": [],\n"
          "      \"errorUrls\": [\n        \"err-w0\"\n      ]\n    },\n"}},
        // clang-format on
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.args);
        const RunResult run = RunKavmap(c.args, c.stdinFile);
        EXPECT_EQ(run.status, 0) << run.err;
        EXPECT_EQ(run.err, "");
        if (!c.document.empty()) {
            const std::string expected = Text(KA_TEST_DATA_DIR + c.document + ".out");
            ASSERT_FALSE(expected.empty());
            EXPECT_EQ(run.out, expected.substr(expected.find('\n') + 1));
        }
        for (const char* line : c.lines) EXPECT_NE(run.out.find(line), std::string::npos) << line;
        const auto raw = std::find_if(run.out.begin(), run.out.end(), [](unsigned char b) {
            return (b < 0x20 && b != '\n') || b == 0x7f;
        });
        EXPECT_TRUE(raw == run.out.end()) << "a raw control byte at " << raw - run.out.begin();
    }
    // The reference, an absolute path, resolves against the document's URL: asked of the server,
    // never read from the disk.
    EXPECT_EQ(server.Requests(), 2);
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

}  // namespace
