#include "api_support.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>

#include "ka/download.h"

namespace katest {

void* LibrarySymbol(const char* name) {
    static void* library = dlopen(KA_LIB_PATH, RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) {
        fprintf(stderr, "cannot load %s: %s\n", KA_LIB_PATH, dlerror());
        abort();
    }
    return dlsym(library, name);
}

const VMAPParserAPI& Api() {
    static VMAPParserAPI api = {};
    static auto get = reinterpret_cast<KaGetVMAPParserAPIFn>(LibrarySymbol("kaGetVMAPParserAPI"));
    if (get == nullptr || (api.Open == nullptr && get(&api) != KA_OK)) abort();
    return api;
}

const VMAPParserExtAPI& ExtApi() {
    static VMAPParserExtAPI api = [] {
        VMAPParserExtAPI table = {};
        table.size = sizeof(table);
        auto get =
            reinterpret_cast<KaGetVMAPParserExtAPIFn>(LibrarySymbol("kaGetVMAPParserExtAPI"));
        if (get == nullptr || get(&table) != KA_OK) abort();
        return table;
    }();
    return api;
}

namespace {

// The same file the library loads, hence the same instance; it stays loaded.
SourceIOApi& SourceModule() {
    static SourceIOApi table = {};
    if (table.SetParam == nullptr) {
        void* module = dlopen(KA_MODULES_DIR "libkaSourceIO.so", RTLD_NOW | RTLD_LOCAL);
        auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(
            module != nullptr ? dlsym(module, "kaGetSourceIOAPI") : nullptr);
        if (entry == nullptr || entry(&table) != 0 || table.SetParam == nullptr) abort();
    }
    return table;
}

constexpr uint32_t kAllowFiles = 0x7a000003;
constexpr uint32_t kFileBaseDir = 0x7a000004;

}  // namespace

void AllowLocalFiles(bool allow) {
    uint32_t value = allow ? 1 : 0;
    SourceModule().SetParam(nullptr, kAllowFiles, &value);
    if (!allow) SourceModule().SetParam(nullptr, kFileBaseDir, const_cast<char*>(""));
}

void AllowLocalFilesBelow(const std::string& folder) {
    AllowLocalFiles(true);
    SourceModule().SetParam(nullptr, kFileBaseDir, const_cast<char*>(folder.c_str()));
}

std::vector<char> ReadFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return std::vector<char>(std::istreambuf_iterator<char>(file), {});
}

AdInfo* Handle::Info() const {
    AdInfo* info = nullptr;
    EXPECT_EQ(Api().GetAdInfo(mHandle, &info), KA_OK);
    return info;
}

VastAdData* Handle::Container() const {
    VastAdData* data = static_cast<VastAdData*>(kUntouched);
    EXPECT_EQ(Api().GetVastAdData(mHandle, &data), KA_OK);
    return data;
}

}  // namespace katest
