// Recording stand-in for libkadl.so: every call is logged as "load:NAME", "symbol:NAME" or
// "free"; a load succeeds only for names the test accepted, a symbol only when provided.
#include <cstring>
#include <string>
#include <vector>

#define FAKE_API extern "C" __attribute__((visibility("default")))

namespace {
std::vector<std::string> gLog;
std::vector<std::string> gAccepted;
std::vector<std::string> gSymbols;
int gModule;  // the address handed out as every module's handle

int EntryFunction(void*) { return 0; }

bool Contains(const std::vector<std::string>& list, const char* name) {
    for (const std::string& item : list) {
        if (name != nullptr && item == name) return true;
    }
    return false;
}
}  // namespace

FAKE_API void fake_kadl_reset() {
    gLog.clear();
    gAccepted.clear();
    gSymbols.clear();
}
FAKE_API void fake_kadl_accept(const char* name) { gAccepted.emplace_back(name); }
FAKE_API void fake_kadl_provide_symbol(const char* name) { gSymbols.emplace_back(name); }
FAKE_API int fake_kadl_log_size() { return static_cast<int>(gLog.size()); }
FAKE_API const char* fake_kadl_log_entry(int i) { return gLog[i].c_str(); }
FAKE_API void* fake_kadl_module_handle() { return &gModule; }
FAKE_API void* fake_kadl_entry() { return reinterpret_cast<void*>(&EntryFunction); }

FAKE_API void* kaLoadLibrary(const char* name, int flags) {
    gLog.push_back("load:" + std::string(name) + (flags == 2 ? "" : " (bad flags)"));
    return Contains(gAccepted, name) ? &gModule : nullptr;
}

FAKE_API void* kaGetAddressSymbol(void* handle, const char* symbol) {
    gLog.push_back("symbol:" + std::string(symbol));
    if (handle != &gModule || !Contains(gSymbols, symbol)) return nullptr;
    return reinterpret_cast<void*>(&EntryFunction);
}

#ifndef KA_FAKE_WITHOUT_FREE
FAKE_API int kaFreeLibrary(void* handle) {
    gLog.push_back(handle == &gModule ? "free" : "free (bad handle)");
    return 0;
}
#endif
