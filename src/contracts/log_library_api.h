// The logging library libkaLogSys.so: the entries the logging facade resolves by name in it
// ("kaLogDllInit", "kaLogDllGetMaxLevel", "kaLogDllLogPrint", "kaLogDllLogPrintEx",
// "kaLogDllLogPrintL0", "kaLogDllUninit", "kaLogDllLogGetErrMsg", "kaLogDllLogPrint_rpc" and the
// optional "kaLogDllSetParam"). Shared by the library and the stand-in logging library.
#pragma once

#include <cstddef>
#include <cstdint>

namespace ka {

// Only the print functions and the error text are called; the others must merely exist
// (kaLogDllSetParam not even that).
typedef int (*LogDllInitFn)();
typedef int (*LogDllGetMaxLevelFn)();
// Every print variant: a whole line, newline included unless the message filled its buffer.
typedef int (*LogDllPrintFn)(int level, const char* text);
typedef int (*LogDllUninitFn)();
// Writes the text of a result code into buffer, kLogErrorTextSize bytes.
typedef int (*LogDllGetErrMsgFn)(uint32_t code, char* buffer);
typedef int (*LogDllSetParamFn)(int id, void* value);

// Bytes of the buffer the facade hands kaLogDllLogGetErrMsg.
constexpr size_t kLogErrorTextSize = 2048;

}  // namespace ka
