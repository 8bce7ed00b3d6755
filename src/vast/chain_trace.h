// What the wrapper chains of one Process did, recorded while they run: one AdTrace per ad of the
// player's document, with every download, and along the path that leads to the ad the player
// gets (the first ad of each wrapped document) the Error URLs and how the chain ended. Strings
// are not copied: they live in the handle's arena, which keeps what the merge releases until the
// records themselves are released. CVMAPParser turns the trace into the public KaChainOutcome
// records when Process ends (outcome_records.h). The lists keep their room from one Process to
// the next, so a handle that reads similar documents allocates nothing here after the first.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "ka/vast_records.h"

namespace ka {

struct HopTrace {
    const char* url;       // as handed to the download
    const char* finalUrl;  // after redirects; null when the download failed
    uint32_t depth;        // of the document fetched: 1 below the player's
    uint32_t result;       // the download's code
    uint64_t bytes;        // read
    uint32_t milliseconds;
    bool onPath;  // leads to the ad the player gets
};

// A string of the library's own type: a std::vector<const char*> would be instantiated with
// default visibility and exported from the library.
struct TraceUrl {
    const char* url;
};

struct AdTrace {
    AdData* ad;                           // the player's node
    uint32_t state;                       // KA_CHAIN_*
    uint32_t vastError;                   // KA_VAST_ERROR_*
    uint32_t reason;                      // KA_CHAIN_REASON_*
    size_t firstHop, hopCount;            // in ChainTrace::Hops()
    size_t firstErrorUrl, errorUrlCount;  // in ChainTrace::ErrorUrls()
    uint64_t mergeRefusalsBefore;         // the budget's count when the chain began
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
    const HopTrace* Hops(const AdTrace& ad) const { return mHops.data() + ad.firstHop; }
    const TraceUrl* ErrorUrls(const AdTrace& ad) const {
        return mErrorUrls.data() + ad.firstErrorUrl;
    }
    // Forgets everything; the list's room stays for the next Process.
    void Clear();

private:
    void AddErrorUrl(const char* url);

    const char* mRootError = nullptr;  // of the document whose ads begin; null: none
    std::vector<AdTrace> mAds;
    std::vector<HopTrace> mHops;       // every ad's, in the order of mAds
    std::vector<TraceUrl> mErrorUrls;  // every ad's, in the order of mAds
};

}  // namespace ka
