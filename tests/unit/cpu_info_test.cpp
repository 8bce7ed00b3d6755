// CPU description parsing on descriptions held here, the probes of the core folders, and the
// record this machine yields, checked against the kernel's files.
#include "ka/cpu_info.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "platform/cpu_info.h"
#include "platform/lib_loader.h"

namespace {

namespace fs = std::filesystem;

constexpr uint64_t kArmV7 = KA_CPU_FEATURE_ARMV7;
constexpr uint64_t kVfpV3 = KA_CPU_FEATURE_VFPV3;
constexpr uint64_t kNeon = KA_CPU_FEATURE_NEON;
constexpr uint64_t kArmV6 = KA_CPU_FEATURE_ARMV6;

const char kArmV7Board[] =
    "Processor\t: ARMv7 Processor rev 10 (v7l)\n"
    "processor\t: 0\n"
    "BogoMIPS\t: 790.52\n"
    "\n"
    "processor\t: 1\n"
    "BogoMIPS\t: 790.52\n"
    "\n"
    "Features\t: swp half thumb fastmult vfp edsp neon vfpv3 tls \n"
    "CPU implementer\t: 0x41\n"
    "CPU architecture: 7\n"
    "CPU variant\t: 0x2\n"
    "CPU part\t: 0xc09\n"
    "CPU revision\t: 10\n"
    "\n"
    "Hardware\t: Freescale i.MX 6Quad/DualLite (Device Tree)\n";

const char k64BitKernel[] =
    "processor\t: 0\n"
    "BogoMIPS\t: 38.40\n"
    "Features\t: fp asimd evtstrm aes pmull sha1 sha2 crc32 cpuid\n"
    "CPU implementer\t: 0x41\n"
    "CPU architecture: 8\n"
    "CPU variant\t: 0x0\n"
    "CPU part\t: 0xd03\n"
    "CPU revision\t: 4\n";

const char kV6lProcessor[] =
    "Processor\t: ARMv6-compatible processor rev 7 (v6l)\n"
    "BogoMIPS\t: 697.95\n"
    "Features\t: swp half thumb fastmult vfp edsp java tls\n"
    "CPU implementer\t: 0x41\n"
    "CPU architecture: 7\n";

struct ParseCase {
    const char* label;
    std::string text;
    uint64_t expected;
};

void PrintTo(const ParseCase& c, std::ostream* os) { *os << c.label; }

class ParseFeatures : public testing::TestWithParam<ParseCase> {};

TEST_P(ParseFeatures, YieldsTheFeatureBits) {
    std::string text = GetParam().text;
    EXPECT_EQ(CCpuInfo::parse_features(text.data(), static_cast<int>(text.size())),
              GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(
    Descriptions, ParseFeatures,
    testing::Values(
        ParseCase{"ArmV7BoardWithNeon", kArmV7Board, kArmV7 | kVfpV3 | kNeon | kArmV6},
        ParseCase{"SixtyFourBitKernelHasNoNeonWord", k64BitKernel, kArmV7 | kArmV6},
        ParseCase{"V6lProcessorIsNotArmV7", kV6lProcessor, kArmV6},
        ParseCase{"V6lInsideAWordDoesNotCount",
                  "Processor\t: ARMv7 Processor (v6l)x\nCPU architecture: 7\n", kArmV7 | kArmV6},
        ParseCase{"ArchitectureSixOnly", "CPU architecture: 6\n", kArmV6},
        ParseCase{"ArchitectureFiveNothing", "CPU architecture: 5TEJ\n", 0},
        ParseCase{"ArchitectureWithoutDigits", "CPU architecture: AArch64\n", 0},
        ParseCase{"ArchitectureWithoutBlankAfterColon", "CPU architecture:7\n", 0},
        ParseCase{"FieldNamesInTheMiddleOfALine",
                  "model name\t: x CPU architecture: 7\nflags\t: Features : neon vfpv3\n", 0},
        ParseCase{"FieldNameLaterAtALineStart",
                  "model name\t: x CPU architecture: 5\nCPU architecture: 7\n", kArmV7 | kArmV6},
        ParseCase{"WordsThatMerelyBeginWithNeon", "Features\t: neonx neon2 vfpv3x vfpv\n", 0},
        ParseCase{"Vfpv3d16WithoutNeon", "Features\t: swp vfp vfpv3d16\n", kVfpV3},
        ParseCase{"NeonAloneSetsVfpv3", "Features\t: neon\n", kVfpV3 | kNeon},
        ParseCase{"TabsSeparateWords", "Features\t: vfp\tneon\t\n", kVfpV3 | kNeon},
        ParseCase{"LastLineWithoutNewline", "CPU architecture: 7\nFeatures\t: neon",
                  kArmV7 | kVfpV3 | kNeon | kArmV6},
        ParseCase{"LowerCaseNamesAreOtherFields", "features\t: neon\ncpu architecture: 7\n", 0},
        ParseCase{"X86Description", "processor\t: 0\nflags\t\t: fpu vme neon sse2\n", 0},
        ParseCase{"Empty", "", 0}),
    [](const testing::TestParamInfo<ParseCase>& info) { return std::string(info.param.label); });

struct FieldCase {
    const char* label;
    std::string buffer;
    int length;  // -1: the whole buffer
    const char* name;
    const char* expected;  // null: not found
};

void PrintTo(const FieldCase& c, std::ostream* os) { *os << c.label; }

class ExtractField : public testing::TestWithParam<FieldCase> {};

TEST_P(ExtractField, FindsOnlyFieldsThatStartALine) {
    const FieldCase& c = GetParam();
    std::string buffer = c.buffer;
    int length = c.length < 0 ? static_cast<int>(buffer.size()) : c.length;
    char* value = CCpuInfo::extract_cpuinfo_field(buffer.data(), length, c.name);
    if (c.expected == nullptr) {
        EXPECT_EQ(value, nullptr) << value;
    } else {
        ASSERT_NE(value, nullptr);
        EXPECT_STREQ(value, c.expected);
    }
    free(value);
}

INSTANTIATE_TEST_SUITE_P(
    Fields, ExtractField,
    testing::Values(
        FieldCase{"AtTheStart", "Hardware\t: board\nX: y\n", -1, "Hardware", "board"},
        FieldCase{"AfterANewline", "a: b\nHardware\t: board\n", -1, "Hardware", "board"},
        FieldCase{"ValueRunsToTheBufferEnd", "Hardware\t: board", -1, "Hardware", "board"},
        FieldCase{"EmptyValue", "Hardware\t: \nX: y\n", -1, "Hardware", ""},
        FieldCase{"MiddleOfALineOnly", "x Hardware: board\n", -1, "Hardware", nullptr},
        FieldCase{"ColonWithoutBlank", "Hardware\t:board\n", -1, "Hardware", nullptr},
        FieldCase{"ColonAtTheBufferEnd", "Hardware\t:", -1, "Hardware", nullptr},
        FieldCase{"NoColon", "Hardware\n", -1, "Hardware", nullptr},
        FieldCase{"FirstColonBehindTheName", "Hardware\nX: y\n", -1, "Hardware", "y"},
        FieldCase{"NameBeyondLength", "a: b\nHardware\t: board\n", 5, "Hardware", nullptr},
        FieldCase{"ValueCutAtLength", "Hardware\t: board\n", 13, "Hardware", "bo"},
        FieldCase{"FirstOfTwo", "Hardware\t: one\nHardware\t: two\n", -1, "Hardware", "one"},
        FieldCase{"ZeroLength", "Hardware\t: board\n", 0, "Hardware", nullptr}),
    [](const testing::TestParamInfo<FieldCase>& info) { return std::string(info.param.label); });

TEST(ExtractFieldNulls, NullBufferOrNameFindNothing) {
    char buffer[] = "Hardware\t: board\n";
    EXPECT_EQ(CCpuInfo::extract_cpuinfo_field(nullptr, 10, "Hardware"), nullptr);
    EXPECT_EQ(CCpuInfo::extract_cpuinfo_field(buffer, sizeof(buffer) - 1, nullptr), nullptr);
}

struct ListCase {
    const char* list;
    const char* item;
    int expected;
};

void PrintTo(const ListCase& c, std::ostream* os) {
    *os << "\"" << (c.list != nullptr ? c.list : "(null)") << "\" / \"" << c.item << "\"";
}

class HasListItem : public testing::TestWithParam<ListCase> {};

TEST_P(HasListItem, MatchesWholeWords) {
    EXPECT_EQ(CCpuInfo::has_list_item(GetParam().list, GetParam().item), GetParam().expected)
        << "list \"" << (GetParam().list ? GetParam().list : "(null)") << "\" item \""
        << GetParam().item << "\"";
}

INSTANTIATE_TEST_SUITE_P(
    Words, HasListItem,
    testing::Values(ListCase{"vfp neon tls", "neon", 1}, ListCase{"neon", "neon", 1},
                    ListCase{"  \tneon\t ", "neon", 1}, ListCase{"vfp neonx", "neon", 0},
                    ListCase{"xneon", "neon", 0}, ListCase{"neo", "neon", 0},
                    ListCase{"vfpv3d16", "vfpv3", 0}, ListCase{"rev 7 (v6l)", "(v6l)", 1},
                    ListCase{"", "neon", 0}, ListCase{"   ", "neon", 0},
                    ListCase{nullptr, "neon", 0}, ListCase{"a b", "", 0}));

// A folder laid out like the kernel's: cpuinfo, cpuN folders, core 0's frequency files.
class FakeKernel {
  public:
    FakeKernel() {
        std::string pattern = testing::TempDir() + "cpu_info_XXXXXX";
        std::vector<char> name(pattern.begin(), pattern.end());
        name.push_back('\0');
        char* made = mkdtemp(name.data());
        EXPECT_NE(made, nullptr);
        root_ = made != nullptr ? made : "";
        fs::create_directories(root_ + "/cpu");
    }
    ~FakeKernel() {
        std::error_code ignored;
        fs::remove_all(root_, ignored);
    }
    void AddCores(int count) {
        for (int i = 0; i < count; ++i)
            fs::create_directories(CpuDir() + "/cpu" + std::to_string(i));
    }
    void Write(const std::string& name, const std::string& text) {
        std::ofstream(root_ + "/" + name, std::ios::binary) << text;
    }
    std::string Path(const std::string& name) const { return root_ + "/" + name; }
    std::string CpuDir() const { return root_ + "/cpu"; }

    CpuInfoRecord Read() {
        cpuinfo_ = Path("cpuinfo");
        cpuDir_ = CpuDir();
        max_ = Path("max");
        min_ = Path("min");
        CpuInfoSources sources = {cpuinfo_.c_str(), cpuDir_.c_str(), max_.c_str(), min_.c_str()};
        CpuInfoRecord info;
        memset(&info, 0x5a, sizeof(info));
        CCpuInfo::read_description(sources, &info);
        return info;
    }

  private:
    std::string root_, cpuinfo_, cpuDir_, max_, min_;
};

TEST(CpuDescription, UnreadableDescriptionReportsUnknownAndOneCore) {
    FakeKernel kernel;
    kernel.AddCores(8);
    kernel.Write("max", "1800000\n");
    kernel.Write("min", "300000\n");
    CpuInfoRecord info = kernel.Read();
    EXPECT_EQ(info.type, KA_CPU_TYPE_UNKNOWN);
    EXPECT_EQ(info.features, 0u);
    EXPECT_EQ(info.count, 1);
    EXPECT_EQ(info.maxCpuSpeed, 0);
    EXPECT_EQ(info.minCpuSpeed, 0);
}

TEST(CpuDescription, ArmBoardWithEightCores) {
    FakeKernel kernel;
    kernel.AddCores(8);
    kernel.Write("cpuinfo", kArmV7Board);
    kernel.Write("max", "1800000\n");
    kernel.Write("min", "300000");
    CpuInfoRecord info = kernel.Read();
    EXPECT_EQ(info.type, KA_CPU_TYPE_ARM);
    EXPECT_EQ(info.features, kArmV7 | kVfpV3 | kNeon | kArmV6);
    EXPECT_EQ(info.count, 8);
    EXPECT_EQ(info.maxCpuSpeed, 1800000);
    EXPECT_EQ(info.minCpuSpeed, 300000);
}

TEST(CpuDescription, MissingMaximumDoesNotHideTheMinimum) {
    FakeKernel kernel;
    kernel.AddCores(2);
    kernel.Write("cpuinfo", k64BitKernel);
    kernel.Write("min", "408000\n");
    CpuInfoRecord info = kernel.Read();
    EXPECT_EQ(info.type, KA_CPU_TYPE_ARM);
    EXPECT_EQ(info.features, kArmV7 | kArmV6);
    EXPECT_EQ(info.count, 2);
    EXPECT_EQ(info.maxCpuSpeed, 0);
    EXPECT_EQ(info.minCpuSpeed, 408000);
}

TEST(CpuDescription, EmptyOrNonNumericFrequencyFilesLeaveZero) {
    FakeKernel kernel;
    kernel.Write("cpuinfo", "");
    kernel.Write("max", "");
    kernel.Write("min", "fast\n");
    CpuInfoRecord info = kernel.Read();
    // An empty but readable description still names an ARM processor without features.
    EXPECT_EQ(info.type, KA_CPU_TYPE_ARM);
    EXPECT_EQ(info.features, 0u);
    EXPECT_EQ(info.count, 1);
    EXPECT_EQ(info.maxCpuSpeed, 0);
    EXPECT_EQ(info.minCpuSpeed, 0);
}

TEST(CpuDescription, OnlyTheFirstTenKilobytesAreRead) {
    FakeKernel kernel;
    // The architecture line sits wholly behind the first 10240 bytes.
    kernel.Write("cpuinfo", std::string(10240, '\n') + "CPU architecture: 7\n");
    EXPECT_EQ(kernel.Read().features, 0u);
    kernel.Write("cpuinfo", std::string(10200, '\n') + "CPU architecture: 7\n");
    EXPECT_EQ(kernel.Read().features, kArmV7 | kArmV6);
}

struct CountCase {
    int cores;
    int expected;
};

void PrintTo(const CountCase& c, std::ostream* os) { *os << c.cores << " cores"; }

class CountCpu : public testing::TestWithParam<CountCase> {};

TEST_P(CountCpu, ProbesOddCoreFolders) {
    FakeKernel kernel;
    kernel.AddCores(GetParam().cores);
    EXPECT_EQ(CCpuInfo::count_cpu_in(kernel.CpuDir().c_str()), GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(Cores, CountCpu,
                         testing::Values(CountCase{0, 1}, CountCase{1, 1}, CountCase{2, 2},
                                         CountCase{3, 2}, CountCase{4, 4}, CountCase{8, 8},
                                         CountCase{22, 22}, CountCase{30, 22}));

TEST(CountCpuDir, MissingFolderCountsOne) {
    EXPECT_EQ(CCpuInfo::count_cpu_in("/nonexistent/cpu"), 1);
    EXPECT_EQ(CCpuInfo::count_cpu_in(nullptr), 1);
}

TEST(ReadFile, ReadsAtMostSizeBytesOrReportsMinusOne) {
    FakeKernel kernel;
    kernel.Write("file", "0123456789");
    char buffer[16] = {};
    EXPECT_EQ(CCpuInfo::read_file(kernel.Path("file").c_str(), buffer, 4), 4);
    EXPECT_EQ(std::string(buffer), "0123");
    EXPECT_EQ(CCpuInfo::read_file(kernel.Path("file").c_str(), buffer, sizeof(buffer)), 10);
    EXPECT_EQ(CCpuInfo::read_file(kernel.Path("absent").c_str(), buffer, sizeof(buffer)), -1);
    EXPECT_EQ(CCpuInfo::read_file(nullptr, buffer, sizeof(buffer)), -1);
}

// --- This machine ---------------------------------------------------------------------------

std::string ReadWhole(const char* path, bool* ok) {
    std::ifstream in(path, std::ios::binary);
    *ok = static_cast<bool>(in);
    return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

// The count the odd-folder rule gives for the cpuN folders the kernel lists.
int ExpectedCoreCount() {
    std::set<int> cores;
    std::error_code error;
    for (const auto& entry : fs::directory_iterator("/sys/devices/system/cpu", error)) {
        std::string name = entry.path().filename().string();
        if (name.size() > 3 && name.compare(0, 3, "cpu") == 0 &&
            name.find_first_not_of("0123456789", 3) == std::string::npos) {
            cores.insert(std::stoi(name.substr(3)));
        }
    }
    for (int n = 21; n >= 1; n -= 2) {
        if (cores.count(n) != 0) return n + 1;
    }
    return 1;
}

int ExpectedSpeed(const char* path) {
    bool ok = false;
    std::string text = ReadWhole(path, &ok);
    return ok && !text.empty() ? std::atoi(text.c_str()) : 0;
}

TEST(CpuInfoOnThisMachine, NullRecordIsRefused) {
    EXPECT_EQ(get_cpu_info(nullptr), -1);
    EXPECT_EQ(CCpuInfo::getInfo(nullptr), -1);
}

TEST(CpuInfoOnThisMachine, RecordAgreesWithTheKernelFiles) {
    CpuInfoRecord info = {};
    ASSERT_EQ(get_cpu_info(&info), 0);

    bool readable = false;
    std::string description = ReadWhole("/proc/cpuinfo", &readable);
    if (description.size() > 10240) description.resize(10240);
    EXPECT_EQ(info.type, readable ? KA_CPU_TYPE_ARM : KA_CPU_TYPE_UNKNOWN);
    EXPECT_EQ(info.features, readable
                                 ? CCpuInfo::parse_features(description.data(),
                                                            static_cast<int>(description.size()))
                                 : 0u);
    EXPECT_EQ(info.count, readable ? ExpectedCoreCount() : 1);
    EXPECT_GE(info.count, 1);
    EXPECT_EQ(CCpuInfo::count_cpu(), ExpectedCoreCount());
    if (readable) {
        EXPECT_EQ(info.maxCpuSpeed,
                  ExpectedSpeed("/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_max_freq"));
        EXPECT_EQ(info.minCpuSpeed,
                  ExpectedSpeed("/sys/devices/system/cpu/cpu0/cpufreq/cpuinfo_min_freq"));
    }

    // The static members and the second entry point tell the same.
    CpuInfoRecord again;
    memset(&again, 0x5a, sizeof(again));
    EXPECT_EQ(CCpuInfo::getInfo(&again), 0);
    EXPECT_EQ(again.features, info.features);
    EXPECT_EQ(again.type, info.type);
    EXPECT_EQ(again.count, info.count);
    EXPECT_EQ(again.maxCpuSpeed, info.maxCpuSpeed);
    EXPECT_EQ(again.minCpuSpeed, info.minCpuSpeed);
    EXPECT_EQ(CCpuInfo::mCount, info.count);
}

TEST(CpuInfoOnThisMachine, ThreadsAskingAtOnceGetTheSameRecord) {
    constexpr int kThreads = 8;
    std::vector<CpuInfoRecord> records(kThreads);
    std::vector<int> results(kThreads, -2);
    std::vector<std::thread> threads;
    for (int i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] { results[i] = get_cpu_info(&records[i]); });
    }
    for (auto& t : threads) t.join();
    for (int i = 0; i < kThreads; ++i) {
        EXPECT_EQ(results[i], 0);
        EXPECT_EQ(records[i].type, records[0].type);
        EXPECT_EQ(records[i].features, records[0].features);
        EXPECT_EQ(records[i].count, records[0].count);
        EXPECT_EQ(records[i].maxCpuSpeed, records[0].maxCpuSpeed);
        EXPECT_EQ(records[i].minCpuSpeed, records[0].minCpuSpeed);
    }
    EXPECT_GE(records[0].count, 1);
}

// --- The loader's CPU-dependent defaults ---------------------------------------------------

struct DefaultsCase {
    const char* label;
    CpuInfoRecord info;
    const char* expectedSuffix;
};

void PrintTo(const DefaultsCase& c, std::ostream* os) { *os << c.label; }

class LoaderDefaults : public testing::TestWithParam<DefaultsCase> {};

TEST_P(LoaderDefaults, SuffixOnlyForArmWithNeon) {
    CLibLoader loader(const_cast<char*>("kaVidDec"));  // starts from the plain defaults
    ka::ApplyCpuRecord(loader, GetParam().info);
    EXPECT_STREQ(loader.mLibSuffix, GetParam().expectedSuffix);
    EXPECT_EQ(loader.mCpuCount, GetParam().info.count);
}

INSTANTIATE_TEST_SUITE_P(
    Records, LoaderDefaults,
    testing::Values(
        DefaultsCase{
            "ArmWithNeon", {KA_CPU_TYPE_ARM, kArmV7 | kVfpV3 | kNeon | kArmV6, 4, 0, 0}, "_v7.so"},
        DefaultsCase{"SixtyFourBitArm", {KA_CPU_TYPE_ARM, kArmV7 | kArmV6, 8, 0, 0}, ""},
        DefaultsCase{"UnknownTypeWithNeonBit", {KA_CPU_TYPE_UNKNOWN, kNeon, 1, 0, 0}, ""},
        DefaultsCase{"OnlyNeonBit", {KA_CPU_TYPE_ARM, kNeon, 2, 0, 0}, "_v7.so"}),
    [](const testing::TestParamInfo<DefaultsCase>& info) { return std::string(info.param.label); });

TEST(LoaderDefaultsOnThisMachine, ConstructorsApplyTheRecordUnlessVidDec) {
    CpuInfoRecord info = {};
    ASSERT_EQ(get_cpu_info(&info), 0);
    const bool variant = info.type == KA_CPU_TYPE_ARM && (info.features & kNeon) != 0;

    CLibLoader plain;
    EXPECT_EQ(plain.mCpuCount, info.count);
    EXPECT_STREQ(plain.mLibSuffix, variant ? "_v7.so" : "");

    CLibLoader named(const_cast<char*>("kaXMLParser"));
    EXPECT_EQ(named.mCpuCount, info.count);
    EXPECT_STREQ(named.mLibSuffix, variant ? "_v7.so" : "");
    EXPECT_STREQ(named.mLibName, "");  // the name is not stored

    CLibLoader video(const_cast<char*>("libkaVidDecH264"));
    EXPECT_EQ(video.mCpuCount, 1);
    EXPECT_STREQ(video.mLibSuffix, "");
}

#if defined(__x86_64__) || defined(__i386__)
TEST(LoaderDefaultsOnThisMachine, NoVariantSuffixWithoutNeon) {
    CLibLoader loader;
    EXPECT_STREQ(loader.mLibSuffix, "");
}
#endif

}  // namespace
