// Process-wide state of the logging facade: the logging library's handle and entry points.
#pragma once

#include <cstddef>
#include <cstdint>

#include "log_library_api.h"

namespace ka {

// Buffer sizes of the print variants (the error text's is the logging library's contract).
constexpr size_t kLogPathSize = 1024;
constexpr size_t kLogLineSize = 2048;
constexpr size_t kLogExtendedLineSize = 5120;
constexpr size_t kLogConstLineSize = 4096;

struct LogLibrary {
    void* handle;  // dlopen handle; null: nothing is logged
    int maxLevel;  // level-checked prints pass levels up to this one
    LogDllInitFn init;
    LogDllGetMaxLevelFn getMaxLevel;
    LogDllPrintFn print;
    LogDllPrintFn printEx;
    LogDllPrintFn printL0;
    LogDllUninitFn uninit;
    LogDllGetErrMsgFn getErrMsg;
    LogDllPrintFn printRpc;
    LogDllSetParamFn setParam;
};

// The state as the exported functions see it.
const LogLibrary& CurrentLogLibrary();
// Forgets the loaded library (without closing it: its code may still be referenced) so that
// later calls are dropped again, as before the first load.
void ForgetLogLibrary();
// directory + "/" (unless empty or already there) + "libkaLogSys.so" into path; false when it
// does not fit.
bool BuildLogLibraryPath(const char* directory, char* path, size_t size);

}  // namespace ka
