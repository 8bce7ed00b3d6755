// Recording logging library for the facade's tests: remembers which entry was called with which
// level and text. Tests reach the fake_logsys_* functions by opening the same file.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

namespace {

struct Call {
    std::string function;
    int level;
    std::string text;
};

std::vector<Call> g_calls;
bool g_fillErrorBuffer = false;

int Record(const char* function, int level, const char* text) {
    g_calls.push_back({function, level, text != nullptr ? text : "(null)"});
    return 0;
}

}  // namespace

extern "C" {

void fake_logsys_reset() {
    g_calls.clear();
    g_fillErrorBuffer = false;
}
int fake_logsys_count() { return static_cast<int>(g_calls.size()); }
const char* fake_logsys_function(int i) { return g_calls.at(i).function.c_str(); }
int fake_logsys_level(int i) { return g_calls.at(i).level; }
const char* fake_logsys_text(int i) { return g_calls.at(i).text.c_str(); }
// The next error texts fill the whole buffer with 'x' and no terminator.
void fake_logsys_fill_error_buffer(int on) { g_fillErrorBuffer = on != 0; }

// Entries the facade never calls: calling them is recorded too, so a test would see it.
int kaLogDllInit() { return Record("kaLogDllInit", 0, ""); }
int kaLogDllGetMaxLevel() { return Record("kaLogDllGetMaxLevel", 0, ""); }
int kaLogDllUninit() { return Record("kaLogDllUninit", 0, ""); }
#define KA_FAKE_PRINT(name) \
    int name(int level, const char* text) { return Record(#name, level, text); }
#if !defined(KA_FAKE_WITHOUT_RPC)
KA_FAKE_PRINT(kaLogDllLogPrint_rpc)
#endif
#if !defined(KA_FAKE_WITHOUT_SETPARAM)
int kaLogDllSetParam(int id, void* /*value*/) { return Record("kaLogDllSetParam", id, ""); }
#endif
KA_FAKE_PRINT(kaLogDllLogPrint)
KA_FAKE_PRINT(kaLogDllLogPrintEx)
KA_FAKE_PRINT(kaLogDllLogPrintL0)

// The facade passes a 2048-byte buffer.
int kaLogDllLogGetErrMsg(uint32_t code, char* buffer) {
    Record("kaLogDllLogGetErrMsg", static_cast<int>(code), "");
    if (g_fillErrorBuffer) {
        memset(buffer, 'x', 2048);
    } else {
        snprintf(buffer, 2048, "fake error 0x%08x", code);
    }
    return 0;
}

}  // extern "C"
