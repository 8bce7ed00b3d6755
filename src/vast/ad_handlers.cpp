// Handlers of the document, <Ad>, <InLine> and <Wrapper> levels.

#include "ka/result_codes.h"
#include "ka/vast_extension.h"
#include "vast/vast_parser.h"
#include "xml/text.h"

using ka::NameIs;

unsigned int CVASTParser::LoadVASTTag(void* node, void* target, char* name,
                                      unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    VastAdData* data = static_cast<VastAdData*>(target);
    if (NameIs(name, nameLength, "Ad")) {
        AdData* ad = mArena->New<AdData>();
        mAdTail.Append(&data->firstAd, ad);
        data->adCount++;
        LoadAdAttributes(node, ad);
        LoadTag(node, ad, &CVASTParser::LoadAdTag);
    } else if (NameIs(name, nameLength, "Error")) {
        GetElementText(node, data->errorUrl);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadAdAttributes(void* node, AdData* ad) {
    if (node == nullptr || ad == nullptr) return KA_OK;
    static constexpr auto kNames = ka::AttributeNames("id", "sequence", "adType");
    XMLAttributeValue values[3];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], ad->id);
    if (values[1].Present()) ad->sequence = ka::Atoi(values[1].value, values[1].length);
    mPendingAdType = nullptr;
    if (mReadExtras) CopyAttribute(values[2], mPendingAdType);
    return KA_OK;
}

unsigned int CVASTParser::LoadAdTag(void* node, void* target, char* name, unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdData* ad = static_cast<AdData*>(target);
    // The first <InLine> or <Wrapper> decides the ad; later ones are ignored entirely.
    if (ad->body != nullptr) return KA_OK;
    if (NameIs(name, nameLength, "InLine")) {
        ad->type = AD_TYPE_INLINE;
        AdInLine* inLine = mArena->New<AdInLine>();
        ad->body = inLine;
        BeginAdExtras(node, inLine, false);
        LoadTag(node, inLine, &CVASTParser::LoadInLineTag);
    } else if (NameIs(name, nameLength, "Wrapper")) {
        ad->type = AD_TYPE_WRAPPER;
        ad->body = mArena->New<AdWrapper>();
        BeginAdExtras(node, ad->body, true);
        LoadTag(node, ad, &CVASTParser::LoadWrapperTag);
    } else {
        // Any other child before the body marks the ad as InLine, still without a body.
        ad->type = AD_TYPE_INLINE;
    }
    return KA_OK;
}

namespace {

// Element text of an <Impression> appended to list; empty texts add no node.
void AppendImpression(CXMLDocument& doc, void* node, AdImpression** list,
                      ka::ListTail<AdImpression>& tail) {
    char* url = nullptr;
    doc.GetElementText(node, url);
    if (url == nullptr || url[0] == '\0') return;
    AdImpression* impression = doc.mArena->New<AdImpression>();
    impression->url = url;
    tail.Append(list, impression);
}

}  // namespace

unsigned int CVASTParser::LoadInLineTag(void* node, void* target, char* name,
                                        unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdInLine* inLine = static_cast<AdInLine*>(target);
    if (NameIs(name, nameLength, "AdSystem")) {
        ReadElementText(node, inLine->adSystem, TextForm::kRaw);
    } else if (NameIs(name, nameLength, "AdTitle")) {
        ReadElementText(node, inLine->adTitle, TextForm::kRaw);
    } else if (NameIs(name, nameLength, "Impression")) {
        // Counted even when empty: the count says how many elements the ad had.
        inLine->impressionCount++;
        AppendImpression(*this, node, &inLine->impressions, mImpressionTail);
    } else if (NameIs(name, nameLength, "Description")) {
        ReadElementText(node, inLine->description, TextForm::kRaw);
    } else if (NameIs(name, nameLength, "Advertiser")) {
        ReadElementText(node, inLine->advertiser, TextForm::kRaw);
    } else if (NameIs(name, nameLength, "Survey")) {
        // Survey URLs carry query strings: the one raw text that gets "&amp;" decoded.
        if (ReadElementText(node, inLine->survey, TextForm::kRaw)) unescape_amp(inLine->survey);
    } else if (NameIs(name, nameLength, "Error")) {
        GetElementText(node, inLine->error);
    } else if (NameIs(name, nameLength, "Creatives")) {
        LoadTag(node, inLine, &CVASTParser::LoadCreativesTag);
    } else if (NameIs(name, nameLength, "Extensions")) {
        if (mReadExtras) LoadAdExtra(node, name, nameLength);
        return LoadExtensions(node, inLine->extensions);
    } else if (mReadExtras) {
        LoadAdExtra(node, name, nameLength);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadCreativesTag(void* node, void* target, char* name,
                                           unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdInLine* inLine = static_cast<AdInLine*>(target);
    if (LoadCreative(node, &inLine->creatives, name, nameLength) == KA_OK) {
        inLine->creativeCount++;
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadWrapperTag(void* node, void* target, char* name,
                                         unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdWrapper* wrapper = static_cast<AdWrapper*>(static_cast<AdData*>(target)->body);
    if (wrapper == nullptr) return KA_OK;
    if (NameIs(name, nameLength, "AdSystem")) {
        ReadElementText(node, wrapper->adSystem, TextForm::kRaw);
    } else if (NameIs(name, nameLength, "VASTAdTagURI")) {
        GetElementText(node, wrapper->vastAdTagUri);
    } else if (NameIs(name, nameLength, "Error")) {
        GetElementText(node, wrapper->error);
    } else if (NameIs(name, nameLength, "Impression")) {
        AppendImpression(*this, node, &wrapper->impressions, mImpressionTail);
    } else if (NameIs(name, nameLength, "Creatives")) {
        LoadTag(node, &wrapper->creatives, &CVASTParser::LoadCreative);
    } else if (NameIs(name, nameLength, "Extensions")) {
        if (mReadExtras) LoadAdExtra(node, name, nameLength);
        return LoadExtensions(node, wrapper->extensions);
    } else if (mReadExtras) {
        LoadAdExtra(node, name, nameLength);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadExtensions(void* node, CAdExtensions*& extensions) {
    if (mExtensionParser == nullptr) return KA_OK;
    unsigned int result = mExtensionParser->Parse(node);
    if (result != KA_OK) return result;
    CAdExtensions* built = mExtensionParser->GetResult();
    // A second <Extensions> replaces the first; the ad owns only one object.
    if (extensions != nullptr && extensions != built) delete extensions;
    extensions = built;
    return KA_OK;
}
