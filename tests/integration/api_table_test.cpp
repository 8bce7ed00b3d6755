// The public table itself: entries, null handles, Open against missing modules, failed and
// repeated Process calls, parameters, and deep nesting. Long lists are the hostile documents'.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <string>

#include "api_support.h"

using katest::Api;
using katest::Handle;
using katest::kUntouched;
using katest::ReadTestData;

namespace {

// The order of the slots is pinned by the layout test and, slot by slot, by behaviour below.
TEST(ApiTable, EntryFillsEightDistinctSlots) {
    auto adapter =
        reinterpret_cast<uintptr_t (*)()>(katest::LibrarySymbol("kaGetVMAPParserAPIAdapter"));
    ASSERT_NE(adapter, nullptr);
    auto get = reinterpret_cast<KaGetVMAPParserAPIFn>(katest::LibrarySymbol("kaGetVMAPParserAPI"));
    EXPECT_EQ(adapter(), reinterpret_cast<uintptr_t>(get));
    void* slots[8] = {};
    static_assert(sizeof(slots) == sizeof(VMAPParserAPI), "eight pointers");
    ASSERT_EQ(get(reinterpret_cast<VMAPParserAPI*>(slots)), KA_OK);
    for (int i = 0; i < 8; ++i) {
        EXPECT_NE(slots[i], nullptr) << i;
        for (int j = i + 1; j < 8; ++j) EXPECT_NE(slots[i], slots[j]) << i << " " << j;
    }
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
    EXPECT_EQ(info, nullptr);
    EXPECT_EQ(vast, kUntouched);
    EXPECT_EQ(flag, 7u);
}

TEST(ApiTable, OpenWithoutXmlModuleLeavesHandleUntouched) {
    // A folder with no module at all, then one with the loader but no XML module.
    char pattern[] = "/tmp/ka_vmap_api_XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    std::string dir = std::string(pattern) + "/";
    const std::string kadl = std::string(KA_MODULES_DIR) + "libkadl.so";
    for (bool withLoader : {false, true}) {
        if (withLoader) {
            ASSERT_EQ(symlink(kadl.c_str(), (dir + "libkadl.so").c_str()), 0);
        }
        void* handle = kUntouched;
        EXPECT_EQ(Api().Open(&handle, &dir[0]), KA_ERR_MODULE_NOT_LOADED) << withLoader;
        EXPECT_EQ(handle, kUntouched) << withLoader;
    }
    unlink((dir + "libkadl.so").c_str());
    rmdir(pattern);
}

class ApiHandle : public ::testing::Test {
protected:
    void SetUp() override { ASSERT_EQ(handle.openResult(), KA_OK); }
    Handle handle;
};

TEST_F(ApiHandle, FreshHandleIsEmptyAndParametersByIdentifier) {
    void* h = handle.get();
    ASSERT_NE(handle.Info(), nullptr);
    EXPECT_EQ(handle.Info()->adBreakCount, 0u);
    EXPECT_EQ(handle.Info()->adBreaks, nullptr);
    EXPECT_EQ(Api().GetAdInfo(h, nullptr), KA_OK);
    EXPECT_EQ(handle.Container(), kUntouched);
    char* uri = static_cast<char*>(kUntouched);
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_CONTENT_URI, &uri), KA_OK);
    EXPECT_EQ(uri, nullptr);
    KA_BOOL stop = 0;
    // Each SetParam in turn, then what GetParam(VAST_ONLY) reads back.
    const struct {
        uint32_t id;
        void* value;
        unsigned int vastOnly;
    } kSets[] = {
        // clang-format off
        {KA_PID_VMAP_VAST_ONLY, kUntouched, 1}, {KA_PID_VMAP_VAST_ONLY, nullptr, 0},
        {KA_PID_VMAP_VAST_ONLY, &stop, 1}, {KA_PID_VMAP_CONTENT_URI, kUntouched, 1},
        {KA_PID_VMAP_MERGE_WRAPPERS, nullptr, 1}, {KA_PID_VMAP_STOP_FLAG, &stop, 1},
        {0x44000005u, kUntouched, 1}, {0u, nullptr, 1}, {0xffffffffu, kUntouched, 1},
        {KA_PID_VMAP_VAST_ONLY, nullptr, 0}, {0x44000005u, kUntouched, 0},
        {KA_PID_VMAP_MERGE_WRAPPERS, kUntouched, 0}, {KA_PID_VMAP_STOP_FLAG, nullptr, 0},
        // clang-format on
    };
    for (const auto& set : kSets) {
        SCOPED_TRACE(testing::Message() << std::hex << set.id);
        EXPECT_EQ(Api().SetParam(h, set.id, set.value), KA_OK);
        unsigned int read = 5;
        EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, &read), KA_OK);
        EXPECT_EQ(read, set.vastOnly);
        EXPECT_EQ(handle.ContentUri(), nullptr);
    }
    // GetParam writes nothing for these identifiers, nor through a null value.
    for (uint32_t id : {KA_PID_VMAP_MERGE_WRAPPERS, KA_PID_VMAP_STOP_FLAG, 0x44000005u, 0u}) {
        uint64_t value = 0x5a5a5a5a5a5a5a5aull;
        EXPECT_EQ(Api().GetParam(h, id, &value), KA_OK) << std::hex << id;
        EXPECT_EQ(value, 0x5a5a5a5a5a5a5a5aull) << std::hex << id;
    }
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, nullptr), KA_OK);
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_CONTENT_URI, nullptr), KA_OK);
    EXPECT_EQ(stop, 0);
    EXPECT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 4u);
}

TEST_F(ApiHandle, BadBuffersFailAndHandleStaysUsable) {
    const struct {
        const char* name;
        std::vector<char> bytes;
    } kBad[] = {
        // clang-format off
        {"empty", {}}, {"one blank", {' '}}, {"binary", {'\0', '\x01', '\xff', '<', '\0'}},
        {"not xml", ReadTestData("vmap/invalid/not_xml.txt")},
        {"truncated", ReadTestData("vmap/invalid/truncated.xml")},
        {"rootless", ReadTestData("vmap/invalid/rootless.xml")},
        // clang-format on
    };
    for (const auto& bad : kBad) {
        SCOPED_TRACE(bad.name);
        // A good document first: the failed Process must release its records.
        ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
        EXPECT_EQ(handle.Process(bad.bytes), KA_ERR_LOAD_FAILED);
        EXPECT_EQ(handle.Info()->adBreakCount, 0u);
        EXPECT_EQ(handle.Info()->adBreaks, nullptr);
        EXPECT_EQ(handle.ContentUri(), nullptr);
    }
    EXPECT_EQ(Api().Process(handle.get(), nullptr, 10), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 4u);
}

TEST_F(ApiHandle, ProcessTwiceReplacesRecords) {
    ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    AdInfo* first = handle.Info();
    ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    AdInfo* info = handle.Info();
    EXPECT_EQ(first, info) << "the AdInfo lives as long as the handle";
    EXPECT_EQ(info->adBreakCount, 4u);
    EXPECT_EQ(katest::Length(info->adBreaks), 4u);
    EXPECT_EQ(katest::Length(info->adBreaks->trackings), 5u);
    EXPECT_STREQ(handle.ContentUri(), "http://cdn.test/movie.m3u8?a=1&b=2");
    // A VAST-only Process releases them too; back in VMAP mode they are read again.
    handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    ASSERT_EQ(handle.Process(std::string("<VAST version=\"3.0\"/>")), KA_OK);
    EXPECT_EQ(info->adBreakCount, 0u);
    EXPECT_EQ(handle.ContentUri(), nullptr);
    handle.SetFlag(KA_PID_VMAP_VAST_ONLY, false);
    ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(info->adBreakCount, 4u);
    // A document without breaks after a bigger one: nothing of the first remains.
    ASSERT_EQ(handle.Process(ReadTestData("vmap/no_breaks.xml")), KA_OK);
    EXPECT_EQ(info->adBreakCount, 0u);
    EXPECT_EQ(info->adBreaks, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);
}

TEST_F(ApiHandle, DeepNestingDoesNotRecurse) {
    // Every level carries a name some handler knows, so a walk by depth would follow it.
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
