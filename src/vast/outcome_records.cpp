// Chain outcome records. Each outcome is one block: the record, then its hops, then its Error
// URL pointers, then every string they point to; one allocation per ad of the player's
// document.
#include "vast/outcome_records.h"

#include <cstring>
#include <new>

namespace ka {

namespace {

size_t TextSize(const std::string& text) { return text.size() + 1; }

// Copies text to *at and moves *at past it.
char* PlaceText(const std::string& text, char*& at) {
    char* copy = at;
    memcpy(copy, text.c_str(), TextSize(text));
    at += TextSize(text);
    return copy;
}

KaChainOutcome* NewOutcome(const AdTrace& ad, Arena& records) {
    size_t bytes = sizeof(KaChainOutcome) + ad.hops.size() * sizeof(KaChainHop) +
                   ad.errorUrls.size() * sizeof(char*);
    for (const HopTrace& hop : ad.hops) {
        bytes += TextSize(hop.url) + (hop.finalUrl.empty() ? 0 : TextSize(hop.finalUrl));
    }
    for (const TraceText& url : ad.errorUrls) bytes += TextSize(url.text);

    // Plain C records: the zeroed block holds them as a C player would allocate them.
    char* block = static_cast<char*>(records.Allocate(bytes, alignof(KaChainOutcome)));
    memset(block, 0, bytes);
    KaChainOutcome* outcome = reinterpret_cast<KaChainOutcome*>(block);
    outcome->ad = ad.ad;
    outcome->state = ad.state;
    outcome->vastError = ad.vastError;
    outcome->reason = ad.reason;
    char* at = block + sizeof(KaChainOutcome);
    if (!ad.hops.empty()) {
        outcome->hops = reinterpret_cast<KaChainHop*>(at);
        outcome->hopCount = static_cast<uint32_t>(ad.hops.size());
        at += ad.hops.size() * sizeof(KaChainHop);
    }
    if (!ad.errorUrls.empty()) {
        outcome->errorUrls = reinterpret_cast<char**>(at);
        outcome->errorUrlCount = static_cast<uint32_t>(ad.errorUrls.size());
        at += ad.errorUrls.size() * sizeof(char*);
    }
    for (size_t i = 0; i < ad.hops.size(); ++i) {
        const HopTrace& from = ad.hops[i];
        KaChainHop& hop = outcome->hops[i];
        hop.depth = from.depth;
        hop.result = from.result;
        hop.bytes = from.bytes;
        hop.milliseconds = from.milliseconds;
        hop.onPath = from.onPath ? 1 : 0;
        hop.url = PlaceText(from.url, at);
        if (!from.finalUrl.empty()) hop.finalUrl = PlaceText(from.finalUrl, at);
    }
    for (size_t i = 0; i < ad.errorUrls.size(); ++i) {
        outcome->errorUrls[i] = PlaceText(ad.errorUrls[i].text, at);
    }
    return outcome;
}

}  // namespace

void BuildChainOutcomes(const ChainTrace& trace, Arena& records, KaChainOutcome** head) {
    KaChainOutcome** end = head;
    while (*end != nullptr) end = &(*end)->next;
    for (const AdTrace& ad : trace.Ads()) {
        *end = NewOutcome(ad, records);
        end = &(*end)->next;
    }
}

}  // namespace ka
