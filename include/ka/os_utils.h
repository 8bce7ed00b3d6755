/* Small operating-system utilities for the host: sleeps, monotonic clocks, the application's
 * path, core count, CPU load and frequency. Clock bases and the CPU-load state are process-wide
 * and unlocked; GetCpuLoad is meant for one caller at a time. */
#ifndef KA_OS_UTILS_H
#define KA_OS_UTILS_H

#include <stdint.h>

#include "ka/export.h"
#include "ka/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Sleeps ms milliseconds; usleep's result. */
KA_API int SleepMs(uint32_t ms);

/* Waits, in steps of 5 ms, until ms milliseconds have passed or *stop holds 1 (stop may be
 * null); always sleeps at least once. The last clock_gettime result. */
KA_API int WaitMs(uint32_t ms, KA_BOOL* stop);

/* Milliseconds of the monotonic clock since the first call of this or WaitMs (0 on that call). */
KA_API uint32_t GetTickCountMs(void);

/* Nanoseconds of the monotonic clock. */
KA_API uint64_t GetTimeNs(void);

/* Milliseconds of the calling thread's CPU time since the first call of this function. */
KA_API uint32_t GetThreadTimeMs(void* unused);

/* Writes the executable's path into buffer (size bytes); its length, or -1. The path is
 * terminated only when it fits. */
KA_API int GetAppPath(void* unused, char* buffer, uint32_t size);

/* Writes the executable's directory, with its final "/", into buffer; 0 on success, otherwise
 * the failed path length (-1, or the length that did not fit). */
KA_API int GetAppDir(char* buffer, uint32_t size);

/* Number of CPU cores as the kernel lists them under /sys/devices/system/cpu (1 to 22). */
KA_API int GetCpuCount(void);
/* The same as GetCpuCount, under the second name hosts use. */
KA_API int GetCpuNum(void);

/* Measures CPU use over interval seconds (0 counts as 1), polling *running every step ms; a
 * running flag of 0 ends early with the figures of the previous call. Percentages are
 * 0xFFFFFFFF when no time passed between the two readings. 0, or 0xFFFFFFFF for a null
 * pointer. */
KA_API uint32_t GetCpuLoad(uint32_t* systemPercent, uint32_t* userPercent, KA_BOOL* running,
                           uint32_t interval, uint32_t step);

/* Current frequency of core 0 in hundredths of a percent of its maximum, into *ratio (may be
 * null); 1 on success, 0 when the maximum cannot be read. */
KA_API int GetCpuFrequency(uint32_t* ratio);

/* Seconds since the epoch. */
KA_API int64_t GetTimeSeconds(void);

/* The constant "Android". */
KA_API const char* GetOSName(void);

#ifdef __cplusplus
}
#endif

#endif /* KA_OS_UTILS_H */
