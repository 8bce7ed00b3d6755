// Chain outcome records. Each outcome is one block of the arena: the record, then its hops,
// then its Error URL pointers. The strings they point to are the trace's, already in the arena.
#include "vast/outcome_records.h"

#include <cstring>

namespace ka {

namespace {

KaChainOutcome* NewOutcome(const ChainTrace& trace, const AdTrace& ad, Arena& records) {
    const size_t bytes = sizeof(KaChainOutcome) + ad.hopCount * sizeof(KaChainHop) +
                         ad.errorUrlCount * sizeof(char*);
    // Plain C records: the zeroed block holds them as a C player would allocate them.
    char* block = static_cast<char*>(records.Allocate(bytes, alignof(KaChainOutcome)));
    memset(block, 0, bytes);
    KaChainOutcome* outcome = reinterpret_cast<KaChainOutcome*>(block);
    outcome->ad = ad.ad;
    outcome->state = ad.state;
    outcome->vastError = ad.vastError;
    outcome->reason = ad.reason;
    char* at = block + sizeof(KaChainOutcome);
    if (ad.hopCount > 0) {
        outcome->hops = reinterpret_cast<KaChainHop*>(at);
        outcome->hopCount = static_cast<uint32_t>(ad.hopCount);
        at += ad.hopCount * sizeof(KaChainHop);
    }
    if (ad.errorUrlCount > 0) {
        outcome->errorUrls = reinterpret_cast<char**>(at);
        outcome->errorUrlCount = static_cast<uint32_t>(ad.errorUrlCount);
    }
    const HopTrace* hops = trace.Hops(ad);
    for (size_t i = 0; i < ad.hopCount; ++i) {
        KaChainHop& hop = outcome->hops[i];
        hop.url = const_cast<char*>(hops[i].url);
        hop.finalUrl = const_cast<char*>(hops[i].finalUrl);
        hop.depth = hops[i].depth;
        hop.result = hops[i].result;
        hop.bytes = hops[i].bytes;
        hop.milliseconds = hops[i].milliseconds;
        hop.onPath = hops[i].onPath ? 1 : 0;
    }
    const TraceUrl* urls = trace.ErrorUrls(ad);
    for (size_t i = 0; i < ad.errorUrlCount; ++i) {
        outcome->errorUrls[i] = const_cast<char*>(urls[i].url);
    }
    return outcome;
}

}  // namespace

void BuildChainOutcomes(const ChainTrace& trace, Arena& records, KaChainOutcome** head) {
    KaChainOutcome** end = head;
    while (*end != nullptr) end = &(*end)->next;
    for (const AdTrace& ad : trace.Ads()) {
        *end = NewOutcome(trace, ad, records);
        end = &(*end)->next;
    }
}

}  // namespace ka
