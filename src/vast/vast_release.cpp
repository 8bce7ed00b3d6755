// Releases of the VAST records. The records and their strings live in the arena of the handle
// (ka::Arena), which gives their memory back all at once; a release unlinks them in the order
// records are released, nulls what it let go, and destroys what lives on the heap: extension
// objects and nested parsers. Lists are walked with loops, whatever their length.
#include "vast/vast_release.h"

#include "ka/result_codes.h"
#include "ka/vast_extension.h"
#include "vast/vast_parser.h"

namespace {

void FreeString(char*& text) { text = nullptr; }

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
        wrapper->impressions = nullptr;  // nodes and URLs are the arena's
        FreeCreatives(wrapper->creatives);
        FreeExtensions(wrapper->extensions);
        if (wrapper->nestedParser != nullptr) {
            // The wrapped document's records live in the nested parser's own container.
            CVASTParser* nested = wrapper->nestedParser;
            wrapper->nestedParser = nullptr;
            ReleaseVastAdData(&nested->mVastAdData);
            delete nested;
        }
    } else if (ad->type == AD_TYPE_INLINE && ad->body != nullptr) {
        AdInLine* inLine = static_cast<AdInLine*>(ad->body);
        FreeString(inLine->adSystem);
        FreeString(inLine->adTitle);
        inLine->impressions = nullptr;
        FreeString(inLine->description);
        FreeString(inLine->advertiser);
        FreeString(inLine->survey);
        FreeString(inLine->error);
        FreeCreatives(inLine->creatives);
        FreeExtensions(inLine->extensions);
    }
    ad->body = nullptr;
    FreeString(ad->id);
    return KA_OK;
}

unsigned int ReleaseLinear(AdLinear* linear) {
    if (linear == nullptr) return KA_OK;
    // Nothing below a linear creative lives on the heap: its lists go with the arena.
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
