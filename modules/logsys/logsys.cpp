// Stand-in for the platform's logging library libkaLogSys.so: every line goes to standard error
// (to logcat on Android), and result codes get a readable text.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <type_traits>

#include "ka/result_codes.h"
#include "log_library_api.h"

#if defined(__ANDROID__)
#include <android/log.h>
#endif

#define KA_LOGSYS_API extern "C" __attribute__((visibility("default")))

namespace {

// The library's maximum level: the facade passes what it lets through, all of it is written.
constexpr int kMaxLevel = 0;

int WriteLine(const char* channel, int level, const char* text) {
    if (text == nullptr) return -1;
#if defined(__ANDROID__)
    int priority = level <= 0 ? ANDROID_LOG_INFO : ANDROID_LOG_DEBUG;
    return __android_log_print(priority, "kaLogSys", "%s", text) < 0 ? -1 : 0;
#else
    const size_t length = strlen(text);
    // The facade ends each line with a newline unless the message filled its buffer.
    const char* end = length != 0 && text[length - 1] == '\n' ? "" : "\n";
    return fprintf(stderr, "[kaLogSys %s %d] %s%s", channel, level, text, end) < 0 ? -1 : 0;
#endif
}

const char* DescribeCode(uint32_t code) {
    switch (code) {
        case KA_OK:
            return "success";
        case KA_ERR_MODULE_NOT_LOADED:
            return "an auxiliary module is not loaded";
        case KA_ERR_LOAD_FAILED:
            return "the document could not be loaded";
        case KA_ERR_NULL_ARGUMENT:
            return "null handle or argument";
        case KA_ERR_DOWNLOAD_TIMEOUT:
            return "download timed out";
        case KA_ERR_DOWNLOAD_FAILED:
            return "download failed";
        case KA_ERR_DOWNLOAD_OPEN:
            return "download could not be opened";
        default:
            return "unknown error";
    }
}

}  // namespace

KA_LOGSYS_API int kaLogDllInit() { return 0; }

KA_LOGSYS_API int kaLogDllGetMaxLevel() { return kMaxLevel; }

KA_LOGSYS_API int kaLogDllLogPrint(int level, const char* text) {
    return WriteLine("log", level, text);
}

KA_LOGSYS_API int kaLogDllLogPrintEx(int level, const char* text) {
    return WriteLine("ex", level, text);
}

KA_LOGSYS_API int kaLogDllLogPrintL0(int level, const char* text) {
    return WriteLine("l0", level, text);
}

KA_LOGSYS_API int kaLogDllUninit() { return 0; }

KA_LOGSYS_API int kaLogDllLogGetErrMsg(uint32_t code, char* buffer) {
    if (buffer == nullptr) return -1;
    snprintf(buffer, ka::kLogErrorTextSize, "0x%08x: %s", code, DescribeCode(code));
    return 0;
}

// Messages forwarded from another process; written like any other line.
KA_LOGSYS_API int kaLogDllLogPrint_rpc(int level, const char* text) {
    return WriteLine("rpc", level, text);
}

// No parameters are known to the stand-in.
KA_LOGSYS_API int kaLogDllSetParam(int /*id*/, void* /*value*/) { return -1; }

// The entries have the types the library resolves them as.
static_assert(std::is_same<decltype(&kaLogDllInit), ka::LogDllInitFn>::value, "kaLogDllInit");
static_assert(std::is_same<decltype(&kaLogDllGetMaxLevel), ka::LogDllGetMaxLevelFn>::value,
              "kaLogDllGetMaxLevel");
static_assert(std::is_same<decltype(&kaLogDllLogPrint), ka::LogDllPrintFn>::value &&
                  std::is_same<decltype(&kaLogDllLogPrintEx), ka::LogDllPrintFn>::value &&
                  std::is_same<decltype(&kaLogDllLogPrintL0), ka::LogDllPrintFn>::value &&
                  std::is_same<decltype(&kaLogDllLogPrint_rpc), ka::LogDllPrintFn>::value,
              "the print entries");
static_assert(std::is_same<decltype(&kaLogDllUninit), ka::LogDllUninitFn>::value, "kaLogDllUninit");
static_assert(std::is_same<decltype(&kaLogDllLogGetErrMsg), ka::LogDllGetErrMsgFn>::value,
              "kaLogDllLogGetErrMsg");
static_assert(std::is_same<decltype(&kaLogDllSetParam), ka::LogDllSetParamFn>::value,
              "kaLogDllSetParam");
