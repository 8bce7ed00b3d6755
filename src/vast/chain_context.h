// What the parsers of one wrapper chain share. The chain's top sets it up (a Process on the
// caller's document, or the VMAP parser for the VAST elements of its document) and each parser
// hands the context on to the nested parsers it creates, so no parser writes another's fields.
#pragma once

#include <cstddef>
#include <cstdint>

#include "ka/chain_limits.h"
#include "ka/types.h"
#include "platform/limits.h"

namespace ka {

class ChainTrace;

// What one Process may still spend, over every chain it starts.
struct ChainBudget {
    uint64_t fetchBytesLeft;  // bytes of wrapped documents still allowed
    uint64_t deadline;        // ka::MonotonicMs() at which downloads end; 0: none
    uint64_t parsedBytes;     // the caller's document and every fetched one
    uint64_t mergeBytes;      // what merges have copied so far
    uint64_t mergeRefusals;   // merge copies refused for want of share
    bool mergeCapLogged;

    static ChainBudget Start(uint64_t fetchBytes, uint32_t deadlineMs);
    bool DeadlinePassed() const;
    // Charges a merge copy of this many bytes; false once the merges have copied their share.
    bool TakeMergeBytes(size_t bytes);
};

struct ChainContext {
    // The merge flag every nested parser of the chain is processed with. Whether a parser's own
    // wrappers are merged is its caller's argument, which may differ at the top.
    KA_BOOL mergeWrappers;
    // The caller's stop flag, handed to every download; null when the caller gave none, and
    // downloads then read a flag that stays false.
    KA_BOOL* stopFlag;
    // Wrapped documents the current top-level ad's chain may still fetch, all depths together.
    unsigned int fetchesLeft;
    // Where every parser of the chain finds its modules; kept by pointer, as parsers keep it.
    char* workPath;
    // The Process's budget; never null.
    ChainBudget* budget;
    // Where the document being read came from, for its relative references; null: unknown.
    const char* documentUrl;
    // Where the chain's outcomes are recorded; null: nowhere (a parser used on its own).
    ChainTrace* trace;
    // Whether the document being read leads to the ad the player gets: the first ad of each
    // wrapped document takes the wrapper's place, the others are dropped by the merge.
    bool onPath;

    static ChainContext Start(KA_BOOL mergeWrappers, KA_BOOL* stopFlag, char* workPath,
                              ChainBudget* budget, const char* documentUrl) {
        return ChainContext{mergeWrappers, stopFlag, KA_VMAP_FETCHES_PER_AD,
                            workPath,      budget,   documentUrl,
                            nullptr,       false};
    }

    // Spends one fetch; false when the ad's budget is used up.
    bool TakeFetch() {
        if (fetchesLeft == 0) return false;
        --fetchesLeft;
        return true;
    }
};

}  // namespace ka
