// The library exports exactly the names in tests/exported_symbols.txt: nothing internal leaks
// and no documented entry goes missing.
#include <gtest/gtest.h>

#include <cstdio>
#include <fstream>
#include <set>
#include <sstream>
#include <string>

namespace {

// Names the linker adds to every shared object, and the hooks an instrumented build defines.
bool IsToolchainName(const std::string& name) {
    for (const char* exact : {"_init", "_fini", "_edata", "_end", "__bss_start"}) {
        if (name == exact) return true;
    }
    for (const char* prefix : {"__asan", "__odr_asan", "__ubsan", "__lsan", "__sanitizer"}) {
        if (name.rfind(prefix, 0) == 0) return true;
    }
    return false;
}

TEST(Exports, ExactlyTheListedNames) {
    std::set<std::string> listed;
    std::ifstream file(std::string(KA_TEST_DATA_DIR) + "../exported_symbols.txt");
    for (std::string line; std::getline(file, line);) {
        const size_t end = line.find_last_not_of(" \t\r");
        if (end != std::string::npos && line[0] != '#') listed.insert(line.substr(0, end + 1));
    }
    EXPECT_TRUE(listed.count("kaGetVMAPParserAPI") && listed.count("kaGetVMAPParserAPIAdapter"));

    std::set<std::string> exported;
    // The toolchain's own nm: a cross build's library is not for the host's.
    const std::string command =
        "'" KA_NM_PATH "' -D --defined-only '" + std::string(KA_LIB_PATH) + "' 2>&1";
    FILE* pipe = popen(command.c_str(), "r");
    ASSERT_NE(pipe, nullptr);
    char line[1024];
    while (fgets(line, sizeof(line), pipe) != nullptr) {
        // "<address> <type> <name>[@version]"
        std::istringstream fields(line);
        std::string address, type, name;
        if (!(fields >> address >> type >> name)) continue;
        name = name.substr(0, name.find('@'));
        if (!IsToolchainName(name)) exported.insert(name);
    }
    ASSERT_EQ(pclose(pipe), 0) << KA_NM_PATH " failed on " << KA_LIB_PATH;

    EXPECT_EQ(exported, listed);  // no C++ ("_Z") name is listed
}

}  // namespace
