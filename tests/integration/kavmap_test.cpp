// The command-line host run as a user runs it: exit status, standard output and the one-line
// failure message. The runs are in tests/data/kavmap_cases.txt.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include "api_support.h"
#include "case_file.h"
#include "loopback.h"

namespace {

std::string Text(const std::string& path) {
    const std::vector<char> data = katest::ReadFile(path);
    return std::string(data.begin(), data.end());
}

TEST(Kavmap, RunsExitPrintAndFailAsListed) {
    std::string modules = KA_MODULES_DIR;
    modules.pop_back();
    loopback::Server server;
    const std::string url = server.Put(
        "v.xml", "<VAST><Ad id=\"outer\"><Wrapper><VASTAdTagURI>" KA_TEST_DATA_DIR
                 "documents/vast/wrapped_inline.wrapped.xml</VASTAdTagURI></Wrapper></Ad></VAST>");
    const std::vector<std::pair<std::string, std::string>> names = {
        {"$DATA/", "'" KA_TEST_DATA_DIR "'"},
        {"$EXAMPLES/", "'" KA_EXAMPLES_DIR "'"},
        {"$LIB", "'" KA_LIB_PATH "'"},
        {"$MODULES", "'" + modules + "'"},
        {"$URL", url}};
    const std::string out = "/tmp/ka_kavmap_" + std::to_string(getpid());
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "kavmap_cases.txt");
    for (const auto& row : rows) {
        SCOPED_TRACE(row[1]);
        const int status =
            system(("'" KA_KAVMAP_PATH "' " + katest::Expand(row[1], names) + " <" +
                    katest::Expand(row[2], names) + " >" + out + ".out 2>" + out + ".err")
                       .c_str());
        const std::string printed = Text(out + ".out"), err = Text(out + ".err");
        EXPECT_EQ(WIFEXITED(status) ? WEXITSTATUS(status) : -1, std::stoi(row[0])) << err;
        EXPECT_EQ(row[0] == "0" ? err : printed, "");
        const std::string& shown = row[0] == "0" ? printed : err;
        for (size_t i = 3; i < row.size(); ++i) {
            if (row[i].rfind("json:", 0) == 0) {
                const std::string expected = Text(KA_TEST_DATA_DIR + row[i].substr(5) + ".out");
                EXPECT_FALSE(expected.empty()) << row[i];
                EXPECT_EQ(shown, expected.substr(expected.find('\n') + 1));
            } else {
                EXPECT_NE(shown.find(row[i]), std::string::npos) << row[i];
            }
        }
        EXPECT_TRUE(row[0] != "1" || err.find('\n') == err.size() - 1) << "one line";
        const auto raw = std::find_if(printed.begin(), printed.end(), [](unsigned char b) {
            return (b < 0x20 && b != '\n') || b == 0x7f;
        });
        EXPECT_TRUE(raw == printed.end()) << "a raw control byte at " << raw - printed.begin();
    }
    unlink((out + ".out").c_str());
    unlink((out + ".err").c_str());
    EXPECT_EQ(server.Requests(), 2);
    EXPECT_EQ(rows.size(), 29u);
}

}  // namespace
