/* Logging through the platform's logging library libkaLogSys.so, which the host asks the library
 * to load. Until it is loaded every call is silently dropped, so the functions are always safe to
 * call. Messages are cut, never rejected, when longer than the buffer of the variant. */
#ifndef KA_LOGGING_H
#define KA_LOGGING_H

#include <stdint.h>

#include "ka/export.h"

#if defined(__GNUC__)
#define KA_PRINTF_FORMAT(fmt, args) __attribute__((format(printf, fmt, args)))
#else
#define KA_PRINTF_FORMAT(fmt, args)
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* Loads directory + "/" + "libkaLogSys.so" (no "/" added when the directory is empty or already
 * ends with one). 0 when every required entry was found, 0x90000001 otherwise. Call it before
 * logging starts; a second call replaces the first library without closing it. */
KA_API uint32_t kaLoadModule0x010d0000(const char* directory);

/* Both return 0 and do nothing else. */
KA_API uint32_t kalogInit0x010d0000(void);
KA_API uint32_t kalogUninit0x010d0000(void);

/* Formatted messages. Level-checked variants drop levels above the maximum level (0). The plain
 * ones cut a message at 2047 characters, the _Extend ones at 5119; a newline is added when it
 * fits. */
KA_API void kalogPrint0x010d0000(int level, const char* format, ...) KA_PRINTF_FORMAT(2, 3);
KA_API void kalogPrint_Extend0x010d0000(int level, const char* format, ...) KA_PRINTF_FORMAT(2, 3);
/* Not level-checked. */
KA_API void kalogPrintEx0x010d0000(int level, const char* format, ...) KA_PRINTF_FORMAT(2, 3);
KA_API void kalogPrintL00x010d0000(int level, const char* format, ...) KA_PRINTF_FORMAT(2, 3);
KA_API void kalogPrintL0_Extend0x010d0000(int level, const char* format, ...)
    KA_PRINTF_FORMAT(2, 3);

/* A text passed as it is (no formatting), cut at 4094 characters, plus a newline. */
KA_API void kalogPrint_ConstStr0x010d0000(int level, const char* text);
KA_API void kalogPrintL0_ConstStr0x010d0000(int level, const char* text);

/* The logging library's text for a result code, in one static 2048-byte buffer shared by every
 * caller and overwritten by the next call; empty when no logging library is loaded. */
KA_API const char* kalogGetErrMsg0x010d0000(uint32_t code);

#ifdef __cplusplus
}
#endif

#endif /* KA_LOGGING_H */
