// Chain outcome records. Blocks are zero-filled when allocated, counts are set with the array
// they count, and strings are copied into slots that are null until then: a record is complete
// enough to be freed at every step.
#include "vast/outcome_records.h"

#include <cstring>

namespace ka {

namespace {

// The allocation functions of these records; nothing else here allocates or frees.
template <typename T>
T* NewBlocks(size_t count) {
    return new T[count]();
}

template <typename T>
void FreeBlocks(T* blocks) {
    delete[] blocks;
}

char* NewText(const std::string& text) {
    char* copy = NewBlocks<char>(text.size() + 1);
    memcpy(copy, text.data(), text.size());
    return copy;
}

void FreeText(char* text) { FreeBlocks(text); }

void FillHops(const std::vector<HopTrace>& hops, KaChainOutcome* outcome) {
    if (hops.empty()) return;
    outcome->hops = NewBlocks<KaChainHop>(hops.size());
    outcome->hopCount = static_cast<uint32_t>(hops.size());
    for (size_t i = 0; i < hops.size(); ++i) {
        KaChainHop& hop = outcome->hops[i];
        hop.depth = hops[i].depth;
        hop.result = hops[i].result;
        hop.bytes = hops[i].bytes;
        hop.milliseconds = hops[i].milliseconds;
        hop.onPath = hops[i].onPath ? 1 : 0;
        hop.url = NewText(hops[i].url);
        if (!hops[i].finalUrl.empty()) hop.finalUrl = NewText(hops[i].finalUrl);
    }
}

void FillErrorUrls(const std::vector<TraceText>& urls, KaChainOutcome* outcome) {
    if (urls.empty()) return;
    outcome->errorUrls = NewBlocks<char*>(urls.size());
    outcome->errorUrlCount = static_cast<uint32_t>(urls.size());
    for (size_t i = 0; i < urls.size(); ++i) outcome->errorUrls[i] = NewText(urls[i].text);
}

}  // namespace

void BuildChainOutcomes(const ChainTrace& trace, KaChainOutcome** head) {
    KaChainOutcome** end = head;
    while (*end != nullptr) end = &(*end)->next;
    for (const AdTrace& ad : trace.Ads()) {
        KaChainOutcome* outcome = NewBlocks<KaChainOutcome>(1);
        *end = outcome;
        end = &outcome->next;
        outcome->ad = ad.ad;
        outcome->state = ad.state;
        outcome->vastError = ad.vastError;
        outcome->reason = ad.reason;
        FillHops(ad.hops, outcome);
        FillErrorUrls(ad.errorUrls, outcome);
    }
}

void ReleaseChainOutcomes(KaChainOutcome*& head) {
    while (head != nullptr) {
        KaChainOutcome* next = head->next;
        for (uint32_t i = 0; i < head->hopCount; ++i) {
            FreeText(head->hops[i].url);
            FreeText(head->hops[i].finalUrl);
        }
        FreeBlocks(head->hops);
        for (uint32_t i = 0; i < head->errorUrlCount; ++i) FreeText(head->errorUrls[i]);
        FreeBlocks(head->errorUrls);
        FreeBlocks(head);
        head = next;
    }
}

}  // namespace ka
