// Releases of the VAST records. Lists are freed node by node with loops, whatever their length.
#include "vast/vast_release.h"

#include "ka/result_codes.h"
#include "ka/vast_extension.h"
#include "vast/vast_parser.h"

namespace {

void FreeString(char*& text) {
    delete[] text;
    text = nullptr;
}

void FreeImpressions(AdImpression*& list) {
    while (list != nullptr) {
        AdImpression* next = list->next;
        delete[] list->url;
        delete list;
        list = next;
    }
}

// Frees at most count nodes of a click list, stopping early at its end.
void FreeClicks(AdClick*& list, uint32_t count) {
    for (uint32_t i = 0; i < count && list != nullptr; ++i) {
        AdClick* next = list->next;
        delete[] list->id;
        delete[] list->url;
        delete list;
        list = next;
    }
    list = nullptr;
}

// Frees at most count nodes of a list whose nodes own nothing.
template <typename T>
void FreePlainList(T*& list, uint32_t count) {
    for (uint32_t i = 0; i < count && list != nullptr; ++i) {
        T* next = list->next;
        delete list;
        list = next;
    }
    list = nullptr;
}

void FreeExtensions(CAdExtensions*& extensions) {
    delete extensions;
    extensions = nullptr;
}

// Frees a creative list in list order; the linear content goes through ReleaseLinear.
void FreeCreatives(AdCreative*& list) {
    while (list != nullptr) {
        AdCreative* next = list->next;
        FreeString(list->id);
        FreeString(list->adId);
        if (list->kind == AD_CREATIVE_LINEAR) ka::ReleaseLinear(&list->content);
        delete list;
        list = next;
    }
}

}  // namespace

namespace ka {

unsigned int ReleaseVastAdData(VastAdData* data) {
    if (data == nullptr) return KA_OK;
    FreeString(data->errorUrl);
    AdData* ad = data->firstAd;
    while (ad != nullptr) {
        AdData* next = ad->next;
        ReleaseAdData(ad);
        delete ad;
        ad = next;
    }
    data->firstAd = nullptr;
    data->adCount = 0;
    return KA_OK;
}

unsigned int ReleaseAdData(AdData* ad) {
    if (ad == nullptr) return KA_OK;
    if (ad->type == AD_TYPE_WRAPPER && ad->body != nullptr) {
        AdWrapper* wrapper = static_cast<AdWrapper*>(ad->body);
        FreeString(wrapper->vastAdTagUri);
        FreeString(wrapper->adSystem);
        FreeString(wrapper->error);
        FreeImpressions(wrapper->impressions);
        FreeCreatives(wrapper->creatives);
        FreeExtensions(wrapper->extensions);
        if (wrapper->nestedParser != nullptr) {
            // The wrapped document's records live in the nested parser's own container.
            CVASTParser* nested = wrapper->nestedParser;
            wrapper->nestedParser = nullptr;
            ReleaseVastAdData(&nested->mVastAdData);
            delete nested;
        }
        delete wrapper;
    } else if (ad->type == AD_TYPE_INLINE && ad->body != nullptr) {
        AdInLine* inLine = static_cast<AdInLine*>(ad->body);
        FreeString(inLine->adSystem);
        FreeString(inLine->adTitle);
        FreeImpressions(inLine->impressions);
        FreeString(inLine->description);
        FreeString(inLine->advertiser);
        FreeString(inLine->survey);
        FreeString(inLine->error);
        FreeCreatives(inLine->creatives);
        FreeExtensions(inLine->extensions);
        delete inLine;
    }
    ad->body = nullptr;
    FreeString(ad->id);
    return KA_OK;
}

unsigned int ReleaseLinear(AdLinear* linear) {
    if (linear == nullptr) return KA_OK;
    AdMediaFile* mediaFile = linear->mediaFiles;
    for (uint32_t i = 0; i < linear->mediaFileCount && mediaFile != nullptr; ++i) {
        AdMediaFile* next = mediaFile->next;
        delete[] mediaFile->type;
        delete[] mediaFile->codec;
        delete[] mediaFile->url;
        delete mediaFile;
        mediaFile = next;
    }
    if (linear->videoClicks != nullptr && linear->videoClicksCount != 0) {
        AdVideoClicks* clicks = linear->videoClicks;
        FreeClicks(clicks->clickThroughs, clicks->clickThroughCount);
        FreeClicks(clicks->clickTrackings, clicks->clickTrackingCount);
        FreeClicks(clicks->customClicks, clicks->customClickCount);
        delete clicks;
    }
    FreePlainList(linear->adParameters, linear->adParametersCount);
    AdTracking* tracking = linear->trackingEvents;
    for (uint32_t i = 0; i < linear->trackingCount && tracking != nullptr; ++i) {
        AdTracking* next = tracking->next;
        delete[] tracking->event;
        delete[] tracking->url;
        delete tracking;
        tracking = next;
    }
    FreePlainList(linear->icons, linear->iconCount);
    *linear = AdLinear();
    return KA_OK;
}

}  // namespace ka

// The members forward to the functions above. Their records may be lists this parser is filling,
// so the remembered list ends go first.

unsigned int CVASTParser::ReleaseVastAdData(VastAdData* data) {
    if (data == nullptr) return KA_OK;
    ResetTails();
    return ka::ReleaseVastAdData(data);
}

unsigned int CVASTParser::ReleaseAdData(AdData* ad) {
    if (ad == nullptr) return KA_OK;
    ResetTails();
    return ka::ReleaseAdData(ad);
}

unsigned int CVASTParser::ReleaseLinear(AdLinear* linear) {
    if (linear == nullptr) return KA_OK;
    ResetTails();
    return ka::ReleaseLinear(linear);
}
