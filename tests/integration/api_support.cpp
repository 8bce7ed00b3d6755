#include "api_support.h"

#include <dlfcn.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "ka/download.h"

namespace katest {

namespace {

void* Library() {
    static void* library = [] {
        void* handle = dlopen(KA_LIB_PATH, RTLD_NOW | RTLD_LOCAL);
        if (handle == nullptr) {
            fprintf(stderr, "cannot load %s: %s\n", KA_LIB_PATH, dlerror());
            abort();
        }
        return handle;
    }();
    return library;
}

}  // namespace

void* LibrarySymbol(const char* name) { return dlsym(Library(), name); }

const VMAPParserAPI& Api() {
    static const VMAPParserAPI api = [] {
        VMAPParserAPI table = {};
        auto get = reinterpret_cast<KaGetVMAPParserAPIFn>(LibrarySymbol("kaGetVMAPParserAPI"));
        if (get == nullptr) abort();
        get(&table);
        return table;
    }();
    return api;
}

void AllowLocalFiles(bool allow) {
    // The library loads the module from the same path; the module stays loaded once opened.
    static SourceIOApi* api = [] {
        const std::string path = std::string(KA_MODULES_DIR) + "libkaSourceIO.so";
        void* module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (module == nullptr) abort();
        auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
        static SourceIOApi table = {};
        if (entry == nullptr || entry(&table) != 0 || table.SetParam == nullptr) abort();
        return &table;
    }();
    const uint32_t kAllowFiles = 0x7a000003;
    uint32_t value = allow ? 1 : 0;
    api->SetParam(nullptr, kAllowFiles, &value);
}

std::vector<char> ReadFile(const std::string& path) {
    std::vector<char> data;
    FILE* file = fopen(path.c_str(), "rb");
    if (file == nullptr) return data;
    char chunk[4096];
    size_t n;
    while ((n = fread(chunk, 1, sizeof(chunk), file)) > 0)
        data.insert(data.end(), chunk, chunk + n);
    fclose(file);
    return data;
}

std::vector<char> ReadTestData(const std::string& relative) {
    return ReadFile(std::string(KA_TEST_DATA_DIR) + relative);
}

Handle::Handle() : mWorkPath(KA_MODULES_DIR), mHandle(nullptr) {
    mOpenResult = Api().Open(&mHandle, &mWorkPath[0]);
}

Handle::~Handle() {
    if (mHandle != nullptr) Api().Close(mHandle);
}

uint32_t Handle::Process(std::vector<char> document) {
    // A copy of its own, so that a record pointing into the caller's buffer would show.
    return Api().Process(mHandle, document.data(), static_cast<uint32_t>(document.size()));
}

uint32_t Handle::Process(const std::string& text) {
    return Process(std::vector<char>(text.begin(), text.end()));
}

AdInfo* Handle::Info() const {
    AdInfo* info = nullptr;
    Api().GetAdInfo(mHandle, &info);
    return info;
}

const char* Handle::ContentUri() const {
    char* uri = nullptr;
    Api().GetParam(mHandle, KA_PID_VMAP_CONTENT_URI, &uri);
    return uri;
}

AdBreak* BreakAt(const AdInfo* info, uint32_t index) {
    AdBreak* adBreak = info != nullptr ? info->adBreaks : nullptr;
    for (; adBreak != nullptr && index > 0; --index) adBreak = adBreak->next;
    return adBreak;
}

AdBreak* BreakById(const AdInfo* info, const char* id) {
    for (AdBreak* b = info != nullptr ? info->adBreaks : nullptr; b != nullptr; b = b->next) {
        if (b->breakId != nullptr && strcmp(b->breakId, id) == 0) return b;
    }
    return nullptr;
}

}  // namespace katest
