// Sleeps, clocks, the application's path and CPU figures.
#include "ka/os_utils.h"

#include <gtest/gtest.h>
#include <time.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <string>
#include <thread>

#include "ka/cpu_info.h"

namespace {

using Clock = std::chrono::steady_clock;

int64_t MsSince(Clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count();
}

int64_t ThreadCpuMs() {
    timespec t = {};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &t);
    return static_cast<int64_t>(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

// Each test runs in a process of its own, so this is the tick clock's first reading.
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
    EXPECT_LT(afterSleep - threadMs, 20u);
    const int64_t cpuStart = ThreadCpuMs();  // wall time says little on shared cores
    while (ThreadCpuMs() - cpuStart < 50 && MsSince(start) < 5000) {
    }
    EXPECT_NEAR(ThreadCpuMs() - cpuStart, GetThreadTimeMs(nullptr) - afterSleep, 5);
}

TEST(Wait, EndsAtTheDeadlineOrWhenTheFlagHoldsOne) {
    KA_BOOL two = 2, one = 1;
    // clang-format off
    const struct { uint32_t ms; KA_BOOL* flag; int64_t atLeast, below; } cases[] = {
        {60, nullptr, 59, 5000}, {60, &two, 59, 5000}, {10000, &one, 5, 2000}};  // at least one step
    // clang-format on
    for (const auto& c : cases) {
        const auto start = Clock::now();
        WaitMs(c.ms, c.flag);
        EXPECT_GE(MsSince(start), c.atLeast) << c.ms;
        EXPECT_LT(MsSince(start), c.below) << c.ms;
    }
}

TEST(AppPath, PathAndDirectoryOfTheTestBinary) {
    char exe[4096] = {}, buffer[4096];
    ASSERT_GT(readlink("/proc/self/exe", exe, sizeof(exe) - 1), 0);
    const std::string path = exe;
    const int length = static_cast<int>(path.size());
    EXPECT_EQ(length, GetAppPath(nullptr, buffer, sizeof(buffer)));
    EXPECT_EQ(path, buffer);
    ASSERT_EQ(0, GetAppDir(buffer, sizeof(buffer)));
    EXPECT_EQ(path.substr(0, path.rfind('/') + 1), buffer);
    // Too small: what fits, no terminator, nothing past the end.
    memset(buffer, '#', sizeof(buffer));
    EXPECT_EQ(length, GetAppPath(nullptr, buffer, length));
    EXPECT_EQ(path + "#", std::string(buffer, length + 1));
    memset(buffer, '#', sizeof(buffer));
    EXPECT_EQ(length, GetAppDir(buffer, 4));
    EXPECT_EQ(path.substr(0, 4) + "#", std::string(buffer, 5));
}

// A running flag of 0 ends at once with the previous figures: zero on the first call.
TEST(Cpu, LoadMeasuresAndStopsEarlyWithThePreviousFigures) {
    uint32_t system = 7, user = 7;
    KA_BOOL running = 0;
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(nullptr, &user, &running, 1, 100));
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(&system, nullptr, &running, 1, 100));
    EXPECT_EQ(0xFFFFFFFFu, GetCpuLoad(&system, &user, nullptr, 1, 100));
    auto start = Clock::now();
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    EXPECT_LT(MsSince(start), 500);
    EXPECT_EQ(0u, system + user);

    running = 1;
    start = Clock::now();
    std::thread busy([] {
        for (const auto begin = Clock::now(); MsSince(begin) < 900;) {
        }
    });
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    busy.join();
    EXPECT_GE(MsSince(start), 1000);
    EXPECT_LE(system + user, 100u);
    EXPECT_GT(system + user, 0u);

    const uint32_t measured[] = {system, user};
    running = 0;
    EXPECT_EQ(0u, GetCpuLoad(&system, &user, &running, 1, 100));
    EXPECT_EQ(measured[0], system);
    EXPECT_EQ(measured[1], user);
}

TEST(System, CoresFrequencyAndEpochSeconds) {
    CpuInfoRecord record = {};  // its count is checked against the kernel's folders
    ASSERT_EQ(get_cpu_info(&record), 0);
    EXPECT_EQ(record.count, GetCpuCount());
    // A ratio only when the kernel reports a maximum frequency.
    uint32_t ratio = 12345678;
    const bool known = access("/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq", R_OK) == 0;
    EXPECT_EQ(known ? 1 : 0, GetCpuFrequency(&ratio));
    EXPECT_TRUE(known ? ratio <= 20000u : ratio == 12345678u) << ratio;
    EXPECT_EQ(known ? 1 : 0, GetCpuFrequency(nullptr));
    const int64_t now = static_cast<int64_t>(time(nullptr));
    EXPECT_GE(GetTimeSeconds(), now);
    EXPECT_LE(GetTimeSeconds(), now + 5);
}

}  // namespace
