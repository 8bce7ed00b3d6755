// The public table itself: entries, null handles, Open against missing modules, parameters,
// switching modes between Process calls, and deep nesting. What documents read into is the
// document tests' business.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <set>
#include <string>

#include "api_support.h"

using katest::Api;
using katest::Handle;
using katest::kUntouched;

namespace {

// The order of the slots is pinned by the layout test and, slot by slot, by behaviour below.
TEST(ApiTable, EntryFillsEightDistinctSlots) {
    auto adapter =
        reinterpret_cast<uintptr_t (*)()>(katest::LibrarySymbol("kaGetVMAPParserAPIAdapter"));
    auto get = reinterpret_cast<KaGetVMAPParserAPIFn>(katest::LibrarySymbol("kaGetVMAPParserAPI"));
    ASSERT_NE(adapter, nullptr);
    EXPECT_EQ(adapter(), reinterpret_cast<uintptr_t>(get));
    void* slots[8] = {};
    static_assert(sizeof(slots) == sizeof(VMAPParserAPI), "eight pointers");
    ASSERT_EQ(get(reinterpret_cast<VMAPParserAPI*>(slots)), KA_OK);
    EXPECT_EQ(std::set<void*>(slots, slots + 8).size(), 8u);
    EXPECT_EQ(std::set<void*>(slots, slots + 8).count(nullptr), 0u);
}

TEST(ApiTable, NullHandleInEverySlotButOpen) {
    const VMAPParserAPI& api = Api();
    char buffer[] = "<a/>";
    AdInfo* info = nullptr;
    VastAdData* vast = static_cast<VastAdData*>(kUntouched);
    unsigned int flag = 7;
    EXPECT_EQ(api.Close(nullptr), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.Process(nullptr, buffer, 4), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetAdInfo(nullptr, &info), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetVastAdData(nullptr, &vast), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetVastParserVastAdData(nullptr, &vast), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.SetParam(nullptr, KA_PID_VMAP_VAST_ONLY, &flag), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetParam(nullptr, KA_PID_VMAP_VAST_ONLY, &flag), KA_ERR_NULL_ARGUMENT);
    EXPECT_TRUE(info == nullptr && vast == kUntouched && flag == 7u);
}

TEST(ApiTable, OpenWithoutXmlModuleLeavesHandleUntouched) {
    char pattern[] = "/tmp/ka_vmap_api_XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    const std::string dir = std::string(pattern) + "/";
    // A working path with room for libkadl.so but not for libkaXMLParser.so; the module's name cut
    // to fit it is made to lead to the real module.
    const std::string padded = dir + std::string(243 - dir.size(), '/');
    const std::string cut = (padded + "libkaXMLParser.so").substr(0, 255).substr(padded.size());
    // {a link the folder gains (name, module it leads to), the working path}: a folder with no
    // module at all, one with the loader but no XML module, a working path too long.
    const struct {
        std::string link, module, workPath;
    } cases[] = {
        {"", "", dir}, {"libkadl.so", "libkadl.so", dir}, {cut, "libkaXMLParser.so", padded}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.link);
        if (!c.link.empty()) {
            const std::string module = std::string(KA_MODULES_DIR) + c.module;
            ASSERT_EQ(symlink(module.c_str(), (dir + c.link).c_str()), 0);
        }
        std::string workPath = c.workPath;
        void* handle = kUntouched;
        EXPECT_EQ(Api().Open(&handle, &workPath[0]), KA_ERR_MODULE_NOT_LOADED);
        EXPECT_EQ(handle, kUntouched);
        if (handle != kUntouched && handle != nullptr) Api().Close(handle);
    }
    for (const auto& c : cases) unlink((dir + c.link).c_str());
    rmdir(pattern);
}

TEST(ApiHandle, ParametersByIdentifier) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    void* h = handle.get();
    EXPECT_EQ(handle.Container(), kUntouched);  // no VAST parser yet
    KA_BOOL stop = 0;
    const struct {
        uint32_t id;
        void* value;
        unsigned int vastOnly;
    } kSets[] = {
        // clang-format off
        {KA_PID_VMAP_VAST_ONLY, kUntouched, 1}, {KA_PID_VMAP_VAST_ONLY, nullptr, 0},
        {KA_PID_VMAP_VAST_ONLY, &stop, 1}, {KA_PID_VMAP_CONTENT_URI, kUntouched, 1},
        {KA_PID_VMAP_MERGE_WRAPPERS, nullptr, 1}, {KA_PID_VMAP_STOP_FLAG, &stop, 1},
        {0x44000005u, kUntouched, 1}, {0xffffffffu, kUntouched, 1},
        {KA_PID_VMAP_VAST_ONLY, nullptr, 0}, {KA_PID_VMAP_MERGE_WRAPPERS, kUntouched, 0},
        // clang-format on
    };
    for (const auto& set : kSets) {
        EXPECT_EQ(Api().SetParam(h, set.id, set.value), KA_OK) << std::hex << set.id;
        unsigned int read = 5;
        EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, &read), KA_OK);
        EXPECT_EQ(read, set.vastOnly) << std::hex << set.id;
    }
    // GetParam writes nothing for these identifiers, nor through a null value.
    for (uint32_t id : {KA_PID_VMAP_MERGE_WRAPPERS, KA_PID_VMAP_STOP_FLAG, 0x44000005u}) {
        uint64_t value = 0x5a5a5a5a5a5a5a5aull;
        EXPECT_EQ(Api().GetParam(h, id, &value), KA_OK) << std::hex << id;
        EXPECT_EQ(value, 0x5a5a5a5a5a5a5a5aull) << std::hex << id;
    }
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, nullptr), KA_OK);
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_CONTENT_URI, nullptr), KA_OK);
    EXPECT_EQ(Api().Process(h, nullptr, 10), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(stop, 0);
}

// The mode of each Process in turn, on a handle of its own ('v' VAST only, 'm' VMAP; '!' flips
// the flag before Close): each Process releases what the previous one built, and Close what the
// last one built, whatever the flag says by then.
TEST(ApiModes, SwitchesReleaseExactlyWhatWasBuilt) {
    const std::vector<char> vast = katest::ReadFile(KA_EXAMPLES_DIR "vast-inline-linear.xml");
    const std::vector<char> vmap =
        katest::ReadFile(KA_TEST_DATA_DIR "documents/vmap/inline_breaks.xml");
    for (const std::string sequence : {"mvmvvm", "v!", "m!", "vm!"}) {
        Handle handle;
        ASSERT_EQ(handle.openResult(), KA_OK);
        for (const char step : sequence) {
            const bool vastOnly = step == 'v' || (step == '!' && sequence.end()[-2] == 'm');
            handle.SetFlag(KA_PID_VMAP_VAST_ONLY, vastOnly);
            if (step == '!') break;
            ASSERT_EQ(handle.Process(vastOnly ? vast : vmap), KA_OK);
            VastAdData* container = handle.Container();
            ASSERT_NE(container, kUntouched);
            EXPECT_EQ(handle.Info()->adBreakCount, vastOnly ? 0u : 5u);
            EXPECT_STREQ(container->firstAd->id, vastOnly ? "spring-sale" : "no-uri");
        }
    }
}

TEST(ApiHandle, DeepNestingDoesNotRecurse) {
    Handle handle;
    const int kDepth = 100000;
    const char* const kLevels[] = {"vmap:AdBreak", "vmap:AdSource", "vmap:TrackingEvents",
                                   "vmap:Tracking", "vmap:Extensions"};
    std::string document = "<vmap:VMAP>";
    for (int i = 0; i < kDepth; ++i) document += std::string("<") + kLevels[i % 5] + ">";
    for (int i = kDepth - 1; i >= 0; --i) document += std::string("</") + kLevels[i % 5] + ">";
    ASSERT_EQ(handle.Process(document + "</vmap:VMAP>"), KA_OK);
    ASSERT_EQ(handle.Info()->adBreakCount, 1u);
    ASSERT_NE(handle.Info()->adBreaks->adSource, nullptr);
    EXPECT_EQ(handle.Info()->adBreaks->trackings, nullptr) << "TrackingEvents is below the source";
}

}  // namespace
