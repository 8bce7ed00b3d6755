// Each ad's chain outcome, lent through the second table, over documents a loopback server
// holds: the rows of tests/data/chain_outcomes.txt, each read with merging on and off.
#include <gtest/gtest.h>

#include <cinttypes>
#include <cstddef>
#include <map>
#include <string>
#include <vector>

#include "api_support.h"
#include "case_file.h"
#include "ka/chain_limits.h"
#include "ka/vmap_parser_ext.h"
#include "loopback.h"

namespace {

// Replaces every {NAME} of text with urls[NAME].
std::string Expand(std::string text, const std::map<std::string, std::string>& urls) {
    for (const auto& u : urls) {
        for (size_t at; (at = text.find("{" + u.first + "}")) != std::string::npos;)
            text.replace(at, u.first.size() + 2, u.second);
    }
    return text;
}

// The ads of the player's records in document order, VAST-only or over every ad source.
std::vector<AdData*> Ads(katest::Handle& handle, bool vmap) {
    std::vector<VastAdData*> containers;
    if (!vmap) containers.push_back(handle.Container());
    for (AdBreak* b = vmap ? handle.Info()->adBreaks : nullptr; b != nullptr; b = b->next)
        containers.push_back(b->adSource->vastAdData);
    std::vector<AdData*> ads;
    for (VastAdData* c : containers)
        for (AdData* ad = c->firstAd; ad != nullptr; ad = ad->next) ads.push_back(ad);
    return ads;
}

TEST(ChainOutcomes, EveryRowReportsItsChain) {
    loopback::Server server;
    ASSERT_TRUE(server.Running());
    std::map<std::string, std::string> urls = {{"missing", server.Url("/d/missing")},
                                               {"closed", "http://127.0.0.1:1/closed"},
                                               {"stall", server.Url("/stall")}};
    std::map<std::string, std::string> bodies, names;  // by name; names by URL
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "chain_outcomes.txt");
    for (const auto& row : rows) urls[row[1]] = server.Url("/d/" + row[1]);  // cases too: unused
    for (const auto& row : rows)
        if (row[0] == "doc") server.Put(row[1], bodies[row[1]] = Expand(row[2], urls));
    // A redirect to w1: the hop's final URL is w1's.
    urls["redirect"] = server.Url("/redirect?to=" + urls["w1"]);
    bodies["redirect"] = bodies["w1"];
    for (const auto& u : urls) names[u.second] = u.first;

    for (const auto& row : rows) {
        if (row[0] != "case") continue;
        const bool vmap = row[3][0] == '<';
        const std::string document =
            vmap ? Expand(row[3], urls)
                 : "<VAST><Error>e-root</Error><Ad id=\"top\"><Wrapper><VASTAdTagURI>" +
                       urls[row[3]] + "</VASTAdTagURI><Error>e-ad</Error></Wrapper></Ad></VAST>";
        for (bool merge : {true, false}) {
            SCOPED_TRACE(row[1] + (merge ? ", merged" : ", not merged"));
            katest::Handle handle;
            KA_BOOL stop = 1;
            handle.SetFlag(KA_PID_VMAP_VAST_ONLY, !vmap);
            handle.SetFlag(KA_PID_VMAP_MERGE_WRAPPERS, merge);
            const std::map<std::string, std::pair<uint32_t, void*>> kSettings = {
                {"none", {0, nullptr}},
                {"deadline", {KA_PID_VMAP_DEADLINE_MS, reinterpret_cast<void*>(300)}},
                {"bytes", {KA_PID_VMAP_FETCH_BYTES, reinterpret_cast<void*>(16)}},
                {"stop", {KA_PID_VMAP_STOP_FLAG, &stop}}};
            const auto setting = kSettings.at(row[2]);
            katest::Api().SetParam(handle.get(), setting.first, setting.second);
            ASSERT_EQ(handle.Process(document), KA_OK);
            KaChainOutcome* outcome = static_cast<KaChainOutcome*>(katest::kUntouched);
            ASSERT_EQ(katest::ExtApi().GetChainOutcomes(handle.get(), &outcome), KA_OK);
            const std::vector<AdData*> ads = Ads(handle, vmap);

            // The records printed as the rows write them, each field checked on the way.
            std::vector<std::string> printed = {row[0], row[1], row[2], row[3]};
            for (size_t i = 0; outcome != nullptr; outcome = outcome->next, ++i) {
                ASSERT_LT(i, ads.size());
                EXPECT_EQ(outcome->ad, ads[i]);
                // Merged, the ad is where the chain ended; unmerged, the wrapper as read.
                const uint32_t state = outcome->state;
                const AdData& ad = *ads[i];
                const bool wrapper = ad.type == AD_TYPE_WRAPPER && ad.body != nullptr;
                EXPECT_TRUE(state == KA_CHAIN_NOT_WRAPPED || (!merge && wrapper) ||
                            (merge && state == KA_CHAIN_WRAPPER && wrapper) ||
                            (merge && state == KA_CHAIN_EMPTIED && ad.body == nullptr) ||
                            (merge && state == KA_CHAIN_RESOLVED && ad.type == AD_TYPE_INLINE));
                printed.push_back(std::to_string(state) + " " + std::to_string(outcome->vastError) +
                                  " " + std::to_string(outcome->reason));
                std::string hops;
                for (uint32_t h = 0; h < outcome->hopCount; ++h) {
                    const KaChainHop& hop = outcome->hops[h];
                    const std::string name = names[hop.url];
                    char result[16];
                    snprintf(result, sizeof(result), hop.result != 0 ? "%#" PRIx32 : "0",
                             hop.result);
                    hops += (h != 0 ? ", " : "") + std::to_string(hop.depth) + " " + name + " " +
                            result + (hop.onPath != 0 ? "" : " dropped");
                    EXPECT_EQ(hop.bytes, hop.result == 0 ? bodies[name].size() : 0u) << name;
                    const std::string reached = name == "redirect" ? urls["w1"] : hop.url;
                    EXPECT_STREQ(hop.finalUrl, hop.result == 0 ? reached.c_str() : nullptr);
                    // Time is checked loosely: the stall waits out the deadline, nothing else.
                    EXPECT_LT(hop.milliseconds, 5000u);
                    EXPECT_GE(hop.milliseconds, name == "stall" ? 250u : 0u);
                }
                printed.push_back(hops);
                std::string errors;
                for (uint32_t e = 0; e < outcome->errorUrlCount; ++e)
                    errors += (e != 0 ? " " : "") + std::string(outcome->errorUrls[e]);
                printed.push_back(errors);
            }
            EXPECT_EQ(printed, row);
        }
    }
}

// The slot as a player compiled against a table that ends with it gets it, and what it lends
// before any Process, for a null handle and after a failed Process.
TEST(ChainOutcomes, SlotAndEmptyCases) {
    VMAPParserExtAPI table = {};
    table.size = offsetof(VMAPParserExtAPI, ExpandMacros);
    auto get =
        reinterpret_cast<KaGetVMAPParserExtAPIFn>(katest::LibrarySymbol("kaGetVMAPParserExtAPI"));
    ASSERT_EQ(get(&table), KA_OK);
    EXPECT_EQ(table.size, offsetof(VMAPParserExtAPI, ExpandMacros));
    EXPECT_TRUE(table.GetChainOutcomes != nullptr && table.ExpandMacros == nullptr);

    KaChainOutcome* outcome = static_cast<KaChainOutcome*>(katest::kUntouched);
    EXPECT_EQ(table.GetChainOutcomes(nullptr, &outcome), KA_ERR_NULL_ARGUMENT);
    katest::Handle handle;
    handle.SetFlag(KA_PID_VMAP_VAST_ONLY, true);
    EXPECT_EQ(table.GetChainOutcomes(handle.get(), nullptr), KA_OK);
    for (const char* document : {"", "<VAST><Ad><InLine/></Ad></VAST>", "not xml"}) {
        if (document[0] != '\0') handle.Process(std::string(document));
        EXPECT_EQ(table.GetChainOutcomes(handle.get(), &outcome), KA_OK);
        EXPECT_EQ(outcome != nullptr, document[0] == '<') << document;
    }
}

}  // namespace
