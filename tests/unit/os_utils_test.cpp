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

// This thread's CPU time by the kernel's count.
int64_t CpuMs() {
    timespec t = {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
    return static_cast<int64_t>(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

// Declared first: the tick base is taken by the process's first reading.
TEST(Clocks, CountUpAndThreadTimeCountsOnlyThisThreadsWork) {
    EXPECT_EQ(0u, GetTickCountMs());
    const uint64_t ns = GetTimeNs();
    const uint32_t threadMs = GetThreadTimeMs(nullptr);
    const auto start = Clock::now();
    EXPECT_EQ(0, SleepMs(30));
    EXPECT_GE(MsSince(start), 30);
    EXPECT_GE(GetTickCountMs(), 30u);
    EXPECT_LT(GetTickCountMs(), 5000u);
    EXPECT_GE(GetTimeNs() - ns, 30000000u);
    const uint32_t afterSleep = GetThreadTimeMs(nullptr);
    EXPECT_LT(afterSleep - threadMs, 20u);  // sleeping costs no CPU time
    // 50 ms of CPU (wall time says little on shared cores), with a wall-clock bound.
    const int64_t cpuStart = CpuMs();
    while (CpuMs() - cpuStart < 50 && MsSince(start) < 5000) {
    }
    EXPECT_NEAR(CpuMs() - cpuStart, GetThreadTimeMs(nullptr) - afterSleep, 5);
}

TEST(Wait, EndsAtTheDeadlineOrWhenTheFlagHoldsOne) {
    const struct {
        uint32_t ms;
        bool withFlag;
        KA_BOOL flag;
        int64_t atLeast, below;
        int setAfterMs;  // another thread stores 1 then; -1: never
    } cases[] = {
        {60, false, 0, 59, 5000, -1},  // the deadline is in whole ticks
        {60, true, 2, 59, 5000, -1},   // only 1 stops
        {10000, true, 1, 5, 2000, -1},  {0, false, 0, 5, 5000, -1},  // always one 5 ms step
        {20000, true, 0, 45, 5000, 50},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.ms) + " flag " + std::to_string(c.flag));
        KA_BOOL flag = c.flag;
        std::thread setter([&flag, &c] {
            if (c.setAfterMs < 0) return;
            std::this_thread::sleep_for(std::chrono::milliseconds(c.setAfterMs));
            __atomic_store_n(&flag, 1, __ATOMIC_RELAXED);
        });
        const auto start = Clock::now();
        WaitMs(c.ms, c.withFlag ? &flag : nullptr);
        setter.join();
        EXPECT_GE(MsSince(start), c.atLeast);
        EXPECT_LT(MsSince(start), c.below);
    }
}

TEST(AppPath, PathAndDirectoryOfTheTestBinary) {
    char expected[4096] = {};
    ASSERT_GT(readlink("/proc/self/exe", expected, sizeof(expected) - 1), 0);
    const std::string path = expected;
    char buffer[4096];
    memset(buffer, 'x', sizeof(buffer));
    EXPECT_EQ(static_cast<int>(path.size()), GetAppPath(nullptr, buffer, sizeof(buffer)));
    EXPECT_EQ(path, buffer);
    ASSERT_EQ(0, GetAppDir(buffer, sizeof(buffer)));
    EXPECT_EQ(path.substr(0, path.rfind('/') + 1), buffer);
    // Too small: the length, and the buffer left unterminated.
    memset(buffer, '#', 8);
    EXPECT_EQ(static_cast<int>(path.size()), GetAppDir(buffer, 4));
    EXPECT_EQ(0, memcmp(buffer, path.data(), 4));
    EXPECT_EQ('#', buffer[4]);
}

TEST(Cpu, CountIsTheHighestOddCoreFolderPlusOne) {
    int expected = 1;
    for (int n = 21; n >= 1 && expected == 1; n -= 2) {
        if (access(("/sys/devices/system/cpu/cpu" + std::to_string(n)).c_str(), F_OK) == 0) {
            expected = n + 1;
        }
    }
    EXPECT_EQ(expected, GetCpuCount());
    EXPECT_EQ(expected, GetCpuNum());
}

TEST(Cpu, LoadMeasuresAndStopsEarlyWithThePreviousFigures) {
    uint32_t system = 7, user = 7;
    KA_BOOL running = 0;
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(nullptr, &user, &running, 1, 100));
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(&system, nullptr, &running, 1, 100));
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(&system, &user, nullptr, 1, 100));
    // Not running on the first call: the stored figures, zero so far, at once.
    auto start = Clock::now();
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    EXPECT_LT(MsSince(start), 500);
    EXPECT_EQ(0u, system + user);

    running = 1;
    start = Clock::now();
    std::thread busy([] {
        const auto begin = Clock::now();
        while (MsSince(begin) < 900) {
        }
    });
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    busy.join();
    EXPECT_GE(MsSince(start), 1000);  // ten waits of 100 ms
    EXPECT_LE(system + user, 100u);
    EXPECT_GT(system + user, 0u);  // one thread spun for most of the second

    // Not running again: the measured figures.
    const uint32_t measured[] = {system, user};
    running = 0;
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    EXPECT_EQ(measured[0], system);
    EXPECT_EQ(measured[1], user);
}

TEST(System, FrequencyEpochSecondsAndName) {
    // The frequency ratio only when the kernel reports a maximum frequency.
    uint32_t ratio = 12345678;
    const bool known = access("/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq", R_OK) == 0;
    EXPECT_EQ(known ? 1 : 0, GetCpuFrequency(&ratio));
    EXPECT_TRUE(known ? ratio <= 20000u : ratio == 12345678u) << ratio;
    EXPECT_EQ(known ? 1 : 0, GetCpuFrequency(nullptr));
    const int64_t now = static_cast<int64_t>(time(nullptr));
    EXPECT_GE(GetTimeSeconds(), now);
    EXPECT_LE(GetTimeSeconds(), now + 5);
    EXPECT_STREQ("Android", GetOSName());
}

}  // namespace
