// The library exports exactly the names in tests/exported_symbols.txt: nothing internal leaks
// and no documented entry goes missing.
#include <gtest/gtest.h>

#include <cstdio>
#include <cstring>
#include <fstream>
#include <set>
#include <sstream>
#include <string>

namespace {

// Names the static linker adds to every shared object whatever its sources.
const char* const kLinkerNames[] = {"_init", "_fini", "_edata", "_end", "__bss_start"};

#if defined(__SANITIZE_ADDRESS__)
#define KA_SANITIZED_BUILD 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define KA_SANITIZED_BUILD 1
#endif
#endif

// Instrumented builds may define hooks of the sanitizer runtimes in the library itself.
bool IsSanitizerName(const std::string& name) {
#if defined(KA_SANITIZED_BUILD)
    for (const char* prefix : {"__asan", "__odr_asan", "__ubsan", "__lsan", "__sanitizer"}) {
        if (name.compare(0, strlen(prefix), prefix) == 0) return true;
    }
#else
    (void)name;
#endif
    return false;
}

bool IsToolchainName(const std::string& name) {
    for (const char* linker : kLinkerNames) {
        if (name == linker) return true;
    }
    return IsSanitizerName(name);
}

std::set<std::string> ListedNames() {
    std::set<std::string> names;
    std::ifstream file(std::string(KA_TEST_DATA_DIR) + "../exported_symbols.txt");
    std::string line;
    while (std::getline(file, line)) {
        const size_t end = line.find_last_not_of(" \t\r");
        if (end == std::string::npos || line[0] == '#') continue;
        names.insert(line.substr(0, end + 1));
    }
    return names;
}

// Defined dynamic symbols of the library, as nm reports them; false when nm failed.
bool ExportedNames(std::set<std::string>& names) {
    const std::string command = std::string("nm -D --defined-only '") + KA_LIB_PATH + "' 2>&1";
    FILE* pipe = popen(command.c_str(), "r");
    if (pipe == nullptr) return false;
    char line[1024];
    while (fgets(line, sizeof(line), pipe) != nullptr) {
        // "<address> <type> <name>[@version]"
        std::istringstream fields(line);
        std::string address, type, name;
        if (!(fields >> address >> type >> name)) continue;
        const size_t at = name.find('@');
        if (at != std::string::npos) name.resize(at);
        if (!IsToolchainName(name)) names.insert(name);
    }
    return pclose(pipe) == 0;
}

TEST(Exports, ListIsReadable) {
    const std::set<std::string> listed = ListedNames();
    EXPECT_TRUE(listed.count("kaGetVMAPParserAPI"));
    EXPECT_TRUE(listed.count("kaGetVMAPParserAPIAdapter"));
}

TEST(Exports, ExactlyTheListedNames) {
    std::set<std::string> exported;
    ASSERT_TRUE(ExportedNames(exported)) << "nm failed on " << KA_LIB_PATH;
    const std::set<std::string> listed = ListedNames();
    ASSERT_FALSE(listed.empty());
    for (const std::string& name : exported) {
        EXPECT_TRUE(listed.count(name)) << "exported but not listed: " << name;
    }
    for (const std::string& name : listed) {
        EXPECT_TRUE(exported.count(name)) << "listed but not exported: " << name;
    }
}

TEST(Exports, EntriesHavePlainCNames) {
    std::set<std::string> exported;
    ASSERT_TRUE(ExportedNames(exported));
    EXPECT_TRUE(exported.count("kaGetVMAPParserAPI"));
    EXPECT_TRUE(exported.count("kaGetVMAPParserAPIAdapter"));
    for (const std::string& name : exported) {
        EXPECT_NE(name.compare(0, 2, "_Z"), 0) << "C++ name exported: " << name;
    }
}

}  // namespace
