// The command-line host run as a user runs it: exit status, standard output and the one-line
// failure message.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <string>

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
        {"url", "https://ads.example.com/vmap.xml", 2, "not supported"},
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

}  // namespace
