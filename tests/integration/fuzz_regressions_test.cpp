// Every input a fuzz target once failed on, replayed through the public table in VMAP mode and
// in VAST-only mode, with every record read to its end. tests/data/fuzz/ holds single
// documents; tests/data/fuzz/chain/ holds inputs of the wrapper-chain target (documents split at
// NUL bytes, the later ones read as local files by relative wrapper references). Under the
// sanitizer build a regression shows as the report it first was; in every build the result
// must be a documented code, the record counts must match their lists, no more wrapped
// documents may be kept than one Process may fetch, and a second Process of the same bytes must
// release the first one's records and build the same again.
#include <dirent.h>
#include <stdlib.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <ostream>
#include <cctype>
#include <string>
#include <vector>

#include "../../fuzz/chain_files.h"
#include "../../fuzz/no_network.h"
#include "../../fuzz/record_walk.h"
#include "api_support.h"
#include "ka/result_codes.h"

namespace {

const std::string kCaseDir = std::string(KA_TEST_DATA_DIR) + "fuzz/";
const char kChainDir[] = "chain/";
// Wrapped documents one Process may fetch (src/platform/limits.h).
constexpr uint64_t kMaxWrapperFetches = 64;

// The regular files of one folder, sorted.
std::vector<std::string> CaseFiles(const std::string& folder) {
    std::vector<std::string> files;
    if (DIR* dir = opendir(folder.c_str())) {
        while (dirent* entry = readdir(dir)) {
            const std::string name = entry->d_name;
            if (name.empty() || name[0] == '.') continue;
            if (entry->d_type != DT_REG && entry->d_type != DT_UNKNOWN) continue;
            files.push_back(name);
        }
        closedir(dir);
    }
    std::sort(files.begin(), files.end());
    return files;
}

// Wrapper ads in the cases name arbitrary hosts: every network download must fail here, and
// fast. Relative references are read from a private folder the chain cases write.
class NoNetwork : public ::testing::Environment {
public:
    void SetUp() override {
        char pattern[] = "/tmp/ka-fuzz-replay-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        sFolder = pattern;
        ASSERT_TRUE(kanonet::LimitSourceIO(KA_MODULES_DIR, sFolder.c_str()));
        // A second guard where the kernel allows it; the module's limits are enough alone.
        kanonet::BlockNetworkSockets();
    }
    void TearDown() override { kachain::RemoveFolder(sFolder); }
    static std::string sFolder;
};
std::string NoNetwork::sFolder;
[[maybe_unused]] ::testing::Environment* const kNoNetwork =
    ::testing::AddGlobalTestEnvironment(new NoNetwork);

bool IsDocumentedCode(uint32_t code) {
    switch (code) {
        case KA_OK:
        case KA_ERR_MODULE_NOT_LOADED:
        case KA_ERR_LOAD_FAILED:
        case KA_ERR_NULL_ARGUMENT:
        case KA_ERR_DOWNLOAD_TIMEOUT:
        case KA_ERR_DOWNLOAD_FAILED:
        case KA_ERR_DOWNLOAD_OPEN:
            return true;
        default:
            return false;
    }
}

struct Replay {
    std::string file;  // relative to kCaseDir
    bool chain;        // an input of the wrapper-chain target
    bool vastOnly;
    bool merge;  // merge wrappers (the default); off, every wrapped document stays visible
};

void PrintTo(const Replay& replay, std::ostream* os) {
    *os << replay.file << (replay.vastOnly ? " VAST-only" : " VMAP") << (replay.merge ? "" : " unmerged");
}

std::vector<Replay> Replays() {
    std::vector<Replay> replays;
    for (const std::string& file : CaseFiles(kCaseDir)) {
        replays.push_back({file, false, false, true});
        replays.push_back({file, false, true, true});
    }
    for (const std::string& file : CaseFiles(kCaseDir + kChainDir)) {
        for (bool merge : {true, false}) {
            replays.push_back({kChainDir + file, true, false, merge});
            replays.push_back({kChainDir + file, true, true, merge});
        }
    }
    return replays;
}

std::string ReplayName(const ::testing::TestParamInfo<Replay>& info) {
    std::string name = info.param.file;
    for (char& c : name) {
        if (!isalnum(static_cast<unsigned char>(c))) c = '_';
    }
    return name + (info.param.vastOnly ? "_vast" : "_vmap") + (info.param.merge ? "" : "_unmerged");
}

class FuzzRegression : public ::testing::TestWithParam<Replay> {};

// The records of the handle's mode only: in VMAP mode the container repeats a break's records.
kawalk::Walk WalkMode(void* handle, bool vastOnly) {
    kawalk::Walk walk;
    walk.api = &katest::Api();
    if (vastOnly) {
        VastAdData* data = nullptr;
        katest::Api().GetVastAdData(handle, &data);
        walk.Vast(data, 0);
    } else {
        AdInfo* info = nullptr;
        katest::Api().GetAdInfo(handle, &info);
        walk.Vmap(info);
    }
    return walk;
}

TEST_P(FuzzRegression, EndsInACodeWithConsistentRecords) {
    const Replay& replay = GetParam();
    const std::vector<char> input = katest::ReadFile(kCaseDir + replay.file);
    // A single document leaves the folder empty; a chain input fills it.
    const auto first = kachain::WriteFiles(NoNetwork::sFolder,
                                           reinterpret_cast<const uint8_t*>(input.data()),
                                           replay.chain ? input.size() : 0);
    ASSERT_TRUE(first.second);
    const std::vector<char> document =
        replay.chain ? std::vector<char>(input.begin(), input.begin() + first.first.second)
                     : input;

    katest::Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    // Single documents are fuzzed with the flag set, chains with it clear.
    KA_BOOL stop = replay.chain ? 0 : 1;
    handle.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, replay.merge);
    if (replay.vastOnly) {
        handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
        katest::Api().SetParam(handle.get(), KA_PID_VMAP_STOP_FLAG, &stop);
    }

    const uint32_t result = handle.Process(document);
    EXPECT_TRUE(IsDocumentedCode(result)) << std::hex << result;
    const kawalk::Walk walk = WalkMode(handle.get(), replay.vastOnly);
    EXPECT_TRUE(walk.countsAgree);
    EXPECT_LE(walk.nestedDocuments, kMaxWrapperFetches);

    const uint32_t again = handle.Process(document);
    EXPECT_EQ(again, result);
    const kawalk::Walk walkAgain = WalkMode(handle.get(), replay.vastOnly);
    EXPECT_EQ(walkAgain.records, walk.records);
    EXPECT_EQ(walkAgain.sum, walk.sum);
}

INSTANTIATE_TEST_SUITE_P(Cases, FuzzRegression, ::testing::ValuesIn(Replays()), ReplayName);

TEST(FuzzRegressionCases, FoldersHoldCases) {
    EXPECT_FALSE(CaseFiles(kCaseDir).empty()) << kCaseDir;
    EXPECT_FALSE(CaseFiles(kCaseDir + kChainDir).empty()) << kCaseDir << kChainDir;
}

}  // namespace
