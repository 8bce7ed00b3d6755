// The loader seen through a recording libkadl.so: which names it asks for, in which order, and
// what it keeps and frees.
#include "platform/lib_loader.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "ka/module_loading.h"

namespace {

const std::string kFakeDir = std::string(KA_FAKES_DIR) + "recording_kadl/";
std::string gWorkPath = kFakeDir;
const char kEntry[] = "kaGetSourceIOAPI";
// The loader's dlopen of libkadl.so finds this very object by its soname.
void* const gFake = dlopen((kFakeDir + "libkadl.so").c_str(), RTLD_NOW);

template <typename F>
F Fake(const char* name) {
    return reinterpret_cast<F>(dlsym(gFake, name));
}
void Accept(const std::string& name) {
    Fake<void (*)(const char*)>("fake_kadl_accept")(name.c_str());
}
std::string Log() { return Fake<const char* (*)()>("fake_kadl_log")(); }

void Prepare(CLibLoader& loader, const char* requested, const char* entry,
             bool withWorkPath = true) {
    if (withWorkPath) loader.SetWorkPath(gWorkPath.data());
    snprintf(loader.mLibName, sizeof(loader.mLibName), "%s", requested);
    snprintf(loader.mEntryName, sizeof(loader.mEntryName), "%s", entry);
}

class LibLoaderTest : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_NE(gFake, nullptr) << dlerror();
        Fake<void (*)()>("fake_kadl_reset")();
    }
};

TEST_F(LibLoaderTest, AsksForTheCandidatesInOrder) {
    const std::vector<std::string> all = {"kaSourceIO", "libkaSourceIO", "/system/lib/kaSourceIO",
                                          "/system/lib/libkaSourceIO"};
    // {with the working path, requested, CPU version (7: codec variants first), the names asked for
    // after the working path, whether the last of them loads}
    // clang-format off
    const struct { bool withWorkPath; const char* requested; int cpuVersion; std::vector<std::string> asks; bool found; } cases[] = {
        {false, "kaSourceIO", 0, all, true}, {false, "kaSourceIO", 0, {"kaSourceIO"}, true},
        {false, "kaSourceIO", 0, all, false}, {false, "/opt/ka.so", 0, {"/opt/ka.so"}, false},
        {true, "kaSourceIO", 0, {"libkaSourceIO.so"}, true},
        {true, "kaXMLParser.so", 0, {"libkaXMLParser.so"}, false},
        {true, "kaMylibMod", 0, {"kaMylibMod.so"}, true},
        {true, "kaVidDec", 7, {"libkaVidDec_v7.so", "libkaVidDec.so"}, true},
        {true, "kaAACDec", 7, {"libkaAACDec_v7.so"}, true},
        {true, "kaSourceIO", 7, {"libkaSourceIO.so", "libkaSourceIO.so"}, false},
        {true, "kaVidDec", 6, {"libkaVidDec.so"}, false}};
    // clang-format on
    for (const auto& c : cases) {
        SetUp();
        Accept(kEntry);
        std::string expected, last;
        for (const std::string& name : c.asks) {
            last = (c.withWorkPath ? gWorkPath : "") + name;
            expected += "load:" + last + " ";
        }
        if (c.found) Accept(last);
        CLibLoader loader;
        Prepare(loader, c.requested, kEntry, c.withWorkPath);
        loader.SetCpuVersion(c.cpuVersion);
        EXPECT_EQ(loader.LoadLib(nullptr), c.found ? 1 : 0) << last;
        EXPECT_EQ(Log(), expected + (c.found ? "symbol:kaGetSourceIOAPI " : ""));
        EXPECT_EQ(loader.mLibName, last);
    }
}

// A module without its entry is still held. Without an entry name nothing is resolved and the
// entry held from before counts, even after FreeLib.
TEST_F(LibLoaderTest, HeldModuleIsFreedByTheNextLoadFreeLibAndTheDestructor) {
    Accept(gWorkPath + "libkaSourceIO.so");
    const int live = CSDKObject::g_kaSDKObjectNum;
    {
        CLibLoader loader;
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, live + 1);
        Prepare(loader, "kaSourceIO", kEntry);
        EXPECT_EQ(loader.LoadLib(nullptr), 0);
        Accept(kEntry);
        Prepare(loader, "kaSourceIO", kEntry);
        EXPECT_EQ(loader.LoadLib(nullptr), 1);
        Prepare(loader, "kaSourceIO", "");
        EXPECT_EQ(loader.LoadLib(nullptr), 1);
        EXPECT_EQ(loader.FreeLib(), 0);
        EXPECT_EQ(loader.FreeLib(), 0);
        Prepare(loader, "kaSourceIO", "");
        EXPECT_EQ(loader.LoadLib(nullptr), 1);
    }
    EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, live);
    const std::string load = "load:" + gWorkPath + "libkaSourceIO.so ",
                      symbol = "symbol:kaGetSourceIOAPI ";
    EXPECT_EQ(Log(),
              load + symbol + "free " + load + symbol + "free " + load + "free " + load + "free ");
}

// A service that is missing, or lacks a function, loads nothing; an incomplete one stays open
// until it is freed.
TEST_F(LibLoaderTest, IncompleteOrMissingServiceLoadsNothing) {
    for (std::string path :
         {std::string(KA_FAKES_DIR) + "kadl_without_free/", std::string("/nonexistent/")}) {
        SCOPED_TRACE(path);
        const bool present = path != "/nonexistent/";
        CLibLoader loader;
        loader.SetWorkPath(path.data());
        Prepare(loader, "kaSourceIO", "", false);
        EXPECT_EQ(loader.LoadLib(nullptr), 0);
        EXPECT_EQ(loader.LoadModuleService(), 0);
        EXPECT_EQ(loader.mServiceHandle != nullptr, present);
        EXPECT_EQ(loader.mLoadLibrary != nullptr, present);
        EXPECT_EQ(loader.FreeModuleService(), 0);
        EXPECT_EQ(loader.mServiceHandle, nullptr);
        EXPECT_EQ(loader.mLoadLibrary, nullptr);
    }
}

// A name that does not fit mLibName is never asked for cut short: the search ends there. The
// working paths are the fake's folder padded with slashes to a length.
TEST_F(LibLoaderTest, NamesThatDoNotFitAreNeverAsked) {
    const std::string n250(250, 'n');
    // {working path length (0: none), requested, CPU version, the names asked for after the path}
    // clang-format off
    const struct { size_t length; std::string requested; int cpuVersion; std::vector<std::string> asks; } cases[] = {
        {243, "kaSourceIO", 0, {}},  // libkadl.so fits, libkaSourceIO.so does not
        {240, "kaVidDec", 7, {"libkaVidDec.so"}},  // the plain name fits, its "_v7.so" variant not
        {0, n250, 0, {n250, "lib" + n250}},  // "/system/lib/" candidates do not fit
        {400, "kaSourceIO", 0, {}},  // not even libkadl.so fits
    };
    // clang-format on
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.length) + " " + c.requested);
        SetUp();
        ASSERT_LT(kFakeDir.size(), c.length == 0 ? 256 : c.length);
        std::string path =
            c.length == 0 ? "" : kFakeDir + std::string(c.length - kFakeDir.size(), '/');
        std::string expected;
        for (const std::string& name : c.asks) expected += "load:" + path + name + " ";
        CLibLoader loader;
        loader.SetWorkPath(c.length == 0 ? nullptr : &path[0]);
        Prepare(loader, c.requested.c_str(), kEntry, false);
        loader.SetCpuVersion(c.cpuVersion);
        EXPECT_EQ(loader.LoadLib(nullptr), 0);
        EXPECT_EQ(Log(), expected);
        EXPECT_LT(strnlen(loader.mLibName, sizeof(loader.mLibName)), sizeof(loader.mLibName));
    }
}

TEST(ModuleFunctions, WrapTheDynamicLoader) {
    std::string path = kFakeDir + "libkadl.so";
    char symbol[] = "kaLoadLibrary", global[] = "malloc";
    void* handle = kaLoadLib0x010d0000(path.data());
    ASSERT_NE(handle, nullptr);
    EXPECT_NE(kaGetAddress0x010d0000(handle, symbol), nullptr);
    EXPECT_EQ(kaGetAddress0x010d0000(handle, nullptr), nullptr);
    EXPECT_EQ(kaGetAddress0x010d0000(nullptr, global), nullptr);  // not the global scope
    EXPECT_EQ(kaFreeLib0x010d0000(handle), 0);
    EXPECT_EQ(kaFreeLib0x010d0000(nullptr), -1);
}

}  // namespace
