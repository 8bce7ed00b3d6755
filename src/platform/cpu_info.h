// CCpuInfo reads the kernel's processor description once per process: whether the processor is
// ARM, its instruction-set features, the core count and core 0's frequency range.
#pragma once

#include <pthread.h>

#include <cstdint>

#include "ka/cpu_info.h"

// Where the description comes from; the real files in production, test files in tests.
struct CpuInfoSources {
    const char* cpuinfo;  // the processor description ("/proc/cpuinfo")
    const char* cpuDir;   // the folder holding cpu0, cpu1, ... ("/sys/devices/system/cpu")
    const char* maxFreq;  // core 0's maximum frequency file
    const char* minFreq;  // core 0's minimum frequency file
};

class CCpuInfo {
public:
    // Same as get_cpu_info.
    static int getInfo(CpuInfoRecord* info);
    // Fills the static members from the real files; run once under pthread_once.
    static void cpu_init();
    // Core count from the highest odd-numbered cpuN folder that exists (at most 22).
    static int count_cpu();
    // A malloc copy of the value of the field that starts a line, or null; the caller frees it.
    static char* extract_cpuinfo_field(char* buffer, int length, const char* name);
    // 1 when item is one of the blank-separated words of list.
    static int has_list_item(const char* list, const char* item);
    // One read of up to size bytes (retried on EINTR); the byte count, or -1.
    static int read_file(const char* path, char* buffer, unsigned long size);

    // The work of cpu_init on any set of files, into a record rather than the static members.
    static void read_description(const CpuInfoSources& sources, CpuInfoRecord* info);
    // The feature bits that a processor description of length bytes yields.
    static uint64_t parse_features(char* buffer, int length);
    // count_cpu over any folder laid out like the kernel's.
    static int count_cpu_in(const char* cpuDir);

    static int32_t mType;
    static uint64_t mFeatures;
    // Written last by cpu_init: a non-zero count means the other members are ready.
    static int32_t mCount;
    static int32_t mMaxCpuSpeed;
    static int32_t mMinCpuSpeed;
    static pthread_once_t mThread;
};

namespace ka {

// The real files cpu_init reads.
extern const CpuInfoSources kKernelCpuSources;

}  // namespace ka
