// The logging facade over recording logging libraries: which entry gets what, at which level,
// cut where, and what a failed or incomplete load leaves in use.
#include "ka/logging.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "platform/logging.h"

namespace {

const std::string kFakes = KA_FAKES_DIR;
const std::string kRecording = kFakes + "recording_logsys";

// The recording library's log, and its reset, reached through a handle the facade opened.
std::string Log(void* library) {
    return reinterpret_cast<const char* (*)()>(dlsym(library, "fake_logsys_log"))();
}
void Reset(void* library, int fill) {
    reinterpret_cast<void (*)(int)>(dlsym(library, "fake_logsys_reset"))(fill);
}

uint32_t Load(const std::string& directory) {
    const uint32_t result = kaLoadModule0x010d0000(directory.c_str());
    if (ka::CurrentLogLibrary().handle != nullptr) Reset(ka::CurrentLogLibrary().handle, 0);
    return result;
}

struct Printer {
    void (*print)(int level, const char* text);
    const char* entry;
    bool levelChecked;
    size_t cut;  // one below the variant's buffer
};

#define KA_FORMATTED(f) [](int l, const char* t) { f(l, "%s", t); }
// clang-format off
const Printer kPrinters[] = {
    {KA_FORMATTED(kalogPrint0x010d0000), "kaLogDllLogPrint", true, 2047},
    {KA_FORMATTED(kalogPrint_Extend0x010d0000), "kaLogDllLogPrint", true, 5119},
    {KA_FORMATTED(kalogPrintEx0x010d0000), "kaLogDllLogPrintEx", false, 2047},
    {KA_FORMATTED(kalogPrintL00x010d0000), "kaLogDllLogPrintL0", true, 2047},
    {KA_FORMATTED(kalogPrintL0_Extend0x010d0000), "kaLogDllLogPrintL0", true, 5119},
    {kalogPrint_ConstStr0x010d0000, "kaLogDllLogPrint", true, 4095},
    {kalogPrintL0_ConstStr0x010d0000, "kaLogDllLogPrintL0", true, 4095}};
// clang-format on

class Family : public testing::TestWithParam<Printer> {};

// Checked variants pass levels up to 0. A newline is added when it fits; a longer message is cut.
// "%d" goes through as it is: ConstStr does not format.
TEST_P(Family, LevelsCutsAndEntry) {
    const Printer& p = GetParam();
    ASSERT_EQ(Load(kRecording), KA_OK);
    std::string expected;
    for (int level : {-1, 0, 1}) {
        p.print(level, "50%d");
        if (!p.levelChecked || level <= 0)
            expected += p.entry + (" " + std::to_string(level)) + " 50%d\n|";
    }
    p.print(0, std::string(p.cut - 1, 'm').c_str());
    p.print(0, std::string(p.cut + 1, 'm').c_str());
    expected += p.entry + (" 0 " + std::string(p.cut - 1, 'm')) + "\n|" + p.entry + " 0 " +
                std::string(p.cut, 'm') + "|";
    EXPECT_EQ(Log(ka::CurrentLogLibrary().handle), expected);
}

INSTANTIATE_TEST_SUITE_P(Logging, Family, testing::ValuesIn(kPrinters));

// Error texts come from the library, in one static buffer, always terminated. Each load replaces
// the last, and an incomplete library is still used. After a failed load nothing is, and error
// texts are empty, though the entries of the last library are still remembered.
TEST(Logging, EachLoadReplacesTheLast) {
    ASSERT_EQ(Load(kRecording), KA_OK);
    const char* text = kalogGetErrMsg0x010d0000(KA_ERR_LOAD_FAILED);
    EXPECT_STREQ(text, "fake error 0x91001000");
    Reset(ka::CurrentLogLibrary().handle, 1);
    EXPECT_EQ(kalogGetErrMsg0x010d0000(1), text);
    EXPECT_EQ(std::string(text), std::string(2047, 'x'));
    const std::pair<std::string, uint32_t> loads[] = {
        {kRecording, KA_OK},
        {kFakes + "logsys_without_setparam", KA_OK},
        {kFakes + "logsys_without_rpc", KA_ERR_MODULE_NOT_LOADED}};
    std::vector<void*> libraries;
    for (const auto& [directory, result] : loads) {
        EXPECT_EQ(Load(directory), result) << directory;
        libraries.push_back(ka::CurrentLogLibrary().handle);
        ASSERT_NE(libraries.back(), nullptr) << directory;
        kalogPrint0x010d0000(0, "x");
    }
    EXPECT_EQ(Load(kFakes + "no_such_folder"), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(1), "");
    kalogPrint0x010d0000(0, "y");
    for (void* library : libraries) EXPECT_EQ(Log(library), "kaLogDllLogPrint 0 x\n|");
}

TEST(LibraryPath, OneSlashBetweenDirectoryAndFile) {
    // clang-format off
    const struct { const char* directory; size_t size; const char* expected; } cases[] = {
        {"", 64, "libkaLogSys.so"}, {"/a/b", 64, "/a/b/libkaLogSys.so"},
        {"/a/b/", 64, "/a/b/libkaLogSys.so"}, {"/a", 18, "/a/libkaLogSys.so"},
        {"/a", 17, nullptr}, {nullptr, 64, nullptr}};  // null: refused
    // clang-format on
    for (const auto& c : cases) {
        char path[64] = {};
        EXPECT_EQ(ka::BuildLogLibraryPath(c.directory, path, c.size), c.expected != nullptr);
        EXPECT_STREQ(c.expected != nullptr ? path : nullptr, c.expected);
    }
}

TEST(Logging, StandInWritesEachLineToStandardError) {
    ASSERT_EQ(kaLoadModule0x010d0000(KA_MODULES_DIR), KA_OK);
    testing::internal::CaptureStderr();
    kalogPrint0x010d0000(0, "stand-in %d", 7);
    kalogPrintEx0x010d0000(3, "second");
    kalogPrint0x010d0000(0, "%s", std::string(3000, 'c').c_str());
    EXPECT_EQ(testing::internal::GetCapturedStderr(),
              "[kaLogSys log 0] stand-in 7\n[kaLogSys ex 3] second\n[kaLogSys log 0] " +
                  std::string(2047, 'c') + "\n");
    EXPECT_STREQ(kalogGetErrMsg0x010d0000(KA_ERR_MODULE_NOT_LOADED),
                 "0x90000001: an auxiliary module is not loaded");
}

}  // namespace
