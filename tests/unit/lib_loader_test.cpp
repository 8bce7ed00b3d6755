// The loader seen through a recording libkadl.so: which names it asks for, in which order, and
// what it keeps afterwards.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ka/module_loading.h"
#include "platform/lib_loader.h"

namespace {

const std::string kFakeDir = std::string(KA_FAKES_DIR) + "recording_kadl/";

// Control functions of the recording fake, reached in the very object the loader opens: a
// dlopen of "libkadl.so" without a path finds the already loaded object by its soname.
struct FakeService {
    void* handle = dlopen((kFakeDir + "libkadl.so").c_str(), RTLD_NOW);
    template <typename F>
    F Get(const char* name) {
        return reinterpret_cast<F>(dlsym(handle, name));
    }
    void Reset() { Get<void (*)()>("fake_kadl_reset")(); }
    void Accept(const std::string& name) { Get<void (*)(const char*)>("fake_kadl_accept")(name.c_str()); }
    void ProvideSymbol(const char* name) { Get<void (*)(const char*)>("fake_kadl_provide_symbol")(name); }
    void* ModuleHandle() { return Get<void* (*)()>("fake_kadl_module_handle")(); }
    std::vector<std::string> Log() {
        std::vector<std::string> log;
        int size = Get<int (*)()>("fake_kadl_log_size")();
        for (int i = 0; i < size; ++i) log.emplace_back(Get<const char* (*)(int)>("fake_kadl_log_entry")(i));
        return log;
    }
    ~FakeService() { dlclose(handle); }
};

class LibLoaderTest : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_NE(fake.handle, nullptr) << dlerror();
        fake.Reset();
    }
    FakeService fake;
    std::string workPath = kFakeDir;
};

struct CandidateCase {
    const char* label;
    bool withWorkPath;
    const char* requested;
    int cpuVersion;                        // 7 asks for codec variants first
    std::vector<std::string> accepted;     // names (after the working path) that load
    std::vector<std::string> expectedAsks;  // names asked for, in order (after the working path)
    int expectedResult;
};

class LoaderCandidates : public LibLoaderTest, public testing::WithParamInterface<CandidateCase> {};

TEST_P(LoaderCandidates, AsksForTheCandidatesInOrder) {
    const CandidateCase& c = GetParam();
    const std::string prefix = c.withWorkPath ? workPath : "";
    for (const std::string& name : c.accepted) fake.Accept(prefix + name);
    fake.ProvideSymbol("kaGetSourceIOAPI");

    CLibLoader loader;
    if (c.withWorkPath) loader.SetWorkPath(workPath.data());
    loader.SetCpuVersion(c.cpuVersion);
    snprintf(loader.mLibName, sizeof(loader.mLibName), "%s", c.requested);
    snprintf(loader.mEntryName, sizeof(loader.mEntryName), "kaGetSourceIOAPI");

    EXPECT_EQ(loader.LoadLib(nullptr), c.expectedResult);

    std::vector<std::string> asks;
    for (const std::string& entry : fake.Log()) {
        if (entry.rfind("load:", 0) == 0) asks.push_back(entry.substr(5));
    }
    std::vector<std::string> expected;
    for (const std::string& name : c.expectedAsks) expected.push_back(prefix + name);
    EXPECT_EQ(asks, expected);
    // The name field ends holding the last candidate tried.
    EXPECT_EQ(std::string(loader.mLibName), expected.back());
    EXPECT_EQ(loader.mLibHandle != nullptr, c.expectedResult == 1);
}

INSTANTIATE_TEST_SUITE_P(
    Loader, LoaderCandidates,
    testing::Values(
        CandidateCase{"fourth_candidate", false, "kaSourceIO", 0, {"/system/lib/libkaSourceIO"},
                      {"kaSourceIO", "libkaSourceIO", "/system/lib/kaSourceIO",
                       "/system/lib/libkaSourceIO"},
                      1},
        CandidateCase{"first_candidate", false, "kaSourceIO", 0, {"kaSourceIO"}, {"kaSourceIO"}, 1},
        CandidateCase{"none_found", false, "kaSourceIO", 0, {},
                      {"kaSourceIO", "libkaSourceIO", "/system/lib/kaSourceIO",
                       "/system/lib/libkaSourceIO"},
                      0},
        CandidateCase{"path_is_the_only_candidate", false, "/opt/kaSourceIO.so", 0, {},
                      {"/opt/kaSourceIO.so"}, 0},
        CandidateCase{"work_path_adds_lib_and_so", true, "kaSourceIO", 0, {"libkaSourceIO.so"},
                      {"libkaSourceIO.so"}, 1},
        CandidateCase{"work_path_keeps_given_so", true, "kaXMLParser.so", 0, {},
                      {"libkaXMLParser.so"}, 0},
        CandidateCase{"lib_anywhere_skips_prefix", true, "kaMylibMod", 0, {"kaMylibMod.so"},
                      {"kaMylibMod.so"}, 1},
        CandidateCase{"variant_first_then_plain", true, "kaVidDec", 7, {"libkaVidDec.so"},
                      {"libkaVidDec_v7.so", "libkaVidDec.so"}, 1},
        CandidateCase{"variant_found", true, "kaAACDec", 7, {"libkaAACDec_v7.so"},
                      {"libkaAACDec_v7.so"}, 1},
        CandidateCase{"unlisted_module_has_no_variant", true, "kaSourceIO", 7, {},
                      {"libkaSourceIO.so", "libkaSourceIO.so"}, 0},
        CandidateCase{"other_cpu_version_no_variant", true, "kaVidDec", 6, {},
                      {"libkaVidDec.so"}, 0}),
    [](const testing::TestParamInfo<CandidateCase>& info) { return info.param.label; });

TEST_F(LibLoaderTest, EntryMissingKeepsTheModuleUntilFreed) {
    fake.Accept(workPath + "libkaSourceIO.so");
    CLibLoader loader;
    loader.SetWorkPath(workPath.data());
    snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
    snprintf(loader.mEntryName, sizeof(loader.mEntryName), "kaGetSourceIOAPI");

    EXPECT_EQ(loader.LoadLib(nullptr), 0);
    EXPECT_EQ(loader.mLibHandle, fake.ModuleHandle());
    EXPECT_EQ(loader.mEntry, nullptr);
    EXPECT_EQ(loader.FreeLib(), 0);
    EXPECT_EQ(loader.mLibHandle, nullptr);
    EXPECT_EQ(fake.Log(), (std::vector<std::string>{"load:" + workPath + "libkaSourceIO.so",
                                                    "symbol:kaGetSourceIOAPI", "free"}));
}

TEST_F(LibLoaderTest, EmptyEntryNameLoadsButResolvesNothing) {
    fake.Accept(workPath + "libkaSourceIO.so");
    CLibLoader loader;
    loader.SetWorkPath(workPath.data());
    snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
    EXPECT_EQ(loader.LoadLib(nullptr), 0);
    EXPECT_NE(loader.mLibHandle, nullptr);

    // An entry held from before still counts.
    loader.mEntry = reinterpret_cast<KaModuleEntry>(fake.Get<void* (*)()>("fake_kadl_entry")());
    snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
    EXPECT_EQ(loader.LoadLib(nullptr), 1);
    // The second load released the first module before asking again.
    std::vector<std::string> log = fake.Log();
    ASSERT_EQ(log.size(), 3u);
    EXPECT_EQ(log[1], "free");
}

TEST_F(LibLoaderTest, DestructorReleasesModuleAndService) {
    fake.Accept(workPath + "libkaSourceIO.so");
    fake.ProvideSymbol("kaGetSourceIOAPI");
    const int liveBefore = CSDKObject::g_kaSDKObjectNum;
    {
        CLibLoader loader;
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, liveBefore + 1);
        loader.SetWorkPath(workPath.data());
        snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
        snprintf(loader.mEntryName, sizeof(loader.mEntryName), "kaGetSourceIOAPI");
        ASSERT_EQ(loader.LoadLib(nullptr), 1);
        EXPECT_NE(loader.mServiceHandle, nullptr);
        EXPECT_NE(loader.mEntry, nullptr);
    }
    EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, liveBefore);
    EXPECT_EQ(fake.Log().back(), "free");
}

TEST_F(LibLoaderTest, ServiceWithoutFreeFunctionLoadsNothing) {
    std::string path = std::string(KA_FAKES_DIR) + "kadl_without_free/";
    CLibLoader loader;
    loader.SetWorkPath(path.data());
    snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
    EXPECT_EQ(loader.LoadLib(nullptr), 0);
    EXPECT_EQ(loader.LoadModuleService(), 0);
    // The incomplete service stays open until it is freed.
    EXPECT_NE(loader.mServiceHandle, nullptr);
    EXPECT_NE(loader.mLoadLibrary, nullptr);
    EXPECT_EQ(loader.mFreeLibrary, nullptr);
    EXPECT_EQ(loader.FreeModuleService(), 0);
    EXPECT_EQ(loader.mServiceHandle, nullptr);
    EXPECT_EQ(loader.mLoadLibrary, nullptr);
}

TEST_F(LibLoaderTest, MissingServiceLoadsNothing) {
    char path[] = "/nonexistent-ka-dir/";
    CLibLoader loader;
    loader.SetWorkPath(path);
    snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
    EXPECT_EQ(loader.LoadLib(nullptr), 0);
    EXPECT_EQ(loader.mServiceHandle, nullptr);
    EXPECT_EQ(loader.FreeModuleService(), 0);
}

TEST_F(LibLoaderTest, VariantLibAsksNothingWithoutSuffixOrSo) {
    CLibLoader loader;
    loader.SetWorkPath(workPath.data());
    std::string path = workPath + "libkaVidDec.so";
    EXPECT_EQ(loader.LoadVariantLib(path.data()), nullptr);
    loader.SetCpuVersion(7);
    std::string noSo = workPath + "libkaVidDec";
    EXPECT_EQ(loader.LoadVariantLib(noSo.data()), nullptr);
    EXPECT_TRUE(fake.Log().empty());
    EXPECT_EQ(loader.mServiceHandle, nullptr);
}

TEST_F(LibLoaderTest, SettersStoreWhatTheyAreGiven) {
    CLibLoader loader;
    EXPECT_EQ(loader.mCpuCount >= 1, true);
    loader.SetCpuCount(6);
    EXPECT_EQ(loader.mCpuCount, 6);
    auto* context = reinterpret_cast<ModuleContext*>(&loader);
    loader.SetModuleContext(context);
    EXPECT_EQ(loader.mModuleContext, context);
    loader.SetCpuVersion(7);
    EXPECT_STREQ(loader.mLibSuffix, "_v7.so");
    loader.SetCpuVersion(5);  // other versions never clear a suffix
    EXPECT_STREQ(loader.mLibSuffix, "_v7.so");
}

TEST_F(LibLoaderTest, OverlongNamesStayInsideTheirBuffers) {
    std::string longPath = "/" + std::string(400, 'd') + "/";
    CLibLoader loader;
    loader.SetWorkPath(longPath.data());
    memset(loader.mLibName, 'n', sizeof(loader.mLibName) - 1);
    loader.mLibName[sizeof(loader.mLibName) - 1] = '\0';
    EXPECT_EQ(loader.LoadLib(nullptr), 0);
    EXPECT_LT(strnlen(loader.mLibName, sizeof(loader.mLibName)), sizeof(loader.mLibName));
}

TEST(ModuleFunctions, WrapTheDynamicLoader) {
    std::string path = kFakeDir + "libkadl.so";
    void* handle = kaLoadLib0x010d0000(path.data());
    ASSERT_NE(handle, nullptr);
    char symbol[] = "kaLoadLibrary";
    char empty[] = "";
    char missing[] = "no_such_symbol";
    EXPECT_NE(kaGetAddress0x010d0000(handle, symbol), nullptr);
    EXPECT_EQ(kaGetAddress0x010d0000(handle, missing), nullptr);
    EXPECT_EQ(kaGetAddress0x010d0000(handle, empty), nullptr);
    EXPECT_EQ(kaGetAddress0x010d0000(handle, nullptr), nullptr);
    EXPECT_EQ(kaGetAddress0x010d0000(nullptr, symbol), nullptr);
    EXPECT_EQ(kaFreeLib0x010d0000(handle), 0);
    EXPECT_EQ(kaFreeLib0x010d0000(nullptr), -1);
    char nowhere[] = "/nonexistent/libnothing.so";
    EXPECT_EQ(kaLoadLib0x010d0000(nowhere), nullptr);
}

}  // namespace
