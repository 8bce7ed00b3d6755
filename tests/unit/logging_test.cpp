// The logging facade through recording logging libraries: what reaches which entry, at which
// level, cut where, and what a library with missing entries does to the load.
#include "ka/logging.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <algorithm>
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
        int count = Get<int (*)()>("fake_logsys_count")();
        for (int i = 0; i < count; ++i) {
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

const std::vector<Printer>& Printers() {
    static const std::vector<Printer> printers = {
        {"Print", [](int l, const std::string& t) { kalogPrint0x010d0000(l, "%s", t.c_str()); },
         "kaLogDllLogPrint", true, 2048},
        {"PrintExtend",
         [](int l, const std::string& t) { kalogPrint_Extend0x010d0000(l, "%s", t.c_str()); },
         "kaLogDllLogPrint", true, 5120},
        {"PrintEx", [](int l, const std::string& t) { kalogPrintEx0x010d0000(l, "%s", t.c_str()); },
         "kaLogDllLogPrintEx", false, 2048},
        {"PrintL0", [](int l, const std::string& t) { kalogPrintL00x010d0000(l, "%s", t.c_str()); },
         "kaLogDllLogPrintL0", true, 2048},
        {"PrintL0Extend",
         [](int l, const std::string& t) { kalogPrintL0_Extend0x010d0000(l, "%s", t.c_str()); },
         "kaLogDllLogPrintL0", true, 5120},
        {"PrintConstStr",
         [](int l, const std::string& t) { kalogPrint_ConstStr0x010d0000(l, t.c_str()); },
         "kaLogDllLogPrint", true, 4096},
        {"PrintL0ConstStr",
         [](int l, const std::string& t) { kalogPrintL0_ConstStr0x010d0000(l, t.c_str()); },
         "kaLogDllLogPrintL0", true, 4096},
    };
    return printers;
}

void PrintTo(const Printer& p, std::ostream* os) { *os << p.label; }

std::string PrinterName(const testing::TestParamInfo<Printer>& info) { return info.param.label; }

TEST_F(LoggingTest, BeforeLoadingEveryCallIsDropped) {
    EXPECT_EQ(ka::CurrentLogLibrary().handle, nullptr);
    for (const Printer& p : Printers()) p.print(0, "dropped");
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(KA_ERR_MODULE_NOT_LOADED), "");
    EXPECT_TRUE(fake.Calls().empty());
    EXPECT_EQ(kalogInit0x010d0000(), 0u);
    EXPECT_EQ(kalogUninit0x010d0000(), 0u);
    EXPECT_TRUE(fake.Calls().empty());
}

class LevelChecks : public LoggingTest, public testing::WithParamInterface<Printer> {};

TEST_P(LevelChecks, OnlyLevelsUpToZeroPassTheCheckedVariants) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    const Printer& p = GetParam();
    std::vector<int> expectedLevels;
    for (int level : {-3, 0, 1, 2, 100}) {
        p.print(level, "level " + std::to_string(level));
        if (!p.levelChecked || level <= 0) expectedLevels.push_back(level);
    }
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), expectedLevels.size());
    for (size_t i = 0; i < calls.size(); ++i) {
        EXPECT_EQ(calls[i].function, p.entry);
        EXPECT_EQ(calls[i].level, expectedLevels[i]);
        EXPECT_EQ(calls[i].text, "level " + std::to_string(expectedLevels[i]) + "\n");
    }
}

INSTANTIATE_TEST_SUITE_P(Family, LevelChecks, testing::ValuesIn(Printers()), PrinterName);

class Cuts : public LoggingTest, public testing::WithParamInterface<Printer> {};

// Messages around the buffer size: one that leaves room for the newline keeps it, one that fills
// the buffer loses it, a longer one is cut to the same length.
TEST_P(Cuts, LongMessagesAreCutAndLoseTheirNewline) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    const Printer& p = GetParam();
    const size_t cut = p.bufferSize - 1;
    struct Length {
        size_t message;
        std::string expected;
    };
    const std::vector<Length> lengths = {
        {10, std::string(10, 'm') + "\n"}, {cut - 1, std::string(cut - 1, 'm') + "\n"},
        {cut, std::string(cut, 'm')},      {cut + 1, std::string(cut, 'm')},
        {cut * 3, std::string(cut, 'm')},
    };
    for (const Length& length : lengths) p.print(0, std::string(length.message, 'm'));
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), lengths.size());
    for (size_t i = 0; i < calls.size(); ++i) {
        EXPECT_EQ(calls[i].text.size(), lengths[i].expected.size()) << lengths[i].message;
        EXPECT_EQ(calls[i].text, lengths[i].expected) << lengths[i].message;
    }
}

INSTANTIATE_TEST_SUITE_P(Family, Cuts, testing::ValuesIn(Printers()), PrinterName);

TEST_F(LoggingTest, AMessageOfBetween2047And5118CharactersReachesTheTwoPrintsDifferently) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    const std::string message(3000, 'a');
    kalogPrint0x010d0000(0, "%s", message.c_str());
    kalogPrint_Extend0x010d0000(0, "%s", message.c_str());
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_EQ(calls[0].text, message.substr(0, 2047));
    EXPECT_EQ(calls[1].text, message + "\n");
}

TEST_F(LoggingTest, FormattedVariantsFormatAndConstStrDoesNot) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    kalogPrint0x010d0000(0, "%s=%d %05.1f %x%%", "n", -42, 3.25, 255u);
    kalogPrintEx0x010d0000(5, "ex %c", 'z');
    kalogPrint_ConstStr0x010d0000(0, "%s %d %n");
    kalogPrintL0_ConstStr0x010d0000(0, "");
    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), 4u);
    EXPECT_EQ(calls[0].text, "n=-42 003.2 ff%\n");
    EXPECT_EQ(calls[1].function, "kaLogDllLogPrintEx");
    EXPECT_EQ(calls[1].level, 5);
    EXPECT_EQ(calls[1].text, "ex z\n");
    EXPECT_EQ(calls[2].text, "%s %d %n\n");
    EXPECT_EQ(calls[3].function, "kaLogDllLogPrintL0");
    EXPECT_EQ(calls[3].text, "\n");
}

TEST_F(LoggingTest, NullFormatOrTextIsDropped) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    const char* none = nullptr;
    kalogPrint_ConstStr0x010d0000(0, none);
    kalogPrintL0_ConstStr0x010d0000(0, none);
    EXPECT_TRUE(fake.Calls().empty());
}

TEST_F(LoggingTest, EntriesThatOnlyHaveToExistAreNeverCalled) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    for (const Printer& p : Printers()) p.print(0, "x");
    kalogGetErrMsg0x010d0000(1);
    kalogInit0x010d0000();
    kalogUninit0x010d0000();
    for (const Call& call : fake.Calls()) {
        EXPECT_TRUE(call.function == "kaLogDllLogPrint" || call.function == "kaLogDllLogPrintEx" ||
                    call.function == "kaLogDllLogPrintL0" ||
                    call.function == "kaLogDllLogGetErrMsg")
            << call.function;
    }
    EXPECT_EQ(fake.Calls().size(), Printers().size() + 1);
}

TEST_F(LoggingTest, ErrorMessageComesFromTheLibraryIntoOneSharedBuffer) {
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(KA_ERR_LOAD_FAILED), "");
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);

    const char* first = kalogGetErrMsg0x010d0000(KA_ERR_LOAD_FAILED);
    EXPECT_STREQ(first, "fake error 0x91001000");
    const char* second = kalogGetErrMsg0x010d0000(7);
    EXPECT_EQ(first, second);
    EXPECT_STREQ(second, "fake error 0x00000007");

    std::vector<Call> calls = fake.Calls();
    ASSERT_EQ(calls.size(), 2u);
    EXPECT_EQ(calls[0].function, "kaLogDllLogGetErrMsg");
    EXPECT_EQ(static_cast<uint32_t>(calls[0].level), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(calls[1].level, 7);
}

TEST_F(LoggingTest, ErrorTextThatFillsTheBufferIsStillTerminated) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    fake.FillErrorBuffer(true);
    EXPECT_EQ(std::string(kalogGetErrMsg0x010d0000(1)), std::string(2047, 'x'));
    // The next call starts from a cleared buffer.
    fake.FillErrorBuffer(false);
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(2), "fake error 0x00000002");
}

// --- Loading ----------------------------------------------------------------------------------

struct LoadCase {
    const char* label;
    std::string directory;
    uint32_t expected;
    bool handleKept;  // the facade holds the library afterwards
    bool setParamFound;
    bool rpcFound;
};

void PrintTo(const LoadCase& c, std::ostream* os) { *os << c.label; }

class Loading : public LoggingTest, public testing::WithParamInterface<LoadCase> {};

TEST_P(Loading, ResultAndEntryPoints) {
    const LoadCase& c = GetParam();
    EXPECT_EQ(kaLoadModule0x010d0000(c.directory.c_str()), c.expected);
    const ka::LogLibrary& log = ka::CurrentLogLibrary();
    EXPECT_EQ(log.handle != nullptr, c.handleKept);
    if (!c.handleKept) return;

    FakeLogSys loaded(c.directory);
    EXPECT_EQ(log.handle, loaded.handle());
    EXPECT_EQ(log.setParam != nullptr, c.setParamFound);
    EXPECT_EQ(log.printRpc != nullptr, c.rpcFound);
    EXPECT_NE(log.init, nullptr);
    EXPECT_NE(log.getMaxLevel, nullptr);
    EXPECT_NE(log.print, nullptr);
    EXPECT_NE(log.printEx, nullptr);
    EXPECT_NE(log.printL0, nullptr);
    EXPECT_NE(log.uninit, nullptr);
    EXPECT_NE(log.getErrMsg, nullptr);
    EXPECT_EQ(log.maxLevel, 0);

    // Whatever the result, the entries that were found are used.
    loaded.Reset();
    kalogPrint0x010d0000(0, "kept %d", 1);
    std::vector<Call> calls = loaded.Calls();
    ASSERT_EQ(calls.size(), 1u);
    EXPECT_EQ(calls[0].text, "kept 1\n");
}

INSTANTIATE_TEST_SUITE_P(
    Libraries, Loading,
    testing::Values(LoadCase{"DirectoryWithoutFinalSlash", kRecording, KA_OK, true, true, true},
                    LoadCase{"DirectoryWithFinalSlash", kRecording + "/", KA_OK, true, true, true},
                    LoadCase{"DirectoryWithTwoFinalSlashes", kRecording + "//", KA_OK, true, true,
                             true},
                    LoadCase{"WithoutOptionalSetParam", kWithoutSetParam, KA_OK, true, false, true},
                    LoadCase{"WithoutRequiredPrintRpc", kWithoutRpc, KA_ERR_MODULE_NOT_LOADED, true,
                             true, false},
                    LoadCase{"MissingDirectory", kFakes + "no_such_folder",
                             KA_ERR_MODULE_NOT_LOADED, false, false, false},
                    LoadCase{"PathTooLong", "/" + std::string(1100, 'd'), KA_ERR_MODULE_NOT_LOADED,
                             false, false, false}),
    [](const testing::TestParamInfo<LoadCase>& info) { return std::string(info.param.label); });

TEST_F(LoggingTest, NullDirectoryLoadsNothing) {
    EXPECT_EQ(kaLoadModule0x010d0000(nullptr), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(ka::CurrentLogLibrary().handle, nullptr);
}

TEST_F(LoggingTest, ASecondLoadReplacesTheFirst) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    FakeLogSys other(kWithoutSetParam);
    ASSERT_NE(other.handle(), nullptr);
    other.Reset();
    ASSERT_EQ(kaLoadModule0x010d0000(kWithoutSetParam.c_str()), KA_OK);
    kalogPrint0x010d0000(0, "to the second");
    EXPECT_TRUE(fake.Calls().empty());
    ASSERT_EQ(other.Calls().size(), 1u);
    EXPECT_EQ(other.Calls()[0].text, "to the second\n");
}

TEST_F(LoggingTest, AFailedOpenAfterAGoodOneSilencesLogging) {
    ASSERT_EQ(kaLoadModule0x010d0000(kRecording.c_str()), KA_OK);
    EXPECT_EQ(kaLoadModule0x010d0000((kFakes + "no_such_folder").c_str()),
              KA_ERR_MODULE_NOT_LOADED);
    kalogPrint0x010d0000(0, "dropped");
    kalogPrintEx0x010d0000(0, "dropped");
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(1), "");
    EXPECT_TRUE(fake.Calls().empty());
}

struct PathCase {
    const char* directory;
    const char* expected;  // null: refused
    size_t size;
};

void PrintTo(const PathCase& c, std::ostream* os) {
    *os << (c.directory != nullptr ? c.directory : "(null)") << " in " << c.size << " bytes";
}

class LibraryPath : public testing::TestWithParam<PathCase> {};

TEST_P(LibraryPath, OneSlashBetweenDirectoryAndFile) {
    char path[64];
    memset(path, '#', sizeof(path));
    const PathCase& c = GetParam();
    bool built = ka::BuildLogLibraryPath(c.directory, path, c.size);
    EXPECT_EQ(built, c.expected != nullptr);
    if (c.expected != nullptr) {
        EXPECT_STREQ(path, c.expected);
    }
}

INSTANTIATE_TEST_SUITE_P(
    Directories, LibraryPath,
    testing::Values(PathCase{"", "libkaLogSys.so", 64}, PathCase{"/a/b", "/a/b/libkaLogSys.so", 64},
                    PathCase{"/a/b/", "/a/b/libkaLogSys.so", 64},
                    PathCase{"/", "/libkaLogSys.so", 64}, PathCase{"rel", "rel/libkaLogSys.so", 64},
                    // "/a/libkaLogSys.so" is 17 characters: it needs 18 bytes.
                    PathCase{"/a", "/a/libkaLogSys.so", 18}, PathCase{"/a", nullptr, 17},
                    PathCase{nullptr, nullptr, 64}));

// --- The stand-in logging library -----------------------------------------------------------

TEST_F(LoggingTest, StandInWritesEachLineToStandardError) {
    ASSERT_EQ(kaLoadModule0x010d0000(KA_MODULES_DIR), KA_OK);
    testing::internal::CaptureStderr();
    kalogPrint0x010d0000(0, "stand-in %d", 7);
    kalogPrintEx0x010d0000(3, "second");
    kalogPrint0x010d0000(1, "dropped");
    kalogPrint0x010d0000(0, "%s", std::string(3000, 'c').c_str());
    kalogPrintL0_ConstStr0x010d0000(0, "last");
    std::string output = testing::internal::GetCapturedStderr();
    EXPECT_NE(output.find("stand-in 7\n"), std::string::npos) << output;
    EXPECT_NE(output.find("second\n"), std::string::npos) << output;
    EXPECT_EQ(output.find("dropped"), std::string::npos) << output;
    // A cut line still ends its own line.
    EXPECT_NE(output.find(std::string(2047, 'c') + "\n"), std::string::npos);
    EXPECT_NE(output.find("last\n"), std::string::npos) << output;
    EXPECT_EQ(std::count(output.begin(), output.end(), '\n'), 4);

    std::string text = kalogGetErrMsg0x010d0000(KA_ERR_MODULE_NOT_LOADED);
    EXPECT_NE(text.find("0x90000001"), std::string::npos) << text;
    EXPECT_NE(text.find("not loaded"), std::string::npos) << text;
}

}  // namespace
