// What the parsers of one wrapper chain share. The chain's top sets it up (a Process on the
// caller's document, or the VMAP parser for the VAST elements of its document) and each parser
// hands the same context to the nested parsers it creates, so no parser writes another's fields.
#pragma once

#include "ka/types.h"
#include "platform/limits.h"

namespace ka {

struct ChainContext {
    // The merge flag every nested parser of the chain is processed with. Whether a parser's own
    // wrappers are merged is its caller's argument, which may differ at the top.
    KA_BOOL mergeWrappers;
    // The caller's stop flag, handed to every download; null when the caller gave none, and
    // downloads then read a flag that stays false.
    KA_BOOL* stopFlag;
    // Wrapped documents the chain may still fetch, all depths together.
    unsigned int fetchesLeft;
    // Where every parser of the chain finds its modules; kept by pointer, as parsers keep it.
    char* workPath;

    // A fresh chain with the whole fetch budget.
    static ChainContext Start(KA_BOOL mergeWrappers, KA_BOOL* stopFlag, char* workPath) {
        return ChainContext{mergeWrappers, stopFlag, kMaxWrapperFetches, workPath};
    }

    // Spends one fetch; false when the budget is used up.
    bool TakeFetch() {
        if (fetchesLeft == 0) return false;
        --fetchesLeft;
        return true;
    }
};

}  // namespace ka
