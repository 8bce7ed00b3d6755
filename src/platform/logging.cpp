// The exported logging family: formats a message and hands it to libkaLogSys.so, or drops it
// when that library is not loaded.
#include "platform/logging.h"

#include <dlfcn.h>

#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "ka/logging.h"
#include "ka/result_codes.h"

namespace {

// Zero at load: nothing is logged until the host loads the library.
ka::LogLibrary g_log = {};
char g_errorText[ka::kLogErrorTextSize];

template <typename Fn>
Fn Lookup(void* handle, const char* name) {
    return reinterpret_cast<Fn>(dlsym(handle, name));
}

enum class LevelCheck { kChecked, kUnchecked };

// Whether a message of this level goes to fn at all.
bool Passes(ka::LogDllPrintFn fn, LevelCheck check, int level) {
    if (g_log.handle == nullptr || fn == nullptr) return false;
    return check == LevelCheck::kUnchecked || level <= g_log.maxLevel;
}

// Formats into one buffer and adds the newline in a second of the same size, so a message that
// fills the first loses its newline rather than overrunning.
template <size_t N>
void PrintFormatted(ka::LogDllPrintFn fn, LevelCheck check, int level, const char* format,
                    va_list args) {
    if (!Passes(fn, check, level) || format == nullptr) return;
    char message[N] = {};
    char line[N] = {};
    vsnprintf(message, N, format, args);
    int written = snprintf(line, N, "%s\n", message);
    (void)written;  // a cut line is still logged
    fn(level, line);
}

void PrintText(ka::LogDllPrintFn fn, int level, const char* text) {
    if (!Passes(fn, LevelCheck::kChecked, level) || text == nullptr) return;
    char line[ka::kLogConstLineSize] = {};
    int written = snprintf(line, sizeof(line), "%s\n", text);
    (void)written;  // a cut line is still logged
    fn(level, line);
}

}  // namespace

namespace ka {

const LogLibrary& CurrentLogLibrary() { return g_log; }

void ForgetLogLibrary() { g_log = LogLibrary(); }

bool BuildLogLibraryPath(const char* directory, char* path, size_t size) {
    if (directory == nullptr || path == nullptr || size == 0) return false;
    const size_t length = strlen(directory);
    const bool slash = length != 0 && directory[length - 1] != '/';
    const char* const file = "libkaLogSys.so";
    int n = snprintf(path, size, "%s%s%s", directory, slash ? "/" : "", file);
    return n >= 0 && static_cast<size_t>(n) < size;
}

}  // namespace ka

uint32_t kaLoadModule0x010d0000(const char* directory) {
    char path[ka::kLogPathSize] = {};
    // A path that does not fit is refused rather than cut into the name of some other file.
    if (!ka::BuildLogLibraryPath(directory, path, sizeof(path))) return KA_ERR_MODULE_NOT_LOADED;

    // An earlier library stays open: prints on other threads may still be inside it.
    g_log.handle = dlopen(path, RTLD_NOW);
    if (g_log.handle == nullptr) return KA_ERR_MODULE_NOT_LOADED;

    void* handle = g_log.handle;
    g_log.init = Lookup<ka::LogDllInitFn>(handle, "kaLogDllInit");
    g_log.getMaxLevel = Lookup<ka::LogDllGetMaxLevelFn>(handle, "kaLogDllGetMaxLevel");
    g_log.print = Lookup<ka::LogDllPrintFn>(handle, "kaLogDllLogPrint");
    g_log.printEx = Lookup<ka::LogDllPrintFn>(handle, "kaLogDllLogPrintEx");
    g_log.printL0 = Lookup<ka::LogDllPrintFn>(handle, "kaLogDllLogPrintL0");
    g_log.uninit = Lookup<ka::LogDllUninitFn>(handle, "kaLogDllUninit");
    g_log.getErrMsg = Lookup<ka::LogDllGetErrMsgFn>(handle, "kaLogDllLogGetErrMsg");
    g_log.printRpc = Lookup<ka::LogDllPrintFn>(handle, "kaLogDllLogPrint_rpc");
    g_log.setParam = Lookup<ka::LogDllSetParamFn>(handle, "kaLogDllSetParam");

    // kaLogDllSetParam is optional: older logging libraries lack it.
    const bool complete = g_log.init != nullptr && g_log.getMaxLevel != nullptr &&
                          g_log.print != nullptr && g_log.printEx != nullptr &&
                          g_log.printL0 != nullptr && g_log.uninit != nullptr &&
                          g_log.getErrMsg != nullptr && g_log.printRpc != nullptr;
    return complete ? KA_OK : KA_ERR_MODULE_NOT_LOADED;
}

uint32_t kalogInit0x010d0000(void) { return KA_OK; }

uint32_t kalogUninit0x010d0000(void) { return KA_OK; }

void kalogPrint0x010d0000(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    PrintFormatted<ka::kLogLineSize>(g_log.print, LevelCheck::kChecked, level, format, args);
    va_end(args);
}

void kalogPrint_Extend0x010d0000(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    PrintFormatted<ka::kLogExtendedLineSize>(g_log.print, LevelCheck::kChecked, level, format,
                                             args);
    va_end(args);
}

void kalogPrintEx0x010d0000(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    PrintFormatted<ka::kLogLineSize>(g_log.printEx, LevelCheck::kUnchecked, level, format, args);
    va_end(args);
}

void kalogPrintL00x010d0000(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    PrintFormatted<ka::kLogLineSize>(g_log.printL0, LevelCheck::kChecked, level, format, args);
    va_end(args);
}

void kalogPrintL0_Extend0x010d0000(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    PrintFormatted<ka::kLogExtendedLineSize>(g_log.printL0, LevelCheck::kChecked, level, format,
                                             args);
    va_end(args);
}

void kalogPrint_ConstStr0x010d0000(int level, const char* text) {
    PrintText(g_log.print, level, text);
}

void kalogPrintL0_ConstStr0x010d0000(int level, const char* text) {
    PrintText(g_log.printL0, level, text);
}

const char* kalogGetErrMsg0x010d0000(uint32_t code) {
    memset(g_errorText, 0, sizeof(g_errorText));
    if (g_log.handle != nullptr && g_log.getErrMsg != nullptr) {
        g_log.getErrMsg(code, g_errorText);
        // The library may fill the whole buffer; the caller still gets a terminated string.
        g_errorText[sizeof(g_errorText) - 1] = '\0';
    }
    return g_errorText;
}
