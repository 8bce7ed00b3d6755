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
const std::string kWithoutRpc = kFakes + "logsys_without_rpc";

struct Call {
    std::string function;
    int level;
    std::string text;
};

// The control functions of one recording library, reached in the very object the facade opens
// (a second dlopen of the same file gives the same object).
class FakeLogSys {
  public:
    explicit FakeLogSys(const std::string& dir)
        : handle_(dlopen((dir + "/libkaLogSys.so").c_str(), RTLD_NOW)) {}
    ~FakeLogSys() {
        if (handle_ != nullptr) dlclose(handle_);
    }
    void* handle() const { return handle_; }
    void Reset() { Get<void (*)()>("fake_logsys_reset")(); }
    void FillErrorBuffer(bool on) { Get<void (*)(int)>("fake_logsys_fill_error_buffer")(on); }
    std::vector<Call> Calls() {
        std::vector<Call> calls;
        for (int i = 0; i < Get<int (*)()>("fake_logsys_count")(); ++i) {
            calls.push_back({Get<const char* (*)(int)>("fake_logsys_function")(i),
                             Get<int (*)(int)>("fake_logsys_level")(i),
                             Get<const char* (*)(int)>("fake_logsys_text")(i)});
        }
        return calls;
    }

  private:
    template <typename F>
    F Get(const char* name) {
        return reinterpret_cast<F>(dlsym(handle_, name));
    }
    void* handle_;
};

class LoggingTest : public testing::Test {
  protected:
    void SetUp() override {
        ASSERT_NE(fake.handle(), nullptr) << dlerror();
        fake.Reset();
        ka::ForgetLogLibrary();
    }
    void TearDown() override { ka::ForgetLogLibrary(); }
    void Load() { ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK); }

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

using S = const std::string&;
const std::vector<Printer> kPrinters = {
    {"Print", [](int l, S t) { kalogPrint0x010d0000(l, "%s", t.c_str()); }, "kaLogDllLogPrint",
     true, 2048},
    {"PrintExtend", [](int l, S t) { kalogPrint_Extend0x010d0000(l, "%s", t.c_str()); },
     "kaLogDllLogPrint", true, 5120},
    {"PrintEx", [](int l, S t) { kalogPrintEx0x010d0000(l, "%s", t.c_str()); },
     "kaLogDllLogPrintEx", false, 2048},
    {"PrintL0", [](int l, S t) { kalogPrintL00x010d0000(l, "%s", t.c_str()); },
     "kaLogDllLogPrintL0", true, 2048},
    {"PrintL0Extend", [](int l, S t) { kalogPrintL0_Extend0x010d0000(l, "%s", t.c_str()); },
     "kaLogDllLogPrintL0", true, 5120},
    {"PrintConstStr", [](int l, S t) { kalogPrint_ConstStr0x010d0000(l, t.c_str()); },
     "kaLogDllLogPrint", true, 4096},
    {"PrintL0ConstStr", [](int l, S t) { kalogPrintL0_ConstStr0x010d0000(l, t.c_str()); },
     "kaLogDllLogPrintL0", true, 4096}};

TEST_F(LoggingTest, BeforeLoadingEveryCallIsDropped) {
    EXPECT_EQ(kaLoadModule0x010d0000(nullptr), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(ka::CurrentLogLibrary().handle, nullptr);
    for (const Printer& p : kPrinters) p.print(0, "dropped");
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(KA_ERR_MODULE_NOT_LOADED), "");
    EXPECT_EQ(kalogInit0x010d0000(), 0u);
    EXPECT_EQ(kalogUninit0x010d0000(), 0u);
    EXPECT_TRUE(fake.Calls().empty());
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
    fake.FillErrorBuffer(true);
    EXPECT_EQ(std::string(kalogGetErrMsg0x010d0000(1)), std::string(2047, 'x'));
    fake.FillErrorBuffer(false);
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(2), "fake error 0x00000002");
}

TEST_F(LoggingTest, LoadResultAndEntryPoints) {
    const struct {
        const char* label;
        std::string directory;
        uint32_t expected;
        bool handleKept, setParamFound, rpcFound;
    } cases[] = {
        {"WithoutFinalSlash", kRecording, KA_OK, true, true, true},
        {"WithFinalSlash", kRecording + "/", KA_OK, true, true, true},
        {"WithoutOptionalSetParam", kWithoutSetParam, KA_OK, true, false, true},
        {"WithoutRequiredPrintRpc", kWithoutRpc, KA_ERR_MODULE_NOT_LOADED, true, true, false},
        {"MissingDirectory", kFakes + "no_such_folder", KA_ERR_MODULE_NOT_LOADED, false, false,
         false},
        {"PathTooLong", "/" + std::string(1100, 'd'), KA_ERR_MODULE_NOT_LOADED, false, false,
         false}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.label);
        ka::ForgetLogLibrary();
        EXPECT_EQ(kaLoadModule0x010d0000(c.directory.c_str()), c.expected);
        const ka::LogLibrary& log = ka::CurrentLogLibrary();
        EXPECT_EQ(log.handle != nullptr, c.handleKept);
        if (!c.handleKept) continue;
        FakeLogSys loaded(c.directory);
        EXPECT_EQ(log.handle, loaded.handle());
        EXPECT_EQ(log.setParam != nullptr, c.setParamFound);
        EXPECT_EQ(log.printRpc != nullptr, c.rpcFound);
        EXPECT_TRUE(log.init && log.getMaxLevel && log.print && log.printEx && log.printL0 &&
                    log.uninit && log.getErrMsg);
        EXPECT_EQ(log.maxLevel, 0);
        // Whatever the result, the entries that were found are used.
        loaded.Reset();
        kalogPrint0x010d0000(0, "kept %d", 1);
        std::vector<Call> calls = loaded.Calls();
        ASSERT_EQ(calls.size(), 1u);
        EXPECT_EQ(calls[0].text, "kept 1\n");
    }
}

TEST_F(LoggingTest, ASecondLoadReplacesTheFirstAndAFailedOneSilencesLogging) {
    Load();
    FakeLogSys other(kWithoutSetParam);
    ASSERT_NE(other.handle(), nullptr);
    other.Reset();
    ASSERT_EQ(kaLoadModule0x010d0000(kWithoutSetParam.c_str()), KA_OK);
    kalogPrint0x010d0000(0, "to the second");
    EXPECT_TRUE(fake.Calls().empty());
    ASSERT_EQ(other.Calls().size(), 1u);
    EXPECT_EQ(other.Calls()[0].text, "to the second\n");

    EXPECT_EQ(kaLoadModule0x010d0000((kFakes + "no_such_folder").c_str()),
              KA_ERR_MODULE_NOT_LOADED);
    kalogPrintEx0x010d0000(0, "dropped");
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(1), "");
    EXPECT_EQ(other.Calls().size(), 1u);
}

TEST(LibraryPath, OneSlashBetweenDirectoryAndFile) {
    const struct {
        const char* directory;
        const char* expected;  // null: refused
        size_t size;
    } cases[] = {{"", "libkaLogSys.so", 64},
                 {"/a/b", "/a/b/libkaLogSys.so", 64},
                 {"/a/b/", "/a/b/libkaLogSys.so", 64},
                 {"/", "/libkaLogSys.so", 64},
                 {"/a", "/a/libkaLogSys.so", 18},
                 {"/a", nullptr, 17},
                 {nullptr, nullptr, 64}};  // "/a/libkaLogSys.so" needs 18 bytes
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
