// CPU description parsing, the record read from kernel-like folders, the record this machine yields
// (checked against the kernel's files) and the loader defaults drawn from it.
#include "ka/cpu_info.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <tuple>

#include "platform/cpu_info.h"
#include "platform/lib_loader.h"

namespace {

namespace fs = std::filesystem;

const char kArmV7Board[] =
    "Processor\t: ARMv7 Processor rev 10 (v7l)\nBogoMIPS\t: 790.52\n\n"
    "Features\t: swp half vfp edsp neon vfpv3 tls \nCPU architecture: 7\nHardware\t: i.MX6\n";
const char k64BitKernel[] =
    "processor\t: 0\nFeatures\t: fp asimd evtstrm aes crc32 cpuid\nCPU architecture: 8\n";

auto Fields(const CpuInfoRecord& r) {
    return std::make_tuple(r.type, r.features, r.count, r.maxCpuSpeed, r.minCpuSpeed);
}

// Feature bits: 1 ARMv7, 2 VFPv3, 4 NEON, 8 ARMv6.
TEST(ParseFeatures, YieldsTheFeatureBits) {
    // clang-format off
    const std::pair<std::string, uint64_t> cases[] = {
        {kArmV7Board, 15}, {k64BitKernel, 9},
        {"Processor\t: ARMv6-compatible rev 7 (v6l)\nFeatures\t: vfp\nCPU architecture: 7\n", 8},
        {"CPU architecture: 6\n", 8}, {"CPU architecture: 5TEJ\n", 0},
        {"CPU architecture:7\n", 0}, {"CPU architecture\n", 0},
        {"model name\t: x CPU architecture: 5\nCPU architecture: 7\n", 9},  // a name starts a line
        {"CPU architecture\nX: 7\n", 9}, {"CPU architecture\t: \nX: 7\n", 0},  // the first colon
        {"Features\t: neonx neon2 vfpv3x vfpv\n", 0}, {"Features\t: swp vfp vfpv3d16\n", 2},
        {"Features\t: vfp\tneon\t\n", 6}, {"CPU architecture: 7\nFeatures\t: neon", 15}};
    // clang-format on
    for (auto [text, expected] : cases) {
        EXPECT_EQ(CCpuInfo::parse_features(text.data(), static_cast<int>(text.size())), expected)
            << text;
    }
}

struct TempDir {
    TempDir() { EXPECT_NE(mkdtemp(path.data()), nullptr); }
    ~TempDir() { fs::remove_all(path, ignored); }
    std::string path = testing::TempDir() + "cpu_info_XXXXXX";
    std::error_code ignored;
};

// A folder laid out like the kernel's. The core count comes from the highest odd-numbered cpuN
// folder, at most cpu21.
TEST(CpuDescription, RecordFromTheKernelFiles) {
    // Read up to 10 KiB: "ne" is cut from "neon".
    const std::string cutAtTheLimit = std::string(10240 - 19, '\n') + "Features\t: vfpv3 neon\n";
    // clang-format off
    const struct { const char* files[4]; int cores; CpuInfoRecord expected; } cases[] = {
        // {cpuinfo, -, max, min} (null: no such file), cpu0 to cpuN-1, the record
        {{nullptr, "", "1800000\n", "300000\n"}, 8, {0, 0, 1, 0, 0}},
        {{kArmV7Board, "", "1800000\n", "300000"}, 8, {1, 15, 8, 1800000, 300000}},
        {{k64BitKernel, "", nullptr, "408000\n"}, 2, {1, 9, 2, 0, 408000}},
        {{"", "", "", "fast\n"}, 3, {1, 0, 2, 0, 0}},
        {{"", "", nullptr, nullptr}, 30, {1, 0, 22, 0, 0}},
        {{cutAtTheLimit.c_str(), "", nullptr, nullptr}, 0, {1, 2, 1, 0, 0}}};
    // clang-format on
    for (const auto& c : cases) {
        TempDir dir;
        const std::string paths[] = {dir.path + "/info", dir.path, dir.path + "/max",
                                     dir.path + "/min"};
        for (int i : {0, 2, 3}) {
            if (c.files[i] != nullptr) std::ofstream(paths[i], std::ios::binary) << c.files[i];
        }
        for (int i = 0; i < c.cores; ++i)
            fs::create_directory(dir.path + "/cpu" + std::to_string(i));
        CpuInfoRecord info = {7, 7, 7, 7, 7};
        CCpuInfo::read_description(
            {paths[0].c_str(), paths[1].c_str(), paths[2].c_str(), paths[3].c_str()}, &info);
        EXPECT_EQ(Fields(info), Fields(c.expected)) << (c.files[0] ? c.files[0] : "no description");
    }
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

TEST(LoaderDefaults, VariantSuffixOnlyForArmWithNeon) {
    for (auto [type, features, suffix] : {std::tuple{1, 15u, "_v7.so"}, {1, 9u, ""}, {0, 4u, ""}}) {
        CLibLoader loader(const_cast<char*>("kaVidDec"));
        ka::ApplyCpuRecord(loader, {type, features, 3, 0, 0});
        EXPECT_STREQ(loader.mLibSuffix, suffix) << type << " " << features;
        EXPECT_EQ(loader.mCpuCount, 3);
    }
}

}  // namespace
