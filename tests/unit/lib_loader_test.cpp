// The loader seen through a recording libkadl.so: which names it asks for, in which order, and
// what it keeps afterwards.
#include "platform/lib_loader.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ka/module_loading.h"

namespace {

const std::string kFakeDir = std::string(KA_FAKES_DIR) + "recording_kadl/";

class LibLoaderTest : public testing::Test {
protected:
    using Names = void (*)(const char*);
    void SetUp() override {
        ASSERT_NE(fake, nullptr) << dlerror();
        Fake<void (*)()>("fake_kadl_reset")();
    }
    void TearDown() override {
        if (fake != nullptr) dlclose(fake);
    }
    // Control functions of the recording fake, reached in the very object the loader opens: a
    // dlopen of "libkadl.so" without a path finds the already loaded object by its soname.
    template <typename F>
    F Fake(const char* name) {
        return reinterpret_cast<F>(dlsym(fake, name));
    }
    void Accept(const std::string& name) { Fake<Names>("fake_kadl_accept")(name.c_str()); }
    void ProvideEntry() { Fake<Names>("fake_kadl_provide_symbol")("kaGetSourceIOAPI"); }
    std::vector<std::string> Log() {
        std::vector<std::string> log;
        for (int i = 0; i < Fake<int (*)()>("fake_kadl_log_size")(); ++i) {
            log.emplace_back(Fake<const char* (*)(int)>("fake_kadl_log_entry")(i));
        }
        return log;
    }
    // Asks for requested (and its entry, when given) under the fake's folder, or with no path.
    void Prepare(CLibLoader& loader, const char* requested, const char* entry, bool withWorkPath) {
        if (withWorkPath) loader.SetWorkPath(workPath.data());
        snprintf(loader.mLibName, sizeof(loader.mLibName), "%s", requested);
        snprintf(loader.mEntryName, sizeof(loader.mEntryName), "%s", entry);
    }
    void* fake = dlopen((kFakeDir + "libkadl.so").c_str(), RTLD_NOW);
    std::string workPath = kFakeDir;
};

TEST_F(LibLoaderTest, AsksForTheCandidatesInOrder) {
    const std::vector<std::string> allFour = {
        "kaSourceIO", "libkaSourceIO", "/system/lib/kaSourceIO", "/system/lib/libkaSourceIO"};
    struct {
        const char* label;
        bool withWorkPath;
        const char* requested;
        int cpuVersion;                 // 7 asks for codec variants first
        std::vector<std::string> asks;  // in order, after the working path
        bool found;                     // the last name asked for loads
    } const cases[] = {
        // clang-format off
        {"fourth candidate", false, "kaSourceIO", 0, allFour, true},
        {"first candidate", false, "kaSourceIO", 0, {"kaSourceIO"}, true},
        {"none found", false, "kaSourceIO", 0, allFour, false},
        {"a path is the only candidate", false, "/opt/ka.so", 0, {"/opt/ka.so"}, false},
        {"work path adds lib and .so", true, "kaSourceIO", 0, {"libkaSourceIO.so"}, true},
        {"work path keeps a given .so", true, "kaXMLParser.so", 0, {"libkaXMLParser.so"}, false},
        {"lib anywhere skips the prefix", true, "kaMylibMod", 0, {"kaMylibMod.so"}, true},
        {"variant first, then plain", true, "kaVidDec", 7,
         {"libkaVidDec_v7.so", "libkaVidDec.so"}, true},
        {"variant found", true, "kaAACDec", 7, {"libkaAACDec_v7.so"}, true},
        {"unlisted module has no variant", true, "kaSourceIO", 7,
         {"libkaSourceIO.so", "libkaSourceIO.so"}, false},
        {"other cpu version, no variant", true, "kaVidDec", 6, {"libkaVidDec.so"}, false},
        // clang-format on
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        Fake<void (*)()>("fake_kadl_reset")();
        ProvideEntry();
        const std::string prefix = c.withWorkPath ? workPath : "";
        std::vector<std::string> expected;
        for (const std::string& name : c.asks) expected.push_back(prefix + name);
        if (c.found) Accept(expected.back());
        CLibLoader loader;
        Prepare(loader, c.requested, "kaGetSourceIOAPI", c.withWorkPath);
        loader.SetCpuVersion(c.cpuVersion);

        EXPECT_EQ(loader.LoadLib(nullptr), c.found ? 1 : 0);
        std::vector<std::string> asks;
        for (const std::string& entry : Log()) {
            if (entry.rfind("load:", 0) == 0) asks.push_back(entry.substr(5));
        }
        EXPECT_EQ(asks, expected);
        // The name field ends holding the last candidate tried.
        EXPECT_EQ(std::string(loader.mLibName), expected.back());
        EXPECT_EQ(loader.mLibHandle != nullptr, c.found);
    }
}

// A module without its entry stays held until the next load or FreeLib; with no entry name
// nothing is resolved, and an entry held from before still counts.
TEST_F(LibLoaderTest, ModuleWithoutEntry) {
    Accept(workPath + "libkaSourceIO.so");
    CLibLoader loader;
    Prepare(loader, "kaSourceIO", "kaGetSourceIOAPI", true);
    EXPECT_EQ(loader.LoadLib(nullptr), 0);
    EXPECT_EQ(loader.mLibHandle, Fake<void* (*)()>("fake_kadl_module_handle")());
    EXPECT_EQ(loader.mEntry, nullptr);

    const auto held = reinterpret_cast<KaModuleEntry>(Fake<void* (*)()>("fake_kadl_entry")());
    loader.mEntry = held;
    Prepare(loader, "kaSourceIO", "", true);
    EXPECT_EQ(loader.LoadLib(nullptr), 1);
    EXPECT_EQ(loader.FreeLib(), 0);
    EXPECT_EQ(loader.mLibHandle, nullptr);
    EXPECT_EQ(loader.mEntry, held);
    const std::string load = "load:" + workPath + "libkaSourceIO.so";
    EXPECT_EQ(Log(),
              (std::vector<std::string>{load, "symbol:kaGetSourceIOAPI", "free", load, "free"}));
}

TEST_F(LibLoaderTest, DestructorReleasesModuleAndService) {
    Accept(workPath + "libkaSourceIO.so");
    ProvideEntry();
    const int liveBefore = CSDKObject::g_kaSDKObjectNum;
    {
        CLibLoader loader;
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, liveBefore + 1);
        Prepare(loader, "kaSourceIO", "kaGetSourceIOAPI", true);
        ASSERT_EQ(loader.LoadLib(nullptr), 1);
        EXPECT_NE(loader.mServiceHandle, nullptr);
        EXPECT_NE(loader.mEntry, nullptr);
    }
    EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, liveBefore);
    EXPECT_EQ(Log().back(), "free");
}

// A service that is missing, or lacks a function, loads nothing; an incomplete one stays open
// until it is freed.
TEST_F(LibLoaderTest, IncompleteOrMissingServiceLoadsNothing) {
    for (std::string path :
         {std::string(KA_FAKES_DIR) + "kadl_without_free/", std::string("/nonexistent-ka-dir/")}) {
        SCOPED_TRACE(path);
        const bool present = path.find("nonexistent") == std::string::npos;
        CLibLoader loader;
        loader.SetWorkPath(path.data());
        snprintf(loader.mLibName, sizeof(loader.mLibName), "kaSourceIO");
        EXPECT_EQ(loader.LoadLib(nullptr), 0);
        EXPECT_EQ(loader.LoadModuleService(), 0);
        EXPECT_EQ(loader.mServiceHandle != nullptr, present);
        EXPECT_EQ(loader.mLoadLibrary != nullptr, present);
        EXPECT_EQ(loader.mFreeLibrary, nullptr);
        EXPECT_EQ(loader.FreeModuleService(), 0);
        EXPECT_EQ(loader.mServiceHandle, nullptr);
        EXPECT_EQ(loader.mLoadLibrary, nullptr);
    }
}

// Names that cannot load ask the service for nothing and stay inside their buffers.
TEST_F(LibLoaderTest, VariantWithoutSuffixOrSoAndOverlongNames) {
    CLibLoader loader;
    loader.SetWorkPath(workPath.data());
    std::string path = workPath + "libkaVidDec.so", noSo = workPath + "libkaVidDec";
    EXPECT_EQ(loader.LoadVariantLib(path.data()), nullptr);
    loader.SetCpuVersion(7);
    loader.SetCpuVersion(5);  // other versions never clear the suffix
    EXPECT_STREQ(loader.mLibSuffix, "_v7.so");
    EXPECT_EQ(loader.LoadVariantLib(noSo.data()), nullptr);
    EXPECT_TRUE(Log().empty());
    EXPECT_EQ(loader.mServiceHandle, nullptr);

    std::string longPath = "/" + std::string(400, 'd') + "/";
    CLibLoader overlong;
    overlong.SetWorkPath(longPath.data());
    memset(overlong.mLibName, 'n', sizeof(overlong.mLibName) - 1);
    overlong.mLibName[sizeof(overlong.mLibName) - 1] = '\0';
    EXPECT_EQ(overlong.LoadLib(nullptr), 0);
    EXPECT_LT(strnlen(overlong.mLibName, sizeof(overlong.mLibName)), sizeof(overlong.mLibName));
}

TEST(ModuleFunctions, WrapTheDynamicLoader) {
    std::string path = kFakeDir + "libkadl.so";
    char symbol[] = "kaLoadLibrary", empty[] = "", missing[] = "no_such_symbol";
    char nowhere[] = "/nonexistent/libnothing.so";
    void* handle = kaLoadLib0x010d0000(path.data());
    ASSERT_NE(handle, nullptr);
    EXPECT_NE(kaGetAddress0x010d0000(handle, symbol), nullptr);
    for (char* name : {missing, empty, static_cast<char*>(nullptr)}) {
        EXPECT_EQ(kaGetAddress0x010d0000(handle, name), nullptr);
    }
    EXPECT_EQ(kaGetAddress0x010d0000(nullptr, symbol), nullptr);
    EXPECT_EQ(kaFreeLib0x010d0000(handle), 0);
    EXPECT_EQ(kaFreeLib0x010d0000(nullptr), -1);
    EXPECT_EQ(kaLoadLib0x010d0000(nowhere), nullptr);
}

}  // namespace
