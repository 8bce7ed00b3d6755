// Every input a fuzz target once failed on, replayed through the public table in VMAP and in
// VAST-only mode: tests/data/fuzz/ holds single documents, tests/data/fuzz/chain/ inputs of the
// wrapper-chain target (documents split at NUL bytes, the later ones read as local files through
// relative wrapper references). The result must be a documented code, every count must match its
// list, no more wrapped documents may be kept than one Process may fetch, and a second Process of
// the same bytes must build the same records again; the sanitizer build catches the rest.
#include <dirent.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <algorithm>
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
const std::string kChainDir = "chain/";
constexpr uint64_t kMaxWrapperFetches = 64;  // src/platform/limits.h

// The regular files of one folder, sorted.
std::vector<std::string> CaseFiles(const std::string& folder) {
    std::vector<std::string> files;
    if (DIR* dir = opendir(folder.c_str())) {
        while (dirent* entry = readdir(dir)) {
            const std::string name = entry->d_name;
            if (!name.empty() && name[0] != '.' &&
                (entry->d_type == DT_REG || entry->d_type == DT_UNKNOWN))
                files.push_back(name);
        }
        closedir(dir);
    }
    std::sort(files.begin(), files.end());
    return files;
}

// Wrappers in the cases name arbitrary hosts: every network download must fail here, and fast.
// Relative references are read from a private folder the chain cases write.
class NoNetwork : public ::testing::Environment {
public:
    void SetUp() override {
        char pattern[] = "/tmp/ka-fuzz-replay-XXXXXX";
        ASSERT_NE(mkdtemp(pattern), nullptr);
        sFolder = pattern;
        ASSERT_TRUE(kanonet::LimitSourceIO(KA_MODULES_DIR, sFolder.c_str()));
        kanonet::BlockNetworkSockets();  // a second guard where the kernel allows it
    }
    void TearDown() override { kachain::RemoveFolder(sFolder); }
    static std::string sFolder;
};
std::string NoNetwork::sFolder;
[[maybe_unused]] ::testing::Environment* const kNoNetwork =
    ::testing::AddGlobalTestEnvironment(new NoNetwork);

const uint32_t kDocumentedCodes[] = {
    // clang-format off
    KA_OK, KA_ERR_MODULE_NOT_LOADED, KA_ERR_LOAD_FAILED, KA_ERR_NULL_ARGUMENT,
    KA_ERR_DOWNLOAD_TIMEOUT, KA_ERR_DOWNLOAD_FAILED, KA_ERR_DOWNLOAD_OPEN,
    // clang-format on
};

struct Replay {
    std::string file;  // relative to kCaseDir
    bool chain;        // an input of the wrapper-chain target
    bool vastOnly;
    bool merge;  // merge wrappers (the default); off, every wrapped document stays visible
};

// Single documents in both modes; chains in both modes, merged and not.
std::vector<Replay> Replays() {
    std::vector<Replay> replays;
    for (bool chain : {false, true}) {
        for (const std::string& file : CaseFiles(kCaseDir + (chain ? kChainDir : ""))) {
            for (bool merge : {true, false}) {
                if (!chain && !merge) continue;
                for (bool vastOnly : {false, true}) {
                    replays.push_back({(chain ? kChainDir : "") + file, chain, vastOnly, merge});
                }
            }
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

// The records of the handle's mode only: in VMAP mode the container repeats a break's records.
kawalk::Walk WalkMode(void* handle, bool vastOnly) {
    kawalk::Walk walk;
    walk.api = &katest::Api();
    VastAdData* data = nullptr;
    AdInfo* info = nullptr;
    if (vastOnly) {
        katest::Api().GetVastAdData(handle, &data);
        walk.Vast(data, 0);
    } else {
        katest::Api().GetAdInfo(handle, &info);
        walk.Vmap(info);
    }
    return walk;
}

class FuzzRegression : public ::testing::TestWithParam<Replay> {};

TEST_P(FuzzRegression, EndsInACodeWithConsistentRecords) {
    const Replay& replay = GetParam();
    const std::vector<char> input = katest::ReadFile(kCaseDir + replay.file);
    // A single document leaves the folder empty; a chain input fills it.
    const auto first =
        kachain::WriteFiles(NoNetwork::sFolder, reinterpret_cast<const uint8_t*>(input.data()),
                            replay.chain ? input.size() : 0);
    ASSERT_TRUE(first.second);
    const std::vector<char> document =
        replay.chain ? std::vector<char>(input.begin(), input.begin() + first.first.second) : input;

    katest::Handle handle;
    ASSERT_EQ(handle.openResult(), KA_OK);
    // Single documents are fuzzed with the stop flag set, chains with it clear.
    KA_BOOL stop = replay.chain ? 0 : 1;
    handle.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, replay.merge);
    if (replay.vastOnly) {
        handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
        katest::Api().SetParam(handle.get(), KA_PID_VMAP_STOP_FLAG, &stop);
    }

    const uint32_t result = handle.Process(document);
    EXPECT_NE(std::find(std::begin(kDocumentedCodes), std::end(kDocumentedCodes), result),
              std::end(kDocumentedCodes))
        << std::hex << result;
    const kawalk::Walk walk = WalkMode(handle.get(), replay.vastOnly);
    EXPECT_TRUE(walk.countsAgree);
    EXPECT_LE(walk.nestedDocuments, kMaxWrapperFetches);

    EXPECT_EQ(handle.Process(document), result);
    const kawalk::Walk again = WalkMode(handle.get(), replay.vastOnly);
    EXPECT_EQ(again.records, walk.records);
    EXPECT_EQ(again.sum, walk.sum);
}

INSTANTIATE_TEST_SUITE_P(Cases, FuzzRegression, ::testing::ValuesIn(Replays()), ReplayName);

TEST(FuzzRegressionCases, FoldersHoldCases) {
    EXPECT_FALSE(CaseFiles(kCaseDir).empty()) << kCaseDir;
    EXPECT_FALSE(CaseFiles(kCaseDir + kChainDir).empty()) << kCaseDir << kChainDir;
}

}  // namespace
