// The loader seen through a recording libkadl.so: which names it asks for, in which order, and
// what it keeps and frees.
#include "platform/lib_loader.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "case_file.h"
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

void Prepare(CLibLoader& loader, const char* requested, const char* entry) {
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

// One search a line of tests/data/loader_cases.txt: the names asked for in order, what loads and
// the name the loader is left holding, never cut short.
TEST_F(LibLoaderTest, AsksForTheCandidatesInOrder) {
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "loader_cases.txt");
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::PrintToString(row));
        SetUp();
        Accept(kEntry);
        std::string path = row[0] == "-" ? "" : kFakeDir, expected, last;
        if (isdigit(row[0][0])) {
            ASSERT_LT(kFakeDir.size(), std::stoul(row[0]));
            path.resize(std::stoul(row[0]), '/');
        }
        for (size_t i = 4; i < row.size(); ++i) {
            last = path + row[i];
            expected += "load:" + last + " ";
        }
        const bool found = row[3] == "yes";
        if (found) Accept(last);
        CLibLoader loader;
        loader.SetWorkPath(path.empty() ? nullptr : &path[0]);
        Prepare(loader, row[1].c_str(), kEntry);
        loader.SetCpuVersion(std::stoi(row[2]));
        EXPECT_EQ(loader.LoadLib(nullptr), found ? 1 : 0);
        EXPECT_EQ(Log(), expected + (found ? "symbol:kaGetSourceIOAPI " : ""));
        EXPECT_TRUE(last.empty() || last == loader.mLibName) << loader.mLibName;
        EXPECT_LT(strnlen(loader.mLibName, sizeof(loader.mLibName)), sizeof(loader.mLibName));
    }
    EXPECT_EQ(rows.size(), 15u);
}

// A module without its entry is still held. Without an entry name nothing is resolved and the
// entry held from before counts, even after FreeLib.
TEST_F(LibLoaderTest, HeldModuleIsFreedByTheNextLoadFreeLibAndTheDestructor) {
    Accept(gWorkPath + "libkaSourceIO.so");
    const int live = CSDKObject::g_kaSDKObjectNum;
    {
        CLibLoader loader;
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, live + 1);
        loader.SetWorkPath(gWorkPath.data());
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
        Prepare(loader, "kaSourceIO", "");
        EXPECT_EQ(loader.LoadLib(nullptr), 0);
        EXPECT_EQ(loader.LoadModuleService(), 0);
        EXPECT_EQ(loader.mServiceHandle != nullptr, present);
        EXPECT_EQ(loader.mLoadLibrary != nullptr, present);
        EXPECT_EQ(loader.FreeModuleService(), 0);
        EXPECT_EQ(loader.mServiceHandle, nullptr);
        EXPECT_EQ(loader.mLoadLibrary, nullptr);
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
