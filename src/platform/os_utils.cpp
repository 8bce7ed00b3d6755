// Sleeps, clocks, the application's path and CPU figures over Linux system calls and the
// kernel's /proc and /sys files.
#include "ka/os_utils.h"

#include <time.h>
#include <unistd.h>

#include <atomic>
#include <climits>
#include <cstdio>
#include <cstring>

#include "platform/cpu_info.h"

namespace {

// A clock base: the first reading of a clock, zero until taken. The first readings of two
// threads may race; either one is a valid base.
struct ClockBase {
    std::atomic<int64_t> seconds{0};
    std::atomic<int64_t> nanoseconds{0};
};

ClockBase gTickBase;
ClockBase gThreadTimeBase;

// CPU-load state: kept between calls so that an early end reports the previous figures.
struct CpuLoadState {
    uint32_t interval = 0;
    uint32_t step = 0;
    KA_BOOL* running = nullptr;
    bool busy = false;
    uint32_t systemPercent = 0;
    uint32_t userPercent = 0;
};
CpuLoadState gCpuLoad;

std::atomic<uint64_t> gMaxCpuFrequency{0};

// Milliseconds of clock since its base, taking this reading as the base when there is none.
uint32_t ElapsedMs(clockid_t clock, ClockBase& base, int* result) {
    timespec now = {};
    int r = clock_gettime(clock, &now);
    if (result != nullptr) *result = r;
    if (base.seconds.load(std::memory_order_relaxed) == 0 &&
        base.nanoseconds.load(std::memory_order_relaxed) == 0) {
        base.seconds.store(now.tv_sec, std::memory_order_relaxed);
        base.nanoseconds.store(now.tv_nsec, std::memory_order_relaxed);
    }
    int64_t ms =
        (static_cast<int64_t>(now.tv_sec) - base.seconds.load(std::memory_order_relaxed)) * 1000 +
        (static_cast<int64_t>(now.tv_nsec) - base.nanoseconds.load(std::memory_order_relaxed)) /
            1000000;
    return static_cast<uint32_t>(ms);
}

bool FlagHolds(const KA_BOOL* flag, KA_BOOL value) {
    // Written by another thread of the host: read it afresh every time.
    return flag != nullptr && *static_cast<const volatile KA_BOOL*>(flag) == value;
}

struct CpuTimes {
    unsigned long values[7];  // user, nice, system, idle, iowait, irq, softirq
};

// The first line of /proc/stat; false when the file cannot be read or nothing converts.
bool ReadCpuTimes(CpuTimes* times) {
    memset(times, 0, sizeof(*times));
    FILE* file = fopen("/proc/stat", "r");
    if (file == nullptr) return false;
    unsigned long* v = times->values;
    int converted = fscanf(file, "cpu  %lu %lu %lu %lu %lu %lu %lu", &v[0], &v[1], &v[2], &v[3],
                           &v[4], &v[5], &v[6]);
    fclose(file);
    return converted > 0;
}

// One unsigned number from a kernel file; false when it cannot be read.
bool ReadNumber(const char* path, unsigned long* value) {
    FILE* file = fopen(path, "r");
    if (file == nullptr) return false;
    int converted = fscanf(file, "%lu", value);
    fclose(file);
    return converted == 1;
}

}  // namespace

int SleepMs(uint32_t ms) { return usleep(static_cast<useconds_t>(ms) * 1000); }

int WaitMs(uint32_t ms, KA_BOOL* stop) {
    int result = 0;
    const uint32_t deadline = ElapsedMs(CLOCK_MONOTONIC, gTickBase, &result) + ms;
    for (;;) {
        usleep(5000);
        const uint32_t now = ElapsedMs(CLOCK_MONOTONIC, gTickBase, &result);
        if (static_cast<int32_t>(now - deadline) >= 0 || FlagHolds(stop, 1)) break;
    }
    return result;
}

uint32_t GetTickCountMs(void) { return ElapsedMs(CLOCK_MONOTONIC, gTickBase, nullptr); }

uint64_t GetTimeNs(void) {
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1000000000ull + static_cast<uint64_t>(now.tv_nsec);
}

uint32_t GetThreadTimeMs(void* /*unused*/) {
    return ElapsedMs(CLOCK_THREAD_CPUTIME_ID, gThreadTimeBase, nullptr);
}

int GetAppPath(void* /*unused*/, char* buffer, uint32_t size) {
    if (buffer == nullptr) return -1;
    ssize_t length = readlink("/proc/self/exe", buffer, size);
    if (length >= 0 && static_cast<size_t>(length) < size) buffer[length] = '\0';
    return static_cast<int>(length);
}

int GetAppDir(char* buffer, uint32_t size) {
    if (buffer == nullptr) return -1;
    ssize_t length = readlink("/proc/self/exe", buffer, size);
    if (length < 0) return -1;
    if (static_cast<size_t>(length) >= size) {
        // readlink stops at the buffer's end; the caller wants to know how much room it takes.
        char full[PATH_MAX];
        const ssize_t fullLength = readlink("/proc/self/exe", full, sizeof(full));
        return static_cast<int>(fullLength > length ? fullLength : length);
    }
    buffer[length] = '\0';
    char* cut = strrchr(buffer, '/');
    if (cut == nullptr) cut = strrchr(buffer, '\\');
    if (cut != nullptr) cut[1] = '\0';
    return 0;
}

// The probe of get_cpu_info's core count, made afresh on each call.
int GetCpuCount(void) { return CCpuInfo::count_cpu(); }

int GetCpuNum(void) { return CCpuInfo::count_cpu(); }

uint32_t GetCpuLoad(uint32_t* systemPercent, uint32_t* userPercent, KA_BOOL* running,
                    uint32_t interval, uint32_t step) {
    if (systemPercent == nullptr || userPercent == nullptr || running == nullptr) {
        return 0xFFFFFFFFu;
    }
    gCpuLoad.interval = interval;
    gCpuLoad.step = step;
    gCpuLoad.running = running;
    gCpuLoad.busy = true;

    CpuTimes first;
    CpuTimes second;
    bool measured = false;
    if (ReadCpuTimes(&first)) {
        bool stopped = false;
        const uint64_t seconds = interval == 0 ? 1 : interval;
        if (step != 0) {
            const uint64_t waits = seconds * 1000 / step;
            for (uint64_t i = 0; i < waits; ++i) {
                if (FlagHolds(running, 0)) {
                    stopped = true;
                    break;
                }
                SleepMs(step);
            }
        }
        measured = !stopped && ReadCpuTimes(&second);
    }

    if (measured) {
        uint64_t before = 0;
        uint64_t after = 0;
        for (int i = 0; i < 7; ++i) {
            before += first.values[i];
            after += second.values[i];
        }
        const uint64_t total = after - before;
        if (total == 0) {
            gCpuLoad.systemPercent = 0xFFFFFFFFu;
            gCpuLoad.userPercent = 0xFFFFFFFFu;
        } else {
            const uint64_t user =
                (second.values[0] + second.values[1]) - (first.values[0] + first.values[1]);
            const uint64_t system = second.values[2] - first.values[2];
            gCpuLoad.userPercent = static_cast<uint32_t>(user * 100 / total);
            gCpuLoad.systemPercent = static_cast<uint32_t>(system * 100 / total);
        }
    }
    gCpuLoad.busy = false;
    *systemPercent = gCpuLoad.systemPercent;
    *userPercent = gCpuLoad.userPercent;
    return 0;
}

int GetCpuFrequency(uint32_t* ratio) {
    if (gMaxCpuFrequency.load() == 0) {
        unsigned long maximum = 0;
        if (!ReadNumber("/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq", &maximum)) {
            return 0;
        }
        gMaxCpuFrequency.store(maximum);
    }
    unsigned long current = 0;
    if (!ReadNumber("/sys/devices/system/cpu/cpu0/cpufreq/scaling_cur_freq", &current)) {
        current = 0;
    }
    const uint64_t maximum = gMaxCpuFrequency.load();
    if (ratio != nullptr) {
        *ratio = maximum == 0 ? 0 : static_cast<uint32_t>(current * 10000ull / maximum);
    }
    return 1;
}

int64_t GetTimeSeconds(void) { return static_cast<int64_t>(time(nullptr)); }

const char* GetOSName(void) { return "Android"; }
