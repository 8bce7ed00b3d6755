#include "vast/chain_trace.h"

#include "ka/vmap_parser_ext.h"

namespace ka {

namespace {

uint32_t VastErrorOf(uint32_t reason) {
    switch (reason) {
        case KA_CHAIN_REASON_NONE:
            return KA_VAST_ERROR_NONE;
        case KA_CHAIN_REASON_NO_URI:
        case KA_CHAIN_REASON_NO_BODY:
            return KA_VAST_ERROR_SCHEMA;
        case KA_CHAIN_REASON_NOT_XML:
            return KA_VAST_ERROR_XML;
        case KA_CHAIN_REASON_VERSION:
            return KA_VAST_ERROR_VERSION;
        case KA_CHAIN_REASON_URL_REFUSED:
        case KA_CHAIN_REASON_DOWNLOAD:
            return KA_VAST_ERROR_WRAPPER;
        case KA_CHAIN_REASON_DEADLINE:
        case KA_CHAIN_REASON_STOPPED:
            return KA_VAST_ERROR_TIMEOUT;
        case KA_CHAIN_REASON_NO_AD:
            return KA_VAST_ERROR_NO_AD;
        case KA_CHAIN_REASON_DEPTH:
        case KA_CHAIN_REASON_FETCHES:
        case KA_CHAIN_REASON_BYTES:
        case KA_CHAIN_REASON_MERGE_SHARE:
            return KA_VAST_ERROR_LIMIT;
        default:
            return KA_VAST_ERROR_UNDEFINED;
    }
}

const char* OwnError(const AdData* ad) {
    if (ad == nullptr || ad->body == nullptr) return nullptr;
    if (ad->type == AD_TYPE_INLINE) return static_cast<const AdInLine*>(ad->body)->error;
    if (ad->type == AD_TYPE_WRAPPER) return static_cast<const AdWrapper*>(ad->body)->error;
    return nullptr;
}

}  // namespace

void ChainTrace::BeginDocument(const char* rootError) { mRootError = rootError; }

void ChainTrace::BeginAd(AdData* ad, uint64_t mergeRefusals) {
    mAds.push_back(AdTrace{ad, KA_CHAIN_NOT_WRAPPED, KA_VAST_ERROR_NONE, KA_CHAIN_REASON_NONE,
                           mHops.size(), 0, mErrorUrls.size(), 0, mergeRefusals});
    AddErrorUrl(mRootError);
    AddErrorUrl(OwnError(ad));
    if (ad->body == nullptr) {
        End(KA_CHAIN_NOT_WRAPPED, KA_CHAIN_REASON_NO_BODY);
    } else if (ad->type == AD_TYPE_WRAPPER) {
        End(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_NONE);
    }
}

void ChainTrace::PathDocument(const char* rootError, const AdData* first, bool versionOk) {
    AddErrorUrl(rootError);
    AddErrorUrl(OwnError(first));
    // A wrapper first ad leaves the outcome pending: its own fetch decides.
    if (first != nullptr && first->body != nullptr && first->type == AD_TYPE_WRAPPER) return;
    if (first != nullptr && first->body != nullptr && first->type == AD_TYPE_INLINE) {
        End(KA_CHAIN_RESOLVED, KA_CHAIN_REASON_NONE);
    } else if (!versionOk) {
        End(KA_CHAIN_EMPTIED, KA_CHAIN_REASON_VERSION);
    } else {
        End(KA_CHAIN_EMPTIED, first == nullptr ? KA_CHAIN_REASON_NO_AD : KA_CHAIN_REASON_NO_BODY);
    }
}

void ChainTrace::End(uint32_t state, uint32_t reason) {
    if (mAds.empty()) return;
    AdTrace& ad = mAds.back();
    ad.state = state;
    ad.reason = reason;
    // A Wrapper with nothing decided yet reads as "undefined" should nothing decide it.
    ad.vastError = state == KA_CHAIN_WRAPPER && reason == KA_CHAIN_REASON_NONE
                       ? KA_VAST_ERROR_UNDEFINED
                       : VastErrorOf(reason);
}

void ChainTrace::AddHop(HopTrace hop) {
    if (mAds.empty()) return;
    mHops.push_back(hop);
    ++mAds.back().hopCount;
}

void ChainTrace::EndAd(uint64_t mergeRefusals) {
    if (mAds.empty()) return;
    AdTrace& ad = mAds.back();
    if (ad.state == KA_CHAIN_RESOLVED && mergeRefusals > ad.mergeRefusalsBefore) {
        End(KA_CHAIN_RESOLVED, KA_CHAIN_REASON_MERGE_SHARE);
    }
}

void ChainTrace::Clear() {
    mRootError = nullptr;
    mAds.clear();
    mHops.clear();
    mErrorUrls.clear();
}

void ChainTrace::AddErrorUrl(const char* url) {
    if (mAds.empty() || url == nullptr || url[0] == '\0') return;
    mErrorUrls.push_back({url});
    ++mAds.back().errorUrlCount;
}

}  // namespace ka
