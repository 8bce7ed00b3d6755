// The wrapper chain: a Wrapper ad's VASTAdTagURI is downloaded and parsed by a nested parser,
// which follows its own wrappers first; the merge then puts the wrapped ad in the wrapper's
// place and appends the wrapper's tracking after the ad's own. Merges run innermost first, so
// an InLine ends with its own tracking, then its nearest wrapper's, then each outer one's.
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <vector>

#include "ka/result_codes.h"
#include "ka/uri.h"
#include "ka/vmap_parser_ext.h"
#include "net/download.h"
#include "vast/chain_trace.h"
#include "vast/vast_parser.h"
#include "vast/vast_release.h"
#include "xml/record_lists.h"
#include "xml/text.h"

namespace {

bool IsWebUrl(const char* url) {
    return strncmp(url, "http://", 7) == 0 || strncmp(url, "https://", 8) == 0;
}

AdLinear* LinearOf(AdCreative* creative) {
    return creative != nullptr && creative->kind == AD_CREATIVE_LINEAR ? &creative->content
                                                                       : nullptr;
}

// The caller's flag, which another of its threads may set while the chain runs.
bool IsSet(const KA_BOOL* flag) { return *static_cast<const volatile KA_BOOL*>(flag) != 0; }

bool HasClicks(const AdVideoClicks* clicks) {
    return clicks != nullptr &&
           (clicks->clickTrackings != nullptr || clicks->customClicks != nullptr);
}

}  // namespace

unsigned int CVASTParser::FetchWrapper(AdData* ad, ka::ChainContext& chain) {
    if (ad == nullptr || ad->body == nullptr || ad->type != AD_TYPE_WRAPPER) return KA_OK;
    AdWrapper* wrapper = static_cast<AdWrapper*>(ad->body);
    ka::ChainBudget& budget = *chain.budget;
    const bool onPath = OnPath(chain, ad);
    // Records why the ad's chain ends here, when the ad leads to what the player gets.
    auto refuse = [&](uint32_t state, uint32_t reason) {
        if (onPath) chain.trace->End(state, reason);
        return KA_ERR_LOAD_FAILED;
    };
    if (budget.DeadlinePassed()) return refuse(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_DEADLINE);
    if (budget.fetchBytesLeft == 0) return refuse(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_BYTES);
    char url[ka::kUrlSize];
    if (!ResolveWrappedUrl(wrapper->vastAdTagUri, chain.documentUrl, url)) {
        const bool empty = wrapper->vastAdTagUri == nullptr || wrapper->vastAdTagUri[0] == '\0';
        return refuse(KA_CHAIN_WRAPPER,
                      empty ? KA_CHAIN_REASON_NO_URI : KA_CHAIN_REASON_URL_REFUSED);
    }

    // Without a caller's flag (a VAST element of a VMAP document) downloads get one that stays
    // false: the download needs a flag to read.
    KA_BOOL neverStop = 0;
    KA_BOOL* stopFlag = chain.stopFlag != nullptr ? chain.stopFlag : &neverStop;
    if (!chain.TakeFetch()) return refuse(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_FETCHES);
    unsigned char* buffer = nullptr;
    uint32_t size = 0;
    ka::DocumentFetch fetch = {budget.fetchBytesLeft, budget.deadline, {}, false};
    const uint64_t start = ka::MonotonicMs();
    const uint32_t downloaded =
        ka::DownloadDocument(url, &buffer, &size, chain.workPath, stopFlag, &fetch);
    // Owned from here on: the allocations below may fail.
    std::unique_ptr<unsigned char[]> owned(buffer);
    // Memory that ran out fails the whole Process, not just this wrapper.
    if (downloaded == KA_ERR_NO_MEMORY) throw std::bad_alloc();
    if (chain.trace != nullptr) {
        const bool ok = downloaded == 0 && buffer != nullptr;
        const uint64_t ms = ka::MonotonicMs() - start;
        // The trace keeps pointers: the strings go where the records live.
        const char* asked = mArena->CopyString(url);
        const char* reached = !ok ? nullptr
                              : fetch.finalUrl[0] == '\0' || strcmp(fetch.finalUrl, url) == 0
                                  ? asked
                                  : mArena->CopyString(fetch.finalUrl);
        chain.trace->AddHop({asked, reached, mVastAdData.depth + 1, downloaded, size,
                             static_cast<uint32_t>(ms > UINT32_MAX ? UINT32_MAX : ms), onPath});
    }
    // A document larger than what is left spends the byte budget: later wrappers are not
    // fetched, rather than downloaded only to be dropped.
    if (fetch.overLimit) budget.fetchBytesLeft = 0;
    if (fetch.overLimit) return refuse(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_BYTES);
    if (downloaded != 0 || size == 0 || buffer == nullptr) {
        if (IsSet(stopFlag)) return refuse(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_STOPPED);
        if (downloaded == KA_ERR_DOWNLOAD_TIMEOUT) {
            return refuse(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_DEADLINE);
        }
        return refuse(KA_CHAIN_WRAPPER,
                      downloaded != 0 ? KA_CHAIN_REASON_DOWNLOAD : KA_CHAIN_REASON_NO_AD);
    }
    budget.fetchBytesLeft -= size;

    CVASTParser* nested = new CVASTParser();
    wrapper->nestedParser = nested;
    // Its records join this parser's: the merge moves them into this document's list.
    nested->UseArena(mArena);
    nested->mReadExtras = mReadExtras;
    nested->SetWorkPath(chain.workPath);
    // A failed load shows up as a failed Process below.
    nested->InitXMLParser();
    nested->mVastAdData.depth = mVastAdData.depth + 1;
    // The nested parser reads the document and runs its own wrappers before this returns; its
    // relative references are seen from where the document was finally fetched.
    ka::ChainContext inner = chain;
    inner.documentUrl = fetch.finalUrl[0] != '\0' ? fetch.finalUrl : url;
    inner.onPath = onPath;
    const unsigned int result = nested->ProcessInChain(buffer, size, inner);
    chain.fetchesLeft = inner.fetchesLeft;
    owned.reset();
    nested->Close();
    if (result != KA_OK) refuse(KA_CHAIN_EMPTIED, KA_CHAIN_REASON_NOT_XML);
    return result;
}

bool CVASTParser::ResolveWrappedUrl(const char* reference, const char* documentUrl, char* out) {
    // An empty reference would resolve to the naming document itself: it names nothing.
    if (reference == nullptr || reference[0] == '\0') return false;
    const size_t length = strnlen(reference, ka::kUrlSize);
    // A reference that does not fit is refused rather than fetched cut short.
    if (length >= ka::kUrlSize) return false;
    if (documentUrl == nullptr || documentUrl[0] == '\0') {
        memcpy(out, reference, length + 1);
        return true;
    }
    memset(out, 0, ka::kUrlSize);
    ResolveURI(out, const_cast<char*>(reference), const_cast<char*>(documentUrl));
    // ResolveURI cuts at kUrlSize - 1 characters: a result that long may have been cut.
    if (strnlen(out, ka::kUrlSize) >= ka::kUrlSize - 1) return false;
    // What came over the network may send the player only to the network.
    return !IsWebUrl(documentUrl) || IsWebUrl(out);
}

unsigned int CVASTParser::MergeWrapper(AdData* ad) {
    if (ad == nullptr || ad->type == AD_TYPE_INLINE) return KA_OK;
    AdWrapper* wrapper = static_cast<AdWrapper*>(ad->body);
    if (wrapper == nullptr || wrapper->nestedParser == nullptr) return KA_OK;
    CVASTParser* nested = wrapper->nestedParser;
    VastAdData& wrapped = nested->mVastAdData;

    for (AdData* inner = wrapped.firstAd; inner != nullptr; inner = inner->next) {
        if (inner->type == AD_TYPE_WRAPPER && inner->body != nullptr) {
            AdWrapper* innerWrapper = static_cast<AdWrapper*>(inner->body);
            if (innerWrapper->nestedParser != nullptr) {
                CVASTParser* deeper = innerWrapper->nestedParser;
                ka::ReleaseVastAdData(&deeper->mVastAdData);
                delete deeper;
                innerWrapper->nestedParser = nullptr;
            }
        } else if (inner == wrapped.firstAd && inner->type == AD_TYPE_INLINE &&
                   inner->body != nullptr) {
            // Only the first ad survives the merge, so only it receives the wrapper's tracking.
            AdInLine* inLine = static_cast<AdInLine*>(inner->body);
            ka::ListEnd<AdImpression> end = ka::FindEnd(&inLine->impressions);
            CopyImpressionList(wrapper->impressions, end, inLine->impressionCount);
            inLine->impressionCount = end.count;
            MergeCreatives(wrapper, inLine->creatives);
            MergeExtras(wrapper, inLine);
        }
    }

    AdData* const next = ad->next;
    const int32_t sequence = ad->sequence;
    // The nested parser is not released with the wrapper's data: its first ad moves below.
    wrapper->nestedParser = nullptr;
    ReleaseAdData(ad);

    if (wrapped.errorUrl != nullptr && mVastAdData.errorUrl == nullptr) {
        mVastAdData.errorUrl = wrapped.errorUrl;
        wrapped.errorUrl = nullptr;
    }
    AdData* first = wrapped.firstAd;
    if (first != nullptr) {
        ad->id = first->id;
        ad->type = first->type;
        ad->body = first->body;
        first->id = nullptr;
        first->type = AD_TYPE_UNKNOWN;
        first->body = nullptr;
    }
    // The resolved ad stands where the wrapper stood and keeps its sequence.
    ad->next = next;
    ad->sequence = sequence;

    // Only the wrapped document's first ad survives.
    ka::ReleaseVastAdData(&wrapped);
    delete nested;
    return KA_OK;
}

unsigned int CVASTParser::MergeCreatives(AdWrapper* wrapper, AdCreative* inlineCreatives) {
    if (wrapper == nullptr) return KA_OK;
    // Every pair of Linear creatives gets a copy. Each InLine creative takes the wrapper
    // creatives in their order, which gives the same lists as taking the wrapper creatives
    // first, while each InLine list is walked to its end only once.
    bool anyLinear = false;
    std::vector<AdLinear*> sources;
    for (AdCreative* c = wrapper->creatives; c != nullptr; c = c->next) {
        AdLinear* linear = LinearOf(c);
        if (linear == nullptr) continue;
        anyLinear = true;
        // A creative with nothing to copy changes no list.
        if (linear->trackingEvents != nullptr || HasClicks(linear->videoClicks)) {
            sources.push_back(linear);
        }
    }
    if (!anyLinear) return KA_OK;

    for (AdCreative* d = inlineCreatives; d != nullptr; d = d->next) {
        AdLinear* target = LinearOf(d);
        if (target != nullptr) AppendLinearTracking(target, sources.data(), sources.size());
    }
    return KA_OK;
}

unsigned int CVASTParser::MergeLinear(AdCreative* wrapperCreative, AdCreative* inlineCreative) {
    AdLinear* source = LinearOf(wrapperCreative);
    AdLinear* target = LinearOf(inlineCreative);
    if (source != nullptr && target != nullptr) AppendLinearTracking(target, &source, 1);
    return KA_OK;
}

void CVASTParser::AppendLinearTracking(AdLinear* target, AdLinear* const* sources, size_t count) {
    for (AdVideoClicks* v = target->videoClicks; v != nullptr; v = v->next) {
        ka::ListEnd<AdClick> trackings = ka::FindEnd(&v->clickTrackings);
        ka::ListEnd<AdClick> customs = ka::FindEnd(&v->customClicks);
        bool trackingsCopied = false;
        bool customsCopied = false;
        for (size_t i = 0; i < count; ++i) {
            // Only the first VideoClicks of the wrapper creative is read.
            const AdVideoClicks* u = sources[i]->videoClicks;
            if (u == nullptr) continue;
            if (u->clickTrackings != nullptr) {
                CopyClickList(u->clickTrackings, trackings, v->clickTrackingCount);
                trackingsCopied = true;
            }
            if (u->customClicks != nullptr) {
                CopyClickList(u->customClicks, customs, v->customClickCount);
                customsCopied = true;
            }
        }
        // A count is rewritten only with its list; the click-through is never copied: the
        // InLine's own destination stands.
        if (trackingsCopied) v->clickTrackingCount = trackings.count;
        if (customsCopied) v->customClickCount = customs.count;
    }
    ka::ListEnd<AdTracking> events = ka::FindEnd(&target->trackingEvents);
    for (size_t i = 0; i < count; ++i) {
        CopyTrackingList(sources[i]->trackingEvents, events, target->trackingCount);
    }
    target->trackingCount = events.count;
}

// Each copy is linked in and counted before its strings are copied: when an allocation fails,
// the list holds only nodes the releases reach and free.
void CVASTParser::CopyImpressionList(const AdImpression* list, ka::ListEnd<AdImpression>& end,
                                     uint32_t& count) {
    for (; list != nullptr; list = list->next) {
        if (!TakeCopy(sizeof(AdImpression), list->url)) break;
        AdImpression* copy = ka::Link(end, mArena->New<AdImpression>(), count);
        copy->url = mArena->CopyString(list->url);
    }
}

void CVASTParser::CopyClickList(const AdClick* list, ka::ListEnd<AdClick>& end, uint32_t& count) {
    for (; list != nullptr; list = list->next) {
        if (!TakeCopy(sizeof(AdClick) + ka::CopySize(list->id), list->url)) break;
        AdClick* copy = ka::Link(end, mArena->New<AdClick>(), count);
        copy->id = mArena->CopyString(list->id);
        copy->url = mArena->CopyString(list->url);
    }
}

void CVASTParser::CopyTrackingList(const AdTracking* list, ka::ListEnd<AdTracking>& end,
                                   uint32_t& count) {
    for (; list != nullptr; list = list->next) {
        if (!TakeCopy(sizeof(AdTracking) + ka::CopySize(list->event), list->url)) break;
        AdTracking* copy = ka::Link(end, mArena->New<AdTracking>(), count);
        copy->event = mArena->CopyString(list->event);
        copy->offsetKind = list->offsetKind;
        copy->offset = list->offset;
        copy->url = mArena->CopyString(list->url);
    }
}

bool CVASTParser::TakeCopy(size_t recordBytes, const char* text) {
    return mBudget == nullptr || mBudget->TakeMergeBytes(recordBytes + ka::CopySize(text));
}
