// Sleeps, clocks, the application's path and CPU figures.
#include "ka/os_utils.h"

#include <gtest/gtest.h>
#include <time.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <string>
#include <thread>

namespace {

using Clock = std::chrono::steady_clock;

int64_t MsSince(Clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count();
}

// Declared first: the tick base is taken by the process's first reading.
TEST(TickCount, FirstReadingIsZeroThenCountsUp) {
    EXPECT_EQ(0u, GetTickCountMs());
    SleepMs(30);
    const uint32_t later = GetTickCountMs();
    EXPECT_GE(later, 30u);
    EXPECT_LT(later, 5000u);
}

TEST(TickCount, IsMonotonic) {
    uint32_t previous = GetTickCountMs();
    for (int i = 0; i < 1000; ++i) {
        const uint32_t now = GetTickCountMs();
        ASSERT_GE(now, previous);
        previous = now;
    }
}

TEST(TimeNs, IsMonotonicAndAdvances) {
    const uint64_t first = GetTimeNs();
    SleepMs(10);
    const uint64_t second = GetTimeNs();
    EXPECT_GE(second - first, 10000000u);
}

TEST(ThreadTime, CountsOnlyThisThreadsWork) {
    GetThreadTimeMs(nullptr);
    const uint32_t before = GetThreadTimeMs(nullptr);
    SleepMs(50);  // sleeping costs no CPU time
    const uint32_t afterSleep = GetThreadTimeMs(nullptr);
    EXPECT_LT(afterSleep - before, 20u);

    // Spin until this thread has used 50 ms of CPU by the kernel's own count (other tests may
    // share the cores, so wall time says little), with a wall-clock bound.
    auto cpuMs = [] {
        timespec t = {};
        clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
        return static_cast<int64_t>(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
    };
    const int64_t cpuStart = cpuMs();
    const auto start = Clock::now();
    volatile uint64_t sink = 0;
    while (cpuMs() - cpuStart < 50 && MsSince(start) < 5000) sink = sink + 1;
    const int64_t used = cpuMs() - cpuStart;
    const int64_t reported = GetThreadTimeMs(nullptr) - afterSleep;
    EXPECT_GE(used, 50);
    EXPECT_NEAR(used, reported, 5);
}

TEST(Sleep, SleepsAtLeastTheTimeAsked) {
    const auto start = Clock::now();
    EXPECT_EQ(0, SleepMs(40));
    EXPECT_GE(MsSince(start), 40);
}

TEST(Wait, WaitsTheFullTimeWithoutFlag) {
    const auto start = Clock::now();
    WaitMs(60, nullptr);
    // The deadline is counted in whole milliseconds of the tick clock.
    EXPECT_GE(MsSince(start), 59);
}

TEST(Wait, AFlagOfTwoDoesNotStop) {
    KA_BOOL flag = 2;
    const auto start = Clock::now();
    WaitMs(60, &flag);
    EXPECT_GE(MsSince(start), 59);
}

TEST(Wait, AFlagOfOneEndsAfterOneStep) {
    KA_BOOL flag = 1;
    const auto start = Clock::now();
    WaitMs(10000, &flag);
    const int64_t elapsed = MsSince(start);
    EXPECT_GE(elapsed, 5);
    EXPECT_LT(elapsed, 2000);
}

TEST(Wait, ZeroSleepsOnce) {
    const auto start = Clock::now();
    WaitMs(0, nullptr);
    EXPECT_GE(MsSince(start), 5);
}

TEST(Wait, FlagSetFromAnotherThreadEndsTheWait) {
    KA_BOOL flag = 0;
    const auto start = Clock::now();
    std::thread setter([&flag] {
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        __atomic_store_n(&flag, 1, __ATOMIC_RELAXED);
    });
    WaitMs(20000, &flag);
    setter.join();
    EXPECT_LT(MsSince(start), 5000);
}

std::string ExecutablePath() {
    char buffer[4096] = {};
    const ssize_t n = readlink("/proc/self/exe", buffer, sizeof(buffer) - 1);
    return n > 0 ? std::string(buffer, static_cast<size_t>(n)) : std::string();
}

TEST(AppPath, IsTheTestBinary) {
    char buffer[4096];
    memset(buffer, 'x', sizeof(buffer));
    const int length = GetAppPath(nullptr, buffer, sizeof(buffer));
    ASSERT_GT(length, 0);
    EXPECT_EQ(ExecutablePath(), buffer);
    EXPECT_EQ(static_cast<size_t>(length), strlen(buffer));
    EXPECT_NE(std::string::npos, std::string(buffer).find("unit_os_utils_test"));
}

TEST(AppDir, KeepsTheFinalSeparator) {
    char buffer[4096];
    ASSERT_EQ(0, GetAppDir(buffer, sizeof(buffer)));
    const std::string path = ExecutablePath();
    EXPECT_EQ(path.substr(0, path.rfind('/') + 1), buffer);
}

TEST(AppDir, TooSmallBufferGivesTheLengthUnterminated) {
    const std::string path = ExecutablePath();
    char buffer[8];
    memset(buffer, '#', sizeof(buffer));
    EXPECT_EQ(static_cast<int>(path.size()), GetAppDir(buffer, 4));
    EXPECT_EQ(0, memcmp(buffer, path.data(), 4));
    EXPECT_EQ('#', buffer[4]);
}

TEST(CpuCount, MatchesTheKernelsCpuFolders) {
    // The count probes odd core numbers from 21 down, so it is the highest odd one present + 1.
    int expected = 1;
    for (int n = 21; n >= 1; n -= 2) {
        if (access(("/sys/devices/system/cpu/cpu" + std::to_string(n)).c_str(), F_OK) == 0) {
            expected = n + 1;
            break;
        }
    }
    EXPECT_EQ(expected, GetCpuCount());
    EXPECT_EQ(GetCpuCount(), GetCpuNum());
    const long online = sysconf(_SC_NPROCESSORS_CONF);
    if (online >= 2 && online <= 22) {
        EXPECT_GE(GetCpuCount(), static_cast<int>(online & ~1L));
    }
}

TEST(CpuLoad, NullPointersAreRefused) {
    uint32_t system = 0;
    uint32_t user = 0;
    KA_BOOL running = 1;
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(nullptr, &user, &running, 1, 100));
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(&system, nullptr, &running, 1, 100));
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(&system, &user, nullptr, 1, 100));
}

TEST(CpuLoad, MeasuresAndStopsEarlyWithThePreviousFigures) {
    uint32_t system = 7;
    uint32_t user = 7;
    KA_BOOL running = 0;
    // Not running on the first call: the stored figures, zero so far, at once.
    auto start = Clock::now();
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    EXPECT_LT(MsSince(start), 500);
    EXPECT_EQ(0u, system);
    EXPECT_EQ(0u, user);

    running = 1;
    start = Clock::now();
    std::thread busy([] {
        const auto begin = Clock::now();
        volatile uint64_t sink = 0;
        while (MsSince(begin) < 900) sink = sink + 1;
    });
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    busy.join();
    EXPECT_GE(MsSince(start), 1000);  // ten waits of 100 ms
    // A second of clock ticks (idle ones included) passed, so the figures are real ones.
    EXPECT_LE(system + user, 100u);
    EXPECT_GT(system + user, 0u);  // one thread spun for most of the second

    const uint32_t measuredSystem = system;
    const uint32_t measuredUser = user;
    running = 0;
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    EXPECT_EQ(measuredSystem, system);
    EXPECT_EQ(measuredUser, user);
}

TEST(CpuFrequency, ReportsOnlyWhenTheKernelDoes) {
    uint32_t ratio = 12345678;
    const bool known = access("/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq", R_OK) == 0;
    EXPECT_EQ(known ? 1 : 0, GetCpuFrequency(&ratio));
    if (known) {
        EXPECT_LE(ratio, 20000u);
    } else {
        EXPECT_EQ(12345678u, ratio);
    }
    EXPECT_EQ(known ? 1 : 0, GetCpuFrequency(nullptr));
}

TEST(TimeSeconds, IsTheEpochTime) {
    const int64_t now = static_cast<int64_t>(time(nullptr));
    const int64_t reported = GetTimeSeconds();
    EXPECT_GE(reported, now);
    EXPECT_LE(reported, now + 5);
}

TEST(OsName, IsAndroid) { EXPECT_STREQ("Android", GetOSName()); }

}  // namespace
