// CPU description parsing on descriptions held here, the probes of the core folders, and the
// record this machine yields, checked against the kernel's files.
#include "ka/cpu_info.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
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
        {"Empty", "", 0}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        std::string text = c.text;
        EXPECT_EQ(CCpuInfo::parse_features(text.data(), static_cast<int>(text.size())), c.expected);
    }
}

// The colon may stand on a later line: "Hardware\nX: y" gives "y".
TEST(ExtractField, ValueRunsFromColonBlankToLineEndWithinLength) {
    const struct {
        std::string buffer;
        int length;            // -1: the whole buffer
        const char* expected;  // null: not found
    } cases[] = {{"Hardware\t: board", -1, "board"}, {"Hardware\t: \nX: y\n", -1, ""},
                 {"Hardware\t:", -1, nullptr},       {"Hardware\n", -1, nullptr},
                 {"Hardware\nX: y\n", -1, "y"},      {"a: b\nHardware\t: board\n", 5, nullptr},
                 {"Hardware\t: board\n", 13, "bo"},  {"Hardware\t: board\n", 0, nullptr}};
    for (const auto& c : cases) {
        SCOPED_TRACE(testing::PrintToString(c.buffer) + " length " + std::to_string(c.length));
        std::string buffer = c.buffer;
        int length = c.length < 0 ? static_cast<int>(buffer.size()) : c.length;
        char* value = CCpuInfo::extract_cpuinfo_field(buffer.data(), length, "Hardware");
        EXPECT_STREQ(value, c.expected);
        free(value);
    }
    char buffer[] = "Hardware\t: board\n";
    EXPECT_EQ(CCpuInfo::extract_cpuinfo_field(nullptr, 10, "Hardware"), nullptr);
    EXPECT_EQ(CCpuInfo::extract_cpuinfo_field(buffer, sizeof(buffer) - 1, nullptr), nullptr);
    EXPECT_EQ(CCpuInfo::has_list_item(nullptr, "neon"), 0);
    EXPECT_EQ(CCpuInfo::has_list_item("a b", ""), 0);
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
    void Write(const std::string& name, const std::string& text) {
        std::ofstream(Path(name), std::ios::binary) << text;
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
        {"EmptyDescriptionAndNonNumericSpeeds", "", "", "fast\n", 0, {1, 0, 1, 0, 0}}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        FakeKernel kernel;
        kernel.AddCores(c.cores);
        if (c.cpuinfo != nullptr) kernel.Write("cpuinfo", c.cpuinfo);
        if (c.max != nullptr) kernel.Write("max", c.max);
        if (c.min != nullptr) kernel.Write("min", c.min);
        EXPECT_EQ(Fields(kernel.Read()), Fields(c.expected));
    }
}

TEST(CpuDescription, OnlyTheFirstTenKilobytesAreRead) {
    FakeKernel kernel;
    kernel.Write("cpuinfo", std::string(10240, '\n') + "CPU architecture: 7\n");
    EXPECT_EQ(kernel.Read().features, 0u);
    kernel.Write("cpuinfo", std::string(10200, '\n') + "CPU architecture: 7\n");
    EXPECT_EQ(kernel.Read().features, 9u);
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

// The highest odd-numbered core folder the kernel lists gives the count.
int ExpectedCoreCount() {
    for (int n = 21; n >= 1; n -= 2) {
        if (fs::is_directory("/sys/devices/system/cpu/cpu" + std::to_string(n))) return n + 1;
    }
    return 1;
}

int ExpectedSpeed(const char* name) {
    int speed = 0;
    std::ifstream(std::string("/sys/devices/system/cpu/cpu0/cpufreq/") + name) >> speed;
    return speed;
}

TEST(CpuInfoOnThisMachine, RecordAgreesWithTheKernelFiles) {
    EXPECT_EQ(get_cpu_info(nullptr), -1);
    EXPECT_EQ(CCpuInfo::getInfo(nullptr), -1);

    // The first callers of the process, at once and through either entry point.
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
    const CpuInfoRecord expected = {
        readable ? KA_CPU_TYPE_ARM : KA_CPU_TYPE_UNKNOWN,
        CCpuInfo::parse_features(description.data(), static_cast<int>(description.size())),
        readable ? ExpectedCoreCount() : 1, readable ? ExpectedSpeed("cpuinfo_max_freq") : 0,
        readable ? ExpectedSpeed("cpuinfo_min_freq") : 0};
    for (size_t i = 0; i < records.size(); ++i) {
        EXPECT_EQ(results[i], 0);
        EXPECT_EQ(Fields(records[i]), Fields(expected)) << i;
    }
    EXPECT_EQ(CCpuInfo::count_cpu(), ExpectedCoreCount());
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
