// The public table itself: entries, null handles, Open against missing modules, failed and
// repeated Process calls, parameters, and documents shaped to hurt.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstring>
#include <string>

#include "api_support.h"

using katest::Api;
using katest::BreakAt;
using katest::Handle;
using katest::Length;
using katest::ReadTestData;

namespace {

void* const kUntouched = reinterpret_cast<void*>(0x1234);

// A temporary folder removed with everything in it when the test ends.
class TempDir {
  public:
    TempDir() {
        char pattern[] = "/tmp/ka_vmap_api_XXXXXX";
        const char* made = mkdtemp(pattern);
        path_ = made != nullptr ? std::string(made) + "/" : std::string();
    }
    ~TempDir() {
        if (path_.empty()) return;
        unlink((path_ + "libkadl.so").c_str());
        rmdir(path_.c_str());
    }
    std::string path_;
};

TEST(ApiTable, AdapterReturnsTheEntry) {
    auto adapter =
        reinterpret_cast<uintptr_t (*)()>(katest::LibrarySymbol("kaGetVMAPParserAPIAdapter"));
    ASSERT_NE(adapter, nullptr);
    EXPECT_EQ(adapter(), reinterpret_cast<uintptr_t>(katest::LibrarySymbol("kaGetVMAPParserAPI")));
}

TEST(ApiTable, FillsEightSlotsInOrder) {
    auto get = reinterpret_cast<KaGetVMAPParserAPIFn>(katest::LibrarySymbol("kaGetVMAPParserAPI"));
    ASSERT_NE(get, nullptr);
    void* slots[8];
    memset(slots, 0, sizeof(slots));
    static_assert(sizeof(slots) == sizeof(VMAPParserAPI), "eight pointers");
    EXPECT_EQ(get(reinterpret_cast<VMAPParserAPI*>(slots)), KA_OK);
    for (void* slot : slots) EXPECT_NE(slot, nullptr);
    // Distinct functions: a slot filled twice would leave another one wrong.
    for (int i = 0; i < 8; ++i) {
        for (int j = i + 1; j < 8; ++j) EXPECT_NE(slots[i], slots[j]) << i << " " << j;
    }
    // The order shows through behaviour: Open opens, Process fills what GetAdInfo lends,
    // GetParam reads what SetParam stored.
    auto open = reinterpret_cast<uint32_t (*)(void**, char*)>(slots[0]);
    auto close = reinterpret_cast<uint32_t (*)(void*)>(slots[1]);
    auto process = reinterpret_cast<uint32_t (*)(void*, void*, uint32_t)>(slots[2]);
    auto getAdInfo = reinterpret_cast<uint32_t (*)(void*, AdInfo**)>(slots[3]);
    auto setParam = reinterpret_cast<uint32_t (*)(void*, uint32_t, void*)>(slots[6]);
    auto getParam = reinterpret_cast<uint32_t (*)(void*, uint32_t, void*)>(slots[7]);
    std::string workPath = KA_MODULES_DIR;
    void* handle = nullptr;
    ASSERT_EQ(open(&handle, &workPath[0]), KA_OK);
    ASSERT_NE(handle, nullptr);
    char document[] = "<vmap:VMAP><vmap:AdBreak breakId=\"x\"/></vmap:VMAP>";
    EXPECT_EQ(process(handle, document, sizeof(document) - 1), KA_OK);
    AdInfo* info = nullptr;
    EXPECT_EQ(getAdInfo(handle, &info), KA_OK);
    ASSERT_NE(info, nullptr);
    EXPECT_EQ(info->adBreakCount, 1u);
    EXPECT_EQ(setParam(handle, KA_PID_VMAP_VAST_ONLY, kUntouched), KA_OK);
    unsigned int flag = 0;
    EXPECT_EQ(getParam(handle, KA_PID_VMAP_VAST_ONLY, &flag), KA_OK);
    EXPECT_EQ(flag, 1u);
    auto getVast = reinterpret_cast<uint32_t (*)(void*, VastAdData**)>(slots[4]);
    auto getNestedVast = reinterpret_cast<uint32_t (*)(void*, VastAdData**)>(slots[5]);
    VastAdData* vast = nullptr;
    EXPECT_EQ(close(nullptr), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(process(nullptr, document, 4), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(getAdInfo(nullptr, &info), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(getVast(nullptr, &vast), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(getNestedVast(nullptr, &vast), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(setParam(nullptr, KA_PID_VMAP_VAST_ONLY, nullptr), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(getParam(nullptr, KA_PID_VMAP_VAST_ONLY, &flag), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(close(handle), KA_OK);
}

TEST(ApiTable, NullHandleInEverySlotButOpen) {
    const VMAPParserAPI& api = Api();
    char buffer[] = "<a/>";
    AdInfo* info = nullptr;
    VastAdData* vast = nullptr;
    unsigned int flag = 7;
    EXPECT_EQ(api.Close(nullptr), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.Process(nullptr, buffer, 4), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetAdInfo(nullptr, &info), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetVastAdData(nullptr, &vast), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetVastParserVastAdData(nullptr, &vast), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.SetParam(nullptr, KA_PID_VMAP_VAST_ONLY, &flag), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(api.GetParam(nullptr, KA_PID_VMAP_VAST_ONLY, &flag), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(info, nullptr);
    EXPECT_EQ(vast, nullptr);
    EXPECT_EQ(flag, 7u);
}

TEST(ApiTable, OpenWithoutAnyModuleLeavesHandleUntouched) {
    TempDir dir;
    ASSERT_FALSE(dir.path_.empty());
    void* handle = kUntouched;
    EXPECT_EQ(Api().Open(&handle, &dir.path_[0]), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(handle, kUntouched);
}

TEST(ApiTable, OpenWithoutXmlModuleLeavesHandleUntouched) {
    TempDir dir;
    ASSERT_FALSE(dir.path_.empty());
    const std::string kadl = std::string(KA_MODULES_DIR) + "libkadl.so";
    ASSERT_EQ(access(kadl.c_str(), R_OK), 0) << kadl;
    ASSERT_EQ(symlink(kadl.c_str(), (dir.path_ + "libkadl.so").c_str()), 0);
    void* handle = kUntouched;
    EXPECT_EQ(Api().Open(&handle, &dir.path_[0]), KA_ERR_MODULE_NOT_LOADED);
    EXPECT_EQ(handle, kUntouched);
}

TEST(ApiTable, FreshHandleIsEmpty) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    ASSERT_NE(handle.get(), nullptr);
    AdInfo* info = handle.Info();
    ASSERT_NE(info, nullptr);
    EXPECT_EQ(info->adBreakCount, 0u);
    EXPECT_EQ(info->adBreaks, nullptr);
    EXPECT_EQ(Api().GetAdInfo(handle.get(), nullptr), KA_OK);

    VastAdData* vast = reinterpret_cast<VastAdData*>(kUntouched);
    EXPECT_EQ(Api().GetVastAdData(handle.get(), &vast), KA_OK);
    EXPECT_EQ(vast, kUntouched);

    char* uri = static_cast<char*>(kUntouched);
    EXPECT_EQ(Api().GetParam(handle.get(), KA_PID_VMAP_CONTENT_URI, &uri), KA_OK);
    EXPECT_EQ(uri, nullptr);
}

TEST(ApiTable, VastOnlyFlagFollowsSetParam) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    void* h = handle.get();
    unsigned int flag = 9;
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, &flag), KA_OK);
    EXPECT_EQ(flag, 0u);
    for (void* value : {kUntouched, static_cast<void*>(&flag)}) {
        EXPECT_EQ(Api().SetParam(h, KA_PID_VMAP_VAST_ONLY, value), KA_OK);
        flag = 9;
        EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, &flag), KA_OK);
        EXPECT_EQ(flag, 1u);
    }
    EXPECT_EQ(Api().SetParam(h, KA_PID_VMAP_VAST_ONLY, nullptr), KA_OK);
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, &flag), KA_OK);
    EXPECT_EQ(flag, 0u);
    // A null value gets nothing written and no crash.
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, nullptr), KA_OK);
    EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_CONTENT_URI, nullptr), KA_OK);
}

// Identifiers whose GetParam writes nothing, and SetParam values that must change nothing
// that can be read back.
TEST(ApiTable, OtherIdentifiersAreAcceptedAndReadNothing) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    void* h = handle.get();
    KA_BOOL stop = 0;
    const struct {
        uint32_t id;
        void* value;
    } kSets[] = {
        {KA_PID_VMAP_CONTENT_URI, kUntouched},
        {KA_PID_VMAP_MERGE_WRAPPERS, nullptr},
        {KA_PID_VMAP_MERGE_WRAPPERS, kUntouched},
        {KA_PID_VMAP_STOP_FLAG, &stop},
        {KA_PID_VMAP_STOP_FLAG, nullptr},
        {0x44000000u, kUntouched},
        {0x44000005u, kUntouched},
        {0u, nullptr},
        {0xffffffffu, kUntouched},
    };
    for (const auto& set : kSets) {
        EXPECT_EQ(Api().SetParam(h, set.id, set.value), KA_OK) << std::hex << set.id;
        unsigned int flag = 5;
        EXPECT_EQ(Api().GetParam(h, KA_PID_VMAP_VAST_ONLY, &flag), KA_OK);
        EXPECT_EQ(flag, 0u) << std::hex << set.id;
        EXPECT_EQ(handle.ContentUri(), nullptr) << std::hex << set.id;
    }
    for (uint32_t id : {KA_PID_VMAP_MERGE_WRAPPERS, KA_PID_VMAP_STOP_FLAG, 0x44000005u, 0u}) {
        uint64_t value = 0x5a5a5a5a5a5a5a5aull;
        EXPECT_EQ(Api().GetParam(h, id, &value), KA_OK) << std::hex << id;
        EXPECT_EQ(value, 0x5a5a5a5a5a5a5a5aull) << std::hex << id;
    }
    EXPECT_EQ(stop, 0);
    // The handle still parses after all of this.
    EXPECT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 4u);
}

struct BadDocument {
    const char* name;
    std::vector<char> bytes;
};

TEST(ApiTable, BadBuffersFailAndHandleStaysUsable) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    const BadDocument kBad[] = {
        {"empty", {}},
        {"one blank", {' '}},
        {"not xml", ReadTestData("vmap/invalid/not_xml.txt")},
        {"truncated", ReadTestData("vmap/invalid/truncated.xml")},
        {"rootless", ReadTestData("vmap/invalid/rootless.xml")},
        {"binary", {'\0', '\x01', '\xff', '<', '\0'}},
    };
    for (const BadDocument& bad : kBad) {
        // Records of a good document first: the failed Process must release them.
        ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
        ASSERT_EQ(handle.Info()->adBreakCount, 4u);
        EXPECT_EQ(handle.Process(bad.bytes), KA_ERR_LOAD_FAILED) << bad.name;
        EXPECT_EQ(handle.Info()->adBreakCount, 0u) << bad.name;
        EXPECT_EQ(handle.Info()->adBreaks, nullptr) << bad.name;
        EXPECT_EQ(handle.ContentUri(), nullptr) << bad.name;
    }
    EXPECT_EQ(Api().Process(handle.get(), nullptr, 10), KA_ERR_LOAD_FAILED);
    EXPECT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 4u);
}

TEST(ApiTable, ProcessTwiceReplacesRecords) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    const std::vector<char> document = ReadTestData("vmap/full.xml");
    ASSERT_EQ(handle.Process(document), KA_OK);
    AdInfo* first = handle.Info();
    ASSERT_EQ(handle.Process(document), KA_OK);
    AdInfo* second = handle.Info();
    EXPECT_EQ(first, second) << "the AdInfo lives as long as the handle";
    EXPECT_EQ(second->adBreakCount, 4u);
    EXPECT_EQ(Length(second->adBreaks), 4u);
    EXPECT_STREQ(BreakAt(second, 0)->breakId, "pre");
    EXPECT_EQ(Length(BreakAt(second, 0)->trackings), 5u);
    EXPECT_STREQ(handle.ContentUri(), "http://cdn.test/movie.m3u8?a=1&b=2");
    // A smaller document after a bigger one: nothing of the first remains.
    ASSERT_EQ(handle.Process(ReadTestData("vmap/no_breaks.xml")), KA_OK);
    EXPECT_EQ(second->adBreakCount, 0u);
    EXPECT_EQ(second->adBreaks, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);
}

TEST(ApiTable, VastOnlyProcessReleasesVmapRecordsOnce) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    ASSERT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_VAST_ONLY, kUntouched), KA_OK);
    handle.Process(std::string("<VAST version=\"3.0\"/>"));
    EXPECT_EQ(handle.Info()->adBreakCount, 0u);
    EXPECT_EQ(handle.Info()->adBreaks, nullptr);
    EXPECT_EQ(handle.ContentUri(), nullptr);
    ASSERT_EQ(Api().SetParam(handle.get(), KA_PID_VMAP_VAST_ONLY, nullptr), KA_OK);
    EXPECT_EQ(handle.Process(ReadTestData("vmap/full.xml")), KA_OK);
    EXPECT_EQ(handle.Info()->adBreakCount, 4u);
}

TEST(ApiTable, DeepNestingDoesNotRecurse) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    // Every level carries a name some handler knows, so a walk by depth would follow it.
    const int kDepth = 100000;
    const char* const kLevels[] = {"vmap:AdBreak", "vmap:AdSource", "vmap:TrackingEvents",
                                   "vmap:Tracking", "vmap:Extensions"};
    std::string document = "<vmap:VMAP>";
    for (int i = 0; i < kDepth; ++i) document += std::string("<") + kLevels[i % 5] + ">";
    for (int i = kDepth - 1; i >= 0; --i) document += std::string("</") + kLevels[i % 5] + ">";
    document += "</vmap:VMAP>";
    ASSERT_EQ(handle.Process(document), KA_OK);
    const AdInfo* info = handle.Info();
    ASSERT_EQ(info->adBreakCount, 1u);
    ASSERT_NE(info->adBreaks->adSource, nullptr);
    EXPECT_EQ(info->adBreaks->trackings, nullptr) << "TrackingEvents sits below the source";
}

TEST(ApiTable, LongListsKeepDocumentOrder) {
    Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    const int kBreaks = 20000;
    const int kTrackings = 20000;
    std::string document = "<vmap:VMAP><vmap:AdBreak breakId=\"0\"><vmap:TrackingEvents>";
    for (int i = 0; i < kTrackings; ++i) {
        document += "<vmap:Tracking event=\"" + std::to_string(i) + "\"/>";
    }
    document += "</vmap:TrackingEvents></vmap:AdBreak>";
    for (int i = 1; i < kBreaks; ++i) {
        document += "<vmap:AdBreak breakId=\"" + std::to_string(i) + "\"/>";
    }
    document += "</vmap:VMAP>";
    ASSERT_EQ(handle.Process(document), KA_OK);
    const AdInfo* info = handle.Info();
    ASSERT_EQ(info->adBreakCount, static_cast<uint32_t>(kBreaks));
    int i = 0;
    for (const AdBreak* b = info->adBreaks; b != nullptr; b = b->next, ++i) {
        ASSERT_EQ(std::to_string(i), b->breakId);
    }
    EXPECT_EQ(i, kBreaks);
    i = 0;
    for (const AdBreakTracking* t = info->adBreaks->trackings; t != nullptr; t = t->next, ++i) {
        ASSERT_EQ(std::to_string(i), t->event);
    }
    EXPECT_EQ(i, kTrackings);
}

}  // namespace
