// CPU description parsing on descriptions held here, the probes of the core folders, and the
// record this machine yields, checked against the kernel's files.
#include "ka/cpu_info.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "platform/cpu_info.h"
#include "platform/lib_loader.h"

namespace {

namespace fs = std::filesystem;

// Feature bits: 1 ARMv7, 2 VFPv3, 4 NEON, 8 ARMv6.
static_assert(KA_CPU_FEATURE_ARMV7 == 1 && KA_CPU_FEATURE_VFPV3 == 2 && KA_CPU_FEATURE_NEON == 4 &&
              KA_CPU_FEATURE_ARMV6 == 8);

const char kArmV7Board[] =
    "Processor\t: ARMv7 Processor rev 10 (v7l)\nprocessor\t: 0\nBogoMIPS\t: 790.52\n\n"
    "Features\t: swp half thumb fastmult vfp edsp neon vfpv3 tls \n"
    "CPU implementer\t: 0x41\nCPU architecture: 7\nHardware\t: Freescale i.MX 6Quad\n";
const char k64BitKernel[] =
    "processor\t: 0\nFeatures\t: fp asimd evtstrm aes pmull sha1 sha2 crc32 cpuid\n"
    "CPU architecture: 8\nCPU part\t: 0xd03\n";
// Only the first 10 KiB of the description are read: a field past them, one within them, and a
// value cut by the limit ("ne" is not "neon").
const std::string kPastTheLimit = std::string(10240, '\n') + "CPU architecture: 7\n";
const std::string kWithinTheLimit = std::string(10200, '\n') + "CPU architecture: 7\n";
const std::string kCutAtTheLimit = std::string(10240 - 19, '\n') + "Features\t: vfpv3 neon\n";

auto Fields(const CpuInfoRecord& r) {
    return std::make_tuple(r.type, r.features, r.count, r.maxCpuSpeed, r.minCpuSpeed);
}

// parse_features is what cpu_init runs on the description it read.
TEST(ParseFeatures, YieldsTheFeatureBits) {
    const struct {
        const char* label;
        std::string text;
        uint64_t expected;
    } cases[] = {
        {"ArmV7BoardWithNeon", kArmV7Board, 15},
        {"SixtyFourBitKernelHasNoNeonWord", k64BitKernel, 9},
        {"V6lProcessorIsNotArmV7",
         "Processor\t: ARMv6-compatible processor rev 7 (v6l)\nFeatures\t: swp half thumb vfp "
         "edsp java tls\nCPU architecture: 7\n",
         8},
        {"V6lInsideAWordDoesNotCount", "Processor\t: ARMv7 (v6l)x\nCPU architecture: 7\n", 9},
        {"ArchitectureSixOnly", "CPU architecture: 6\n", 8},
        {"ArchitectureFiveNothing", "CPU architecture: 5TEJ\n", 0},
        {"ArchitectureWithoutBlankAfterColon", "CPU architecture:7\n", 0},
        {"FieldNamesInTheMiddleOfALine",
         "model name\t: x CPU architecture: 7\nflags\t: Features : neon vfpv3\n", 0},
        {"FieldNameLaterAtALineStart", "model name\t: x CPU architecture: 5\nCPU architecture: 7\n",
         9},
        {"WordsThatMerelyBeginWithNeon", "Features\t: neonx neon2 vfpv3x vfpv\n", 0},
        {"Vfpv3d16WithoutNeon", "Features\t: swp vfp vfpv3d16\n", 2},
        {"NeonAloneSetsVfpv3TabsSeparate", "Features\t: vfp\tneon\t\n", 6},
        {"LastLineWithoutNewline", "CPU architecture: 7\nFeatures\t: neon", 15},
        {"ColonOnALaterLine", "CPU architecture\nX: 7\n", 9},
        {"EmptyValueBeforeALaterColon", "CPU architecture\t: \nX: 7\n", 0},
        {"ColonEndsTheText", "CPU architecture\t:", 0},
        {"NameWithoutColon", "CPU architecture\n", 0},
        {"Empty", "", 0}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        std::string text = c.text;
        EXPECT_EQ(CCpuInfo::parse_features(text.data(), static_cast<int>(text.size())), c.expected);
    }
}

// A folder laid out like the kernel's: cpuinfo, cpuN folders, core 0's frequency files.
class FakeKernel {
public:
    FakeKernel() : root_(testing::TempDir() + "cpu_info_XXXXXX") {
        EXPECT_NE(mkdtemp(root_.data()), nullptr);
        fs::create_directories(root_ + "/cpu");
    }
    ~FakeKernel() {
        std::error_code ignored;
        fs::remove_all(root_, ignored);
    }
    void AddCores(int count) {
        for (int i = 0; i < count; ++i) fs::create_directories(Path("cpu/cpu" + std::to_string(i)));
    }
    void Write(const std::string& name, const char* text) {  // null: no file
        if (text != nullptr) std::ofstream(Path(name), std::ios::binary) << text;
    }
    std::string Path(const std::string& name) const { return root_ + "/" + name; }
    CpuInfoRecord Read() const {
        std::string cpuinfo = Path("cpuinfo"), dir = Path("cpu"), max = Path("max"),
                    min = Path("min");
        CpuInfoRecord info;
        memset(&info, 0x5a, sizeof(info));
        CCpuInfo::read_description({cpuinfo.c_str(), dir.c_str(), max.c_str(), min.c_str()}, &info);
        return info;
    }

private:
    std::string root_;
};

TEST(CpuDescription, RecordFromTheKernelFiles) {
    const struct {
        const char* label;
        const char *cpuinfo, *max, *min;  // null: the file is missing
        int cores;
        CpuInfoRecord expected;
    } cases[] = {
        {"UnreadableDescription", nullptr, "1800000\n", "300000\n", 8, {0, 0, 1, 0, 0}},
        {"ArmBoardEightCores", kArmV7Board, "1800000\n", "300000", 8, {1, 15, 8, 1800000, 300000}},
        {"MissingMaximumKeepsMinimum", k64BitKernel, nullptr, "408000\n", 2, {1, 9, 2, 0, 408000}},
        {"EmptyDescriptionAndNonNumericSpeeds", "", "", "fast\n", 0, {1, 0, 1, 0, 0}},
        {"ArchitecturePast10KiB", kPastTheLimit.c_str(), nullptr, nullptr, 0, {1, 0, 1, 0, 0}},
        {"ArchitectureWithin10KiB", kWithinTheLimit.c_str(), nullptr, nullptr, 0, {1, 9, 1, 0, 0}},
        {"FeaturesCutAt10KiB", kCutAtTheLimit.c_str(), nullptr, nullptr, 0, {1, 2, 1, 0, 0}}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        FakeKernel kernel;
        kernel.AddCores(c.cores);
        kernel.Write("cpuinfo", c.cpuinfo);
        kernel.Write("max", c.max);
        kernel.Write("min", c.min);
        EXPECT_EQ(Fields(kernel.Read()), Fields(c.expected));
    }
}

TEST(CountCpu, ProbesOnlyOddCoreFoldersUpTo21) {
    FakeKernel kernel;
    // Cores are added cumulatively: {cores present, count reported}.
    for (auto [cores, expected] : std::vector<std::pair<int, int>>{
             {0, 1}, {1, 1}, {2, 2}, {3, 2}, {4, 4}, {8, 8}, {22, 22}, {30, 22}}) {
        kernel.AddCores(cores);
        EXPECT_EQ(CCpuInfo::count_cpu_in(kernel.Path("cpu").c_str()), expected) << cores;
    }
    EXPECT_EQ(CCpuInfo::count_cpu_in("/nonexistent/cpu"), 1);
    EXPECT_EQ(CCpuInfo::count_cpu_in(nullptr), 1);
}

// The first callers of the process, at once and through either entry point, get what the
// kernel's files (named here, not taken from the library) hold.
TEST(CpuInfoOnThisMachine, RecordAgreesWithTheKernelFiles) {
    EXPECT_EQ(get_cpu_info(nullptr), -1);
    EXPECT_EQ(CCpuInfo::getInfo(nullptr), -1);
    std::vector<CpuInfoRecord> records(8);
    std::vector<int> results(records.size(), -2);
    std::vector<std::thread> threads;
    for (size_t i = 0; i < records.size(); ++i) {
        threads.emplace_back([&, i] {
            results[i] = i % 2 ? CCpuInfo::getInfo(&records[i]) : get_cpu_info(&records[i]);
        });
    }
    for (auto& t : threads) t.join();

    std::ifstream in("/proc/cpuinfo", std::ios::binary);
    const bool readable = static_cast<bool>(in);
    std::string description(10240, '\0');
    in.read(description.data(), description.size());
    description.resize(in.gcount());
    const std::string cpu = "/sys/devices/system/cpu/cpu";
    int cores = 1, speeds[2] = {0, 0};
    for (int n = 21; n >= 1 && cores == 1; n -= 2) {
        if (fs::is_directory(cpu + std::to_string(n))) cores = n + 1;
    }
    std::ifstream(cpu + "0/cpufreq/cpuinfo_max_freq") >> speeds[0];
    std::ifstream(cpu + "0/cpufreq/cpuinfo_min_freq") >> speeds[1];
    const CpuInfoRecord expected = {
        readable ? KA_CPU_TYPE_ARM : KA_CPU_TYPE_UNKNOWN,
        CCpuInfo::parse_features(description.data(), static_cast<int>(description.size())),
        readable ? cores : 1, readable ? speeds[0] : 0, readable ? speeds[1] : 0};
    for (size_t i = 0; i < records.size(); ++i) {
        EXPECT_EQ(results[i], 0);
        EXPECT_EQ(Fields(records[i]), Fields(expected)) << i;
    }
    EXPECT_EQ(CCpuInfo::count_cpu(), cores);
}

TEST(LoaderDefaults, VariantSuffixOnlyForArmWithNeon) {
    // {type, features}: ARM with NEON; a 64-bit kernel's ARM without the "neon" word; unknown type.
    for (auto [type, features, suffix] :
         {std::make_tuple(1, 15, "_v7.so"), std::make_tuple(1, 9, ""), std::make_tuple(0, 4, "")}) {
        CLibLoader loader(const_cast<char*>("kaVidDec"));  // starts from the plain defaults
        ka::ApplyCpuRecord(loader, {type, static_cast<uint64_t>(features), 3, 0, 0});
        EXPECT_STREQ(loader.mLibSuffix, suffix) << type << " " << features;
        EXPECT_EQ(loader.mCpuCount, 3);
    }

    CpuInfoRecord info = {};
    ASSERT_EQ(get_cpu_info(&info), 0);
    CLibLoader plain, named(const_cast<char*>("kaXMLParser"));
    for (const CLibLoader* loader : {&plain, &named}) {
        EXPECT_EQ(loader->mCpuCount, info.count);
        EXPECT_STREQ(loader->mLibSuffix, info.type == 1 && (info.features & 4) ? "_v7.so" : "");
    }
    CLibLoader video(const_cast<char*>("libkaVidDecH264"));
    EXPECT_EQ(video.mCpuCount, 1);
    EXPECT_STREQ(video.mLibSuffix, "");
}

}  // namespace
