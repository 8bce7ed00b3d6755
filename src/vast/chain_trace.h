// What the wrapper chains of one Process did, recorded while they run: one AdTrace per ad of the
// player's document, with every download, and along the path that leads to the ad the player
// gets (the first ad of each wrapped document) the Error URLs and how the chain ended. Strings
// are copied as the chain goes: the merge frees the wrappers' own. CVMAPParser turns the trace
// into the public KaChainOutcome records when Process ends (outcome_records.h).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "ka/vast_records.h"

namespace ka {

struct HopTrace {
    std::string url;       // as handed to the download
    std::string finalUrl;  // after redirects; empty when the download failed
    uint32_t depth;        // of the document fetched: 1 below the player's
    uint32_t result;       // the download's code
    uint64_t bytes;        // read
    uint32_t milliseconds;
    bool onPath;  // leads to the ad the player gets
};

// A string of the library's own type: a std::vector<std::string> would be instantiated with
// default visibility and exported from the library.
struct TraceText {
    std::string text;
};

struct AdTrace {
    AdData* ad;          // the player's node
    uint32_t state;      // KA_CHAIN_*
    uint32_t vastError;  // KA_VAST_ERROR_*
    uint32_t reason;     // KA_CHAIN_REASON_*
    std::vector<HopTrace> hops;
    std::vector<TraceText> errorUrls;
    uint64_t mergeRefusalsBefore;  // the budget's count when the chain began
};

class ChainTrace {
public:
    // The player's document, or one VAST element of it, was read; rootError may be null.
    void BeginDocument(const char* rootError);
    // An ad of that document: its record, InLine or Wrapper, before any fetch or merge.
    void BeginAd(AdData* ad, uint64_t mergeRefusals);
    // A wrapped document on the current ad's path was read: first may be null, versionOk says
    // whether its root declared a VAST version this library reads (or none).
    void PathDocument(const char* rootError, const AdData* first, bool versionOk);
    // The path ended, or a step of it is pending (state KA_CHAIN_WRAPPER, reason NONE: 900).
    void End(uint32_t state, uint32_t reason);
    void AddHop(HopTrace hop);
    // The current ad's chain, merges included, is done.
    void EndAd(uint64_t mergeRefusals);

    const std::vector<AdTrace>& Ads() const { return mAds; }
    // Forgets everything; the list's room stays for the next Process.
    void Clear();

private:
    void AddErrorUrl(const char* url);

    std::string mRootError;  // of the document whose ads begin; empty: none
    std::vector<AdTrace> mAds;
};

}  // namespace ka
