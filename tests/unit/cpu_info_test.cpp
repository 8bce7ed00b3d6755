// CPU description parsing, the record read from kernel-like folders, the record this machine yields
// (checked against the kernel's files) and the loader defaults drawn from it.
#include "ka/cpu_info.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <thread>

#include "case_file.h"
#include "platform/cpu_info.h"
#include "platform/lib_loader.h"

namespace {

namespace fs = std::filesystem;

// The record's fields, "type features count max min".
std::string Fields(const CpuInfoRecord& r) {
    return std::to_string(r.type) + " " + std::to_string(r.features) + " " +
           std::to_string(r.count) + " " + std::to_string(r.maxCpuSpeed) + " " +
           std::to_string(r.minCpuSpeed);
}

// Feature bits parsed from description texts, records read from kernel-like folders and the loader
// variants drawn from a record: the rows of tests/data/cpu_cases.txt.
TEST(CpuDescription, FeaturesAndRecordsFromTheKernelFiles) {
    auto rows = katest::ReadCases(KA_TEST_DATA_DIR "cpu_cases.txt");
    for (auto& row : rows) {
        SCOPED_TRACE(row[0] + " " + row[1].substr(0, 80));
        if (row[0] == "features") {
            EXPECT_EQ(CCpuInfo::parse_features(&row[1][0], static_cast<int>(row[1].size())),
                      std::stoull(row[2]));
            continue;
        }
        if (row[0] == "loader") {  // the core count is kept
            CLibLoader loader(const_cast<char*>("kaVidDec"));
            ka::ApplyCpuRecord(loader, {std::stoi(row[1]), std::stoull(row[2]), 3, 0, 0});
            EXPECT_STREQ(loader.mLibSuffix, row[3].c_str());
            EXPECT_EQ(loader.mCpuCount, 3);
            continue;
        }
        std::string dir = testing::TempDir() + "cpu_info_XXXXXX";
        ASSERT_NE(mkdtemp(&dir[0]), nullptr);
        const std::string paths[] = {dir + "/info", dir + "/max", dir + "/min"};
        for (int i = 0; i < 3; ++i) {
            if (row[i + 1] != "-") std::ofstream(paths[i], std::ios::binary) << row[i + 1];
        }
        for (int i = 0; i < std::stoi(row[4]); ++i)
            fs::create_directory(dir + "/cpu" + std::to_string(i));
        CpuInfoRecord info = {7, 7, 7, 7, 7};
        CCpuInfo::read_description(
            {paths[0].c_str(), dir.c_str(), paths[1].c_str(), paths[2].c_str()}, &info);
        fs::remove_all(dir);
        EXPECT_EQ(Fields(info), row[5]);
    }
    EXPECT_EQ(rows.size(), 23u);
}

// The first callers, at once, get what the kernel's files hold; the loaders' defaults follow.
TEST(CpuInfoOnThisMachine, RecordAndLoaderDefaults) {
    EXPECT_EQ(get_cpu_info(nullptr), -1);
    CpuInfoRecord records[4];
    int results[4];
    std::thread threads[4];
    for (int i = 0; i < 4; ++i)
        threads[i] = std::thread([&, i] { results[i] = get_cpu_info(&records[i]); });
    for (auto& t : threads) t.join();

    std::ifstream in("/proc/cpuinfo", std::ios::binary);
    const bool readable = in.is_open();
    std::string text(10240, '\0'), cpu = "/sys/devices/system/cpu/cpu";
    text.resize(in.read(text.data(), text.size()).gcount());
    CpuInfoRecord expected = {readable ? KA_CPU_TYPE_ARM : KA_CPU_TYPE_UNKNOWN,
                              CCpuInfo::parse_features(text.data(), static_cast<int>(text.size())),
                              1, 0, 0};
    for (int n = 21; readable && n >= 1 && expected.count == 1; n -= 2) {
        if (fs::is_directory(cpu + std::to_string(n))) expected.count = n + 1;
    }
    if (readable) std::ifstream(cpu + "0/cpufreq/cpuinfo_max_freq") >> expected.maxCpuSpeed;
    if (readable) std::ifstream(cpu + "0/cpufreq/cpuinfo_min_freq") >> expected.minCpuSpeed;
    for (int i = 0; i < 4; ++i) {
        EXPECT_EQ(results[i], 0);
        EXPECT_EQ(Fields(records[i]), Fields(expected)) << i;
    }

    CLibLoader plain, named(const_cast<char*>("kaXMLParser"));
    for (const CLibLoader* loader : {&plain, &named}) {
        EXPECT_EQ(loader->mCpuCount, expected.count);
        EXPECT_STREQ(loader->mLibSuffix,
                     expected.type == 1 && (expected.features & 4) ? "_v7.so" : "");
    }
    CLibLoader video(const_cast<char*>("libkaVidDecH264"));  // decoders keep the plain defaults
    EXPECT_EQ(video.mCpuCount, 1);
    EXPECT_STREQ(video.mLibSuffix, "");
}

}  // namespace
