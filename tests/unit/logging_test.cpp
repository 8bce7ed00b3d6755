// The logging facade through recording logging libraries: what reaches which entry, at which
// level, cut where, and what a library with missing entries does to the load.
#include "ka/logging.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "platform/logging.h"

namespace {

const std::string kFakes = KA_FAKES_DIR;
const std::string kRecording = kFakes + "recording_logsys";
const std::string kWithoutSetParam = kFakes + "logsys_without_setparam";
const std::string kMissing = kFakes + "no_such_folder";

uint32_t LoadFrom(const std::string& directory) {
    return kaLoadModule0x010d0000(directory.c_str());
}

struct Call {
    std::string function;
    int level;
    std::string text;
};

// The control functions of one recording library, in the very object the facade opens (a second
// dlopen of the same file gives the same object).
struct FakeLogSys {
    explicit FakeLogSys(const std::string& dir)
        : handle(dlopen((dir + "/libkaLogSys.so").c_str(), RTLD_NOW)) {}
    ~FakeLogSys() {
        if (handle != nullptr) dlclose(handle);
    }
    template <typename F>
    F Get(const char* name) {
        return reinterpret_cast<F>(dlsym(handle, name));
    }
    void Reset() { Get<void (*)()>("fake_logsys_reset")(); }
    std::vector<Call> Calls() {
        std::vector<Call> calls;
        for (int i = 0; i < Get<int (*)()>("fake_logsys_count")(); ++i) {
            calls.push_back({Get<const char* (*)(int)>("fake_logsys_function")(i),
                             Get<int (*)(int)>("fake_logsys_level")(i),
                             Get<const char* (*)(int)>("fake_logsys_text")(i)});
        }
        return calls;
    }
    void* handle;
};

class LoggingTest : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_NE(fake.handle, nullptr) << dlerror();
        fake.Reset();
        ka::ForgetLogLibrary();
    }
    void TearDown() override { ka::ForgetLogLibrary(); }
    void Load() { ASSERT_EQ(LoadFrom(kRecording), KA_OK); }

    FakeLogSys fake{kRecording};
};

// Every print of the family, called the same way.
struct Printer {
    const char* label;
    std::function<void(int level, const std::string& text)> print;
    const char* entry;  // the logging library's function it reaches
    bool levelChecked;
    size_t bufferSize;  // the cut is one below it
};

#define KA_FORMATTED(f) [](int l, const std::string& t) { f(l, "%s", t.c_str()); }
#define KA_CONST(f) [](int l, const std::string& t) { f(l, t.c_str()); }
const std::vector<Printer> kPrinters = {
    // clang-format off
    {"Print", KA_FORMATTED(kalogPrint0x010d0000), "kaLogDllLogPrint", true, 2048},
    {"Extend", KA_FORMATTED(kalogPrint_Extend0x010d0000), "kaLogDllLogPrint", true, 5120},
    {"Ex", KA_FORMATTED(kalogPrintEx0x010d0000), "kaLogDllLogPrintEx", false, 2048},
    {"L0", KA_FORMATTED(kalogPrintL00x010d0000), "kaLogDllLogPrintL0", true, 2048},
    {"L0Extend", KA_FORMATTED(kalogPrintL0_Extend0x010d0000), "kaLogDllLogPrintL0", true, 5120},
    {"ConstStr", KA_CONST(kalogPrint_ConstStr0x010d0000), "kaLogDllLogPrint", true, 4096},
    {"L0ConstStr", KA_CONST(kalogPrintL0_ConstStr0x010d0000), "kaLogDllLogPrintL0", true, 4096},
    // clang-format on
};

// Before any load and after a failed one, every call is dropped; a second load replaces the first.
TEST_F(LoggingTest, OnlyTheLastLoadedLibraryIsCalled) {
    const auto expectAllDropped = [] {
        for (const Printer& p : kPrinters) p.print(0, "dropped");
        EXPECT_STREQ(kalogGetErrMsg0x010d0000(KA_ERR_MODULE_NOT_LOADED), "");
        EXPECT_EQ(kalogInit0x010d0000(), 0u);
        EXPECT_EQ(kalogUninit0x010d0000(), 0u);
    };
    EXPECT_EQ(kaLoadModule0x010d0000(nullptr), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(ka::CurrentLogLibrary().handle, nullptr);
    expectAllDropped();

    Load();
    FakeLogSys other(kWithoutSetParam);
    ASSERT_NE(other.handle, nullptr);
    other.Reset();
    ASSERT_EQ(LoadFrom(kWithoutSetParam), KA_OK);
    kalogPrint0x010d0000(0, "to the second");
    EXPECT_EQ(LoadFrom(kMissing), KA_ERR_MODULE_NOT_LOADED);
    expectAllDropped();
    EXPECT_TRUE(fake.Calls().empty());
    ASSERT_EQ(other.Calls().size(), 1u);
    EXPECT_EQ(other.Calls()[0].text, "to the second\n");
}

class Family : public LoggingTest, public testing::WithParamInterface<Printer> {};

// Only levels up to 0 pass the checked variants; a message that fills the buffer loses its
// newline and a longer one is cut to the same length. Each call reaches only the variant's entry.
TEST_P(Family, LevelsAndCuts) {
    Load();
    const Printer& p = GetParam();
    std::vector<std::pair<int, std::string>> expected;
    for (int level : {-3, 0, 1, 2, 100}) {
        p.print(level, "level " + std::to_string(level));
        if (!p.levelChecked || level <= 0)
            expected.push_back({level, "level " + std::to_string(level) + "\n"});
    }
    const size_t cut = p.bufferSize - 1;
    for (size_t length : {size_t{10}, cut - 1, cut, cut + 1, size_t{3000}, cut * 3}) {
        p.print(0, std::string(length, 'm'));
        expected.push_back(
            {0, length < cut ? std::string(length, 'm') + "\n" : std::string(cut, 'm')});
    }
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), expected.size());
    for (size_t i = 0; i < calls.size(); ++i) {
        EXPECT_EQ(calls[i].function, p.entry);
        EXPECT_EQ(calls[i].level, expected[i].first);
        EXPECT_EQ(calls[i].text, expected[i].second)
            << "call " << i << " of " << calls[i].text.size() << " characters";
    }
}

std::string Name(const testing::TestParamInfo<Printer>& info) { return info.param.label; }
INSTANTIATE_TEST_SUITE_P(Logging, Family, testing::ValuesIn(kPrinters), Name);

TEST_F(LoggingTest, FormattedVariantsFormatAndConstStrDoesNot) {
    Load();
    kalogPrint0x010d0000(0, "%s=%d %05.1f %x%%", "n", -42, 3.25, 255u);
    kalogPrint_ConstStr0x010d0000(0, "%s %d %n");
    kalogPrintL0_ConstStr0x010d0000(0, "");
    const char* none = nullptr;  // a null text is dropped
    kalogPrint_ConstStr0x010d0000(0, none);
    kalogPrintL0_ConstStr0x010d0000(0, none);
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), 3u);
    EXPECT_EQ(calls[0].text, "n=-42 003.2 ff%\n");
    EXPECT_EQ(calls[1].text, "%s %d %n\n");
    EXPECT_EQ(calls[2].text, "\n");
}

TEST_F(LoggingTest, ErrorMessageComesFromTheLibraryIntoOneClearedBuffer) {
    Load();
    kalogInit0x010d0000();  // calls nothing in the library
    kalogUninit0x010d0000();
    const char* first = kalogGetErrMsg0x010d0000(KA_ERR_LOAD_FAILED);
    EXPECT_STREQ(first, "fake error 0x91001000");
    EXPECT_EQ(kalogGetErrMsg0x010d0000(7), first);
    EXPECT_STREQ(first, "fake error 0x00000007");
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_EQ(calls[0].function, "kaLogDllLogGetErrMsg");
    EXPECT_EQ(static_cast<uint32_t>(calls[0].level), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(calls[1].level, 7);

    // A text that fills the buffer is still terminated, and the next call starts from zeros.
    const auto fill = fake.Get<void (*)(int)>("fake_logsys_fill_error_buffer");
    fill(1);
    EXPECT_EQ(std::string(kalogGetErrMsg0x010d0000(1)), std::string(2047, 'x'));
    fill(0);
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(2), "fake error 0x00000002");
}

// The optional kaLogDllSetParam may be missing; without the required kaLogDllLogPrint_rpc the
// load fails, yet the entries that were found are used.
TEST_F(LoggingTest, LoadResultAndWhatIsKept) {
    const struct {
        std::string directory;
        uint32_t expected;
        bool kept;
    } cases[] = {{kRecording, KA_OK, true},
                 {kRecording + "/", KA_OK, true},
                 {kWithoutSetParam, KA_OK, true},
                 {kFakes + "logsys_without_rpc", KA_ERR_MODULE_NOT_LOADED, true},
                 {kMissing, KA_ERR_MODULE_NOT_LOADED, false},
                 {"/" + std::string(1100, 'd'), KA_ERR_MODULE_NOT_LOADED, false}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.directory);
        ka::ForgetLogLibrary();
        EXPECT_EQ(LoadFrom(c.directory), c.expected);
        EXPECT_EQ(ka::CurrentLogLibrary().handle != nullptr, c.kept);
        if (!c.kept) continue;
        FakeLogSys loaded(c.directory);
        loaded.Reset();
        kalogPrint0x010d0000(0, "kept %d", 1);
        std::vector<Call> calls = loaded.Calls();
        ASSERT_EQ(calls.size(), 1u);
        EXPECT_EQ(calls[0].text, "kept 1\n");
    }
}

TEST(LibraryPath, OneSlashBetweenDirectoryAndFile) {
    const struct {
        const char* directory;
        const char* expected;  // null: refused
        size_t size;
    } cases[] = {
        // clang-format off
        {"", "libkaLogSys.so", 64}, {"/a/b", "/a/b/libkaLogSys.so", 64},
        {"/a/b/", "/a/b/libkaLogSys.so", 64}, {"/", "/libkaLogSys.so", 64},
        {"/a", "/a/libkaLogSys.so", 18}, {"/a", nullptr, 17},  // it needs 18 bytes
        {nullptr, nullptr, 64},
        // clang-format on
    };
    for (const auto& c : cases) {
        char path[64];
        memset(path, '#', sizeof(path));
        EXPECT_EQ(ka::BuildLogLibraryPath(c.directory, path, c.size), c.expected != nullptr);
        EXPECT_STREQ(c.expected != nullptr ? path : nullptr, c.expected);
    }
}

TEST_F(LoggingTest, StandInWritesEachLineToStandardError) {
    ASSERT_EQ(kaLoadModule0x010d0000(KA_MODULES_DIR), KA_OK);
    testing::internal::CaptureStderr();
    kalogPrint0x010d0000(0, "stand-in %d", 7);
    kalogPrintEx0x010d0000(3, "second");
    kalogPrint0x010d0000(1, "dropped");
    kalogPrint0x010d0000(0, "%s", std::string(3000, 'c').c_str());
    std::string output = testing::internal::GetCapturedStderr();
    // A cut line still ends its own line.
    EXPECT_EQ(output, "[kaLogSys log 0] stand-in 7\n[kaLogSys ex 3] second\n[kaLogSys log 0] " +
                          std::string(2047, 'c') + "\n");
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(KA_ERR_MODULE_NOT_LOADED),
                 "0x90000001: an auxiliary module is not loaded");
}

}  // namespace
