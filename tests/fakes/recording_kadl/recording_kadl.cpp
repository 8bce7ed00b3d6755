// libkadl.so that logs each call as "load:NAME ", "symbol:NAME " or "free "; a load or a symbol
// succeeds only for a name the test accepted.
#include <string>

#define FAKE_API extern "C" __attribute__((visibility("default")))

namespace {
std::string gLog;
std::string gAccepted = "\n";  // each name between newlines
int gModule;                   // every module's handle

int EntryFunction(void*) { return 0; }

bool Accepted(const char* name) {
    return gAccepted.find("\n" + std::string(name) + "\n") != std::string::npos;
}
}  // namespace

FAKE_API const char* fake_kadl_log() { return gLog.c_str(); }
FAKE_API void fake_kadl_reset() {
    gLog.clear();
    gAccepted = "\n";
}
FAKE_API void fake_kadl_accept(const char* name) { gAccepted += std::string(name) + "\n"; }

FAKE_API void* kaLoadLibrary(const char* name, int flags) {
    gLog += "load:" + std::string(name) + (flags == 2 ? " " : "(bad flags) ");
    return Accepted(name) ? &gModule : nullptr;
}

FAKE_API void* kaGetAddressSymbol(void* handle, const char* symbol) {
    gLog += "symbol:" + std::string(symbol) + " ";
    return handle == &gModule && Accepted(symbol) ? reinterpret_cast<void*>(&EntryFunction)
                                                  : nullptr;
}

#ifndef KA_FAKE_WITHOUT_FREE
FAKE_API int kaFreeLibrary(void* handle) {
    gLog += handle == &gModule ? "free " : "free(bad handle) ";
    return 0;
}
#endif
