// Logging library that logs each call as "ENTRY LEVEL TEXT|"; the tests reach the fake_logsys_*
// functions by opening the same file.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>

namespace {
std::string gLog;
bool gFillErrorBuffer = false;

int Record(const char* entry, int level, const char* text) {
    gLog += std::string(entry) + " " + std::to_string(level) + " " + text + "|";
    return 0;
}
}  // namespace

extern "C" {

const char* fake_logsys_log() { return gLog.c_str(); }
// Clears the log; with fill set, error texts then fill the facade's whole 2048-byte buffer with
// 'x' and no terminator.
void fake_logsys_reset(int fill) {
    gLog.clear();
    gFillErrorBuffer = fill != 0;
}

int kaLogDllInit() { return Record("kaLogDllInit", 0, ""); }
int kaLogDllGetMaxLevel() { return Record("kaLogDllGetMaxLevel", 0, ""); }
int kaLogDllUninit() { return Record("kaLogDllUninit", 0, ""); }
#define KA_FAKE_PRINT(name) \
    int name(int level, const char* text) { return Record(#name, level, text); }
KA_FAKE_PRINT(kaLogDllLogPrint)
KA_FAKE_PRINT(kaLogDllLogPrintEx)
KA_FAKE_PRINT(kaLogDllLogPrintL0)
#ifndef KA_FAKE_WITHOUT_RPC
KA_FAKE_PRINT(kaLogDllLogPrint_rpc)
#endif
#ifndef KA_FAKE_WITHOUT_SETPARAM
int kaLogDllSetParam(int id, void* /*value*/) { return Record("kaLogDllSetParam", id, ""); }
#endif

int kaLogDllLogGetErrMsg(uint32_t code, char* buffer) {
    if (gFillErrorBuffer) {
        memset(buffer, 'x', 2048);
    } else {
        snprintf(buffer, 2048, "fake error 0x%08x", code);
    }
    return 0;
}

}  // extern "C"
