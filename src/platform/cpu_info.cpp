#include "platform/cpu_info.h"

#include <errno.h>
#include <fcntl.h>
#include <unistd.h>

#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

// The kernel's description of a many-core processor is long; what matters sits near its start.
constexpr unsigned long kDescriptionSize = 10240;

// Reads a frequency file as one decimal number; leaves speed alone when nothing came.
bool ReadSpeed(const char* path, char* buffer, unsigned long size, int32_t* speed) {
    memset(buffer, 0, size);
    // One byte short of the buffer, so the number is always terminated.
    int n = CCpuInfo::read_file(path, buffer, size - 1);
    if (n <= 0) return false;
    int value = 0;
    if (sscanf(buffer, "%d", &value) == 1) *speed = value;
    return true;
}

}  // namespace

int32_t CCpuInfo::mType = 0;
uint64_t CCpuInfo::mFeatures = 0;
int32_t CCpuInfo::mCount = 0;
int32_t CCpuInfo::mMaxCpuSpeed = 0;
int32_t CCpuInfo::mMinCpuSpeed = 0;
pthread_once_t CCpuInfo::mThread = PTHREAD_ONCE_INIT;

namespace ka {

const CpuInfoSources kKernelCpuSources = {
    "/proc/cpuinfo",
    "/sys/devices/system/cpu",
    "/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq",
    "/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_min_freq",
};

}  // namespace ka

int CCpuInfo::getInfo(CpuInfoRecord* info) {
    if (info == nullptr) return -1;
    int result = 0;
    // The acquire pairs with cpu_init's release of mCount: a reader that skips pthread_once
    // still sees every member that cpu_init wrote before it.
    if (__atomic_load_n(&mCount, __ATOMIC_ACQUIRE) == 0) result = pthread_once(&mThread, cpu_init);
    info->type = mType;
    info->features = mFeatures;
    info->count = mCount;
    info->maxCpuSpeed = mMaxCpuSpeed;
    info->minCpuSpeed = mMinCpuSpeed;
    return result;
}

void CCpuInfo::cpu_init() {
    CpuInfoRecord info;
    read_description(ka::kKernelCpuSources, &info);
    mType = info.type;
    mFeatures = info.features;
    mMaxCpuSpeed = info.maxCpuSpeed;
    mMinCpuSpeed = info.minCpuSpeed;
    __atomic_store_n(&mCount, info.count, __ATOMIC_RELEASE);
}

void CCpuInfo::read_description(const CpuInfoSources& sources, CpuInfoRecord* info) {
    info->type = KA_CPU_TYPE_UNKNOWN;
    info->features = 0;
    info->count = 1;
    info->maxCpuSpeed = 0;
    info->minCpuSpeed = 0;

    static_assert(kDescriptionSize <= 64 * 1024, "the description buffer lives on the stack");
    char buffer[kDescriptionSize] = {};
    int length = read_file(sources.cpuinfo, buffer, sizeof(buffer));
    if (length < 0) return;

    info->count = count_cpu_in(sources.cpuDir);
    info->type = KA_CPU_TYPE_ARM;
    info->features = parse_features(buffer, length);

    // A missing maximum does not hide the minimum.
    ReadSpeed(sources.maxFreq, buffer, sizeof(buffer), &info->maxCpuSpeed);
    ReadSpeed(sources.minFreq, buffer, sizeof(buffer), &info->minCpuSpeed);
}

uint64_t CCpuInfo::parse_features(char* buffer, int length) {
    uint64_t features = 0;

    char* architecture = extract_cpuinfo_field(buffer, length, "CPU architecture");
    if (architecture != nullptr) {
        char* end = architecture;
        long value = strtol(architecture, &end, 10);
        if (value >= 7 && end != architecture) {
            // ARMv6 cores on some boards report a later architecture; their name gives them away.
            char* processor = extract_cpuinfo_field(buffer, length, "Processor");
            if (processor == nullptr || !has_list_item(processor, "(v6l)")) {
                features |= KA_CPU_FEATURE_ARMV7;
            }
            free(processor);
        }
        if (value >= 6) features |= KA_CPU_FEATURE_ARMV6;
        free(architecture);
    }

    char* list = extract_cpuinfo_field(buffer, length, "Features");
    if (list != nullptr) {
        if (has_list_item(list, "vfpv3") || has_list_item(list, "vfpv3d16")) {
            features |= KA_CPU_FEATURE_VFPV3;
        }
        // NEON implies the VFPv3 register file.
        if (has_list_item(list, "neon")) features |= KA_CPU_FEATURE_VFPV3 | KA_CPU_FEATURE_NEON;
        free(list);
    }
    return features;
}

int CCpuInfo::count_cpu() { return count_cpu_in(ka::kKernelCpuSources.cpuDir); }

int CCpuInfo::count_cpu_in(const char* cpuDir) {
    if (cpuDir == nullptr) return 1;
    // Only odd numbers are probed: cores come in pairs on the devices this runs on.
    for (int n = 21; n >= 1; n -= 2) {
        char path[256];
        // A folder too long for the probe's path cannot be probed; a cut path would probe
        // something else.
        const int written = snprintf(path, sizeof(path), "%s/cpu%d", cpuDir, n);
        if (written < 0 || static_cast<size_t>(written) >= sizeof(path)) return 1;
        if (access(path, F_OK) == 0) return n + 1;
    }
    return 1;
}

char* CCpuInfo::extract_cpuinfo_field(char* buffer, int length, const char* name) {
    if (buffer == nullptr || name == nullptr || length <= 0) return nullptr;
    const size_t nameLength = strlen(name);
    const char* const end = buffer + length;

    // Only a name that starts a line is a field name.
    const char* field = nullptr;
    for (const char* line = buffer; line < end;) {
        if (static_cast<size_t>(end - line) >= nameLength && memcmp(line, name, nameLength) == 0) {
            field = line;
            break;
        }
        const void* newline = memchr(line, '\n', end - line);
        if (newline == nullptr) break;
        line = static_cast<const char*>(newline) + 1;
    }
    if (field == nullptr) return nullptr;

    const char* afterName = field + nameLength;
    const char* colon = static_cast<const char*>(memchr(afterName, ':', end - afterName));
    if (colon == nullptr || colon + 1 >= end || colon[1] != ' ') return nullptr;

    const char* value = colon + 2;
    const char* valueEnd = static_cast<const char*>(memchr(value, '\n', end - value));
    if (valueEnd == nullptr) valueEnd = end;
    const size_t valueLength = valueEnd - value;

    char* copy = static_cast<char*>(malloc(valueLength + 1));
    if (copy == nullptr) return nullptr;
    memcpy(copy, value, valueLength);
    copy[valueLength] = '\0';
    return copy;
}

int CCpuInfo::has_list_item(const char* list, const char* item) {
    if (list == nullptr || list[0] == '\0' || item == nullptr) return 0;
    const size_t itemLength = strlen(item);
    const char* p = list;
    while (*p != '\0') {
        while (*p == ' ' || *p == '\t') ++p;
        const char* word = p;
        while (*p != '\0' && *p != ' ' && *p != '\t') ++p;
        const size_t wordLength = p - word;
        if (wordLength != 0 && wordLength == itemLength && memcmp(word, item, itemLength) == 0) {
            return 1;
        }
    }
    return 0;
}

int CCpuInfo::read_file(const char* path, char* buffer, unsigned long size) {
    if (path == nullptr || buffer == nullptr) return -1;
    int fd = open(path, O_RDONLY | O_CLOEXEC);
    if (fd < 0) return -1;
    if (size > INT_MAX) size = INT_MAX;
    ssize_t n;
    do {
        n = read(fd, buffer, size);
    } while (n < 0 && errno == EINTR);
    close(fd);
    return static_cast<int>(n);
}

int get_cpu_info(CpuInfoRecord* info) { return CCpuInfo::getInfo(info); }
