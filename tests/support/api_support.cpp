#include "api_support.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>

#include "source_io_module.h"

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

void AllowLocalFiles(bool allow) {
    uint32_t value = allow ? 1 : 0;
    SourceIo().SetParam(nullptr, ka::kSioAllowFiles, &value);
    if (!allow) SourceIo().SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(""));
}

void AllowLocalFilesBelow(const std::string& folder) {
    AllowLocalFiles(true);
    SourceIo().SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(folder.c_str()));
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
