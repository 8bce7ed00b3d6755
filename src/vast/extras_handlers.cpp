// Handlers of what VAST 4 carries beyond the records: ad-level extras (serving id, categories,
// pricing, viewability, verifications), creative ids, icons, the other media elements of a
// Linear, non-linear overlays and companions. They run inside the one walk of the record
// handlers, which call them for the elements they do not keep, and fill the records of
// ka/vast_extras.h in the records' arena.
#include <cstring>

#include "ka/result_codes.h"
#include "vast/extras_records.h"
#include "vast/vast_parser.h"
#include "xml/text.h"

using ka::NameIs;

namespace {

// A boolean attribute: "true" and "1" are true, anything else false.
int32_t Flag(const XMLAttributeValue& value) {
    if (!value.Present()) return KA_FLAG_ABSENT;
    const unsigned int length = static_cast<unsigned int>(value.length);
    return NameIs(value.value, length, "true") || NameIs(value.value, length, "1") ? 1 : 0;
}

void Number(const XMLAttributeValue& value, int32_t& field) {
    if (value.Present()) field = ka::Atoi(value.value, value.length);
}

int64_t Number64(const XMLAttributeValue& value) {
    if (!value.Present()) return 0;
    // Sizes beyond the int range: digits read one by one, stopping before an overflow.
    int64_t n = 0;
    for (const char* p = value.value; *p >= '0' && *p <= '9'; ++p) {
        if (n > (INT64_MAX - 9) / 10) break;
        n = n * 10 + (*p - '0');
    }
    return n;
}

}  // namespace

// What the handlers of one element fill: the element's record and the ends of its lists.
struct CVASTParser::ExtrasTarget {
    void* record = nullptr;
    ka::Tail<KaResource> resources;
    ka::Tail<KaUrl> urls;
    ka::Tail<KaUrl> moreUrls;
    ka::Tail<KaFallbackImage> images;
    ka::Tail<AdTracking> tracking;
    ka::Tail<KaVerificationResource> scripts;
    ka::Tail<KaVerificationResource> executables;
    uint32_t* trackingCount = nullptr;
};

KaAdExtras* CVASTParser::AdExtras() {
    ka::AdExtrasBuild& b = mAdBuild;
    if (b.extras == nullptr) {
        b.extras = ka::AdExtrasFor(*mArena, b.body);
        b.categories.Start(&b.extras->categories);
        b.blocked.Start(&b.extras->blockedAdCategories);
        b.viewable.Start(&b.extras->viewable);
        b.notViewable.Start(&b.extras->notViewable);
        b.undetermined.Start(&b.extras->viewUndetermined);
        b.verifications.Start(&b.extras->verifications);
    }
    return b.extras;
}

KaCreativeExtras* CVASTParser::CreativeExtras() {
    ka::CreativeExtrasBuild& b = mCreativeBuild;
    if (b.extras == nullptr) {
        b.extras = ka::CreativeExtrasFor(*mArena, b.creative);
        b.ids.Start(&b.extras->universalAdIds);
        b.icons.Start(&b.extras->icons);
        b.mezzanines.Start(&b.extras->mezzanines);
        b.interactive.Start(&b.extras->interactiveFiles);
        b.captions.Start(&b.extras->closedCaptionFiles);
        b.mediaFiles.Start(&b.extras->mediaFiles);
    }
    return b.extras;
}

void CVASTParser::BeginAdExtras(void* bodyNode, const void* body, bool wrapper) {
    mAdBuild = ka::AdExtrasBuild();
    mAdBuild.body = body;
    if (!mReadExtras) return;
    if (mPendingAdType != nullptr) AdExtras()->adType = mPendingAdType;
    mPendingAdType = nullptr;
    if (!wrapper) return;
    static constexpr auto kNames =
        ka::AttributeNames("followAdditionalWrappers", "allowMultipleAds", "fallbackOnNoAd");
    XMLAttributeValue values[3];
    ReadAttributes(bodyNode, kNames, values);
    if (!values[0].Present() && !values[1].Present() && !values[2].Present()) return;
    KaAdExtras* extras = AdExtras();
    extras->followAdditionalWrappers = Flag(values[0]);
    extras->allowMultipleAds = Flag(values[1]);
    extras->fallbackOnNoAd = Flag(values[2]);
}

void CVASTParser::BeginCreativeExtras(const AdCreative* creative) {
    mCreativeBuild = ka::CreativeExtrasBuild();
    mCreativeBuild.creative = creative;
}

void CVASTParser::LoadAdExtra(void* node, char* name, unsigned int nameLength) {
    if (NameIs(name, nameLength, "AdServingId")) {
        GetElementText(node, AdExtras()->adServingId);
    } else if (NameIs(name, nameLength, "Category") ||
               NameIs(name, nameLength, "BlockedAdCategories")) {
        KaCategory* category = mArena->New<KaCategory>();
        AdExtras();
        (name[0] == 'C' ? mAdBuild.categories : mAdBuild.blocked).Add(category);
        CopyAttribute(node, "authority", category->authority);
        GetElementText(node, category->code);
    } else if (NameIs(name, nameLength, "Pricing")) {
        KaAdExtras* extras = AdExtras();
        if (extras->pricing == nullptr) extras->pricing = mArena->New<KaPricing>();
        static constexpr auto kNames = ka::AttributeNames("model", "currency");
        XMLAttributeValue values[2];
        ReadAttributes(node, kNames, values);
        CopyAttribute(values[0], extras->pricing->model);
        CopyAttribute(values[1], extras->pricing->currency);
        GetElementText(node, extras->pricing->value);
    } else if (NameIs(name, nameLength, "Expires")) {
        char* text = nullptr;
        GetElementText(node, text);
        if (text != nullptr) AdExtras()->expires = ka::Atoi(text);
    } else if (NameIs(name, nameLength, "ViewableImpression")) {
        AdExtras();
        LoadTag(node, this, &CVASTParser::LoadViewableTag);
    } else if (NameIs(name, nameLength, "AdVerifications")) {
        AdExtras();
        LoadTag(node, this, &CVASTParser::LoadVerificationsTag);
    } else if (NameIs(name, nameLength, "Extensions")) {
        LoadTag(node, this, &CVASTParser::LoadExtensionExtraTag);
    }
}

unsigned int CVASTParser::LoadExtensionExtraTag(void* node, void* /*target*/, char* name,
                                                unsigned int nameLength) {
    if (node == nullptr || name == nullptr || !NameIs(name, nameLength, "Extension")) return KA_OK;
    char* type = nullptr;
    int length = 0;
    if (!ReadAttribute(node, "type", &type, length)) return KA_OK;
    if (!NameIs(type, static_cast<unsigned int>(length), "AdVerifications")) return KA_OK;
    AdExtras();
    // VAST 3 responses carry the AdVerifications element, or its Verification elements, here.
    LoadTag(node, this, &CVASTParser::LoadVerificationsTag);
    return KA_OK;
}

unsigned int CVASTParser::LoadViewableTag(void* node, void* /*target*/, char* name,
                                          unsigned int nameLength) {
    if (node == nullptr || name == nullptr) return KA_OK;
    ka::Tail<KaUrl>* list = NameIs(name, nameLength, "Viewable")           ? &mAdBuild.viewable
                            : NameIs(name, nameLength, "NotViewable")      ? &mAdBuild.notViewable
                            : NameIs(name, nameLength, "ViewUndetermined") ? &mAdBuild.undetermined
                                                                           : nullptr;
    if (list != nullptr) AppendUrl(node, *list);
    return KA_OK;
}

void CVASTParser::AppendUrl(void* node, ka::Tail<KaUrl>& list) {
    KaUrl* url = mArena->New<KaUrl>();
    list.Add(url);
    CopyAttribute(node, "id", url->id);
    GetElementText(node, url->url);
}

unsigned int CVASTParser::LoadVerificationsTag(void* node, void* /*target*/, char* name,
                                               unsigned int nameLength) {
    if (node == nullptr || name == nullptr) return KA_OK;
    if (NameIs(name, nameLength, "AdVerifications")) {
        LoadTag(node, this, &CVASTParser::LoadVerificationsTag);
        return KA_OK;
    }
    if (!NameIs(name, nameLength, "Verification")) return KA_OK;
    KaVerification* verification = mArena->New<KaVerification>();
    mAdBuild.verifications.Add(verification);
    CopyAttribute(node, "vendor", verification->vendor);
    ExtrasTarget target;
    target.record = verification;
    target.scripts.Start(&verification->javaScriptResources);
    target.executables.Start(&verification->executableResources);
    target.tracking.Start(&verification->trackingEvents);
    target.trackingCount = &verification->trackingCount;
    LoadTag(node, &target, &CVASTParser::LoadVerificationTag);
    return KA_OK;
}

unsigned int CVASTParser::LoadVerificationTag(void* node, void* target, char* name,
                                              unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    ExtrasTarget& t = *static_cast<ExtrasTarget*>(target);
    KaVerification* verification = static_cast<KaVerification*>(t.record);
    const bool script = NameIs(name, nameLength, "JavaScriptResource");
    if (script || NameIs(name, nameLength, "ExecutableResource")) {
        KaVerificationResource* resource = mArena->New<KaVerificationResource>();
        (script ? t.scripts : t.executables).Add(resource);
        static constexpr auto kNames =
            ka::AttributeNames("apiFramework", "browserOptional", "type");
        XMLAttributeValue values[3];
        ReadAttributes(node, kNames, values);
        CopyAttribute(values[0], resource->apiFramework);
        resource->browserOptional = script ? Flag(values[1]) : KA_FLAG_ABSENT;
        if (!script) CopyAttribute(values[2], resource->type);
        GetElementText(node, resource->url);
    } else if (NameIs(name, nameLength, "VerificationParameters")) {
        GetElementText(node, verification->verificationParameters);
    } else if (NameIs(name, nameLength, "TrackingEvents")) {
        LoadTag(node, &t, &CVASTParser::LoadExtraTrackingTag);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadExtraTrackingTag(void* node, void* target, char* name,
                                               unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    if (!NameIs(name, nameLength, "Tracking")) return KA_OK;
    ExtrasTarget& t = *static_cast<ExtrasTarget*>(target);
    AdTracking* tracking = mArena->New<AdTracking>();
    t.tracking.Add(tracking);
    ++*t.trackingCount;
    LoadTrackingAttributes(node, tracking);
    GetElementText(node, tracking->url);
    return KA_OK;
}

bool CVASTParser::LoadResource(void* node, char* name, unsigned int nameLength,
                               ka::Tail<KaResource>& list) {
    uint32_t kind = 0;
    if (NameIs(name, nameLength, "StaticResource")) {
        kind = KA_RESOURCE_STATIC;
    } else if (NameIs(name, nameLength, "IFrameResource")) {
        kind = KA_RESOURCE_IFRAME;
    } else if (NameIs(name, nameLength, "HTMLResource")) {
        kind = KA_RESOURCE_HTML;
    } else {
        return false;
    }
    KaResource* resource = mArena->New<KaResource>();
    list.Add(resource);
    resource->kind = kind;
    if (kind == KA_RESOURCE_STATIC) CopyAttribute(node, "creativeType", resource->creativeType);
    GetElementText(node, resource->content);
    return true;
}

void CVASTParser::LoadCreativeExtra(void* node, char* name, unsigned int nameLength) {
    if (NameIs(name, nameLength, "UniversalAdId")) {
        KaUniversalAdId* id = mArena->New<KaUniversalAdId>();
        CreativeExtras();
        mCreativeBuild.ids.Add(id);
        static constexpr auto kNames = ka::AttributeNames("idRegistry", "idValue");
        XMLAttributeValue values[2];
        ReadAttributes(node, kNames, values);
        CopyAttribute(values[0], id->idRegistry);
        CopyAttribute(values[1], id->idValue);
        GetElementText(node, id->value);
    } else if (NameIs(name, nameLength, "NonLinearAds")) {
        KaCreativeExtras* extras = CreativeExtras();
        if (extras->nonLinearAds == nullptr) {
            extras->nonLinearAds = mArena->New<KaNonLinearAds>();
            mCreativeBuild.nonLinears.Start(&extras->nonLinearAds->nonLinears);
        }
        ExtrasTarget target;
        target.record = extras->nonLinearAds;
        target.tracking.Start(&extras->nonLinearAds->trackingEvents);
        target.trackingCount = &extras->nonLinearAds->trackingCount;
        LoadTag(node, &target, &CVASTParser::LoadNonLinearAdsTag);
    } else if (NameIs(name, nameLength, "CompanionAds")) {
        KaCreativeExtras* extras = CreativeExtras();
        if (extras->companionAds == nullptr) {
            extras->companionAds = mArena->New<KaCompanionAds>();
            mCreativeBuild.companions.Start(&extras->companionAds->companions);
        }
        CopyAttribute(node, "required", extras->companionAds->required);
        LoadTag(node, this, &CVASTParser::LoadCompanionAdsTag);
    }
}

void CVASTParser::LoadCreativeExtraAttributes(const XMLAttributeValue& apiFramework,
                                              const XMLAttributeValue& legacyAdId) {
    if (!mReadExtras || (!apiFramework.Present() && !legacyAdId.Present())) return;
    KaCreativeExtras* extras = CreativeExtras();
    CopyAttribute(apiFramework, extras->apiFramework);
    CopyAttribute(legacyAdId, extras->legacyAdId);
}

unsigned int CVASTParser::LoadNonLinearAdsTag(void* node, void* target, char* name,
                                              unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    if (NameIs(name, nameLength, "TrackingEvents")) {
        LoadTag(node, target, &CVASTParser::LoadExtraTrackingTag);
        return KA_OK;
    }
    if (!NameIs(name, nameLength, "NonLinear")) return KA_OK;
    KaNonLinear* nonLinear = mArena->New<KaNonLinear>();
    mCreativeBuild.nonLinears.Add(nonLinear);
    static constexpr auto kNames =
        ka::AttributeNames("id", "width", "height", "expandedWidth", "expandedHeight", "scalable",
                           "maintainAspectRatio", "minSuggestedDuration", "apiFramework");
    XMLAttributeValue values[9];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], nonLinear->id);
    Number(values[1], nonLinear->width);
    Number(values[2], nonLinear->height);
    Number(values[3], nonLinear->expandedWidth);
    Number(values[4], nonLinear->expandedHeight);
    nonLinear->scalable = Flag(values[5]);
    nonLinear->maintainAspectRatio = Flag(values[6]);
    if (values[7].Present()) {
        nonLinear->minSuggestedDuration = string2time(values[7].value, values[7].length);
    }
    CopyAttribute(values[8], nonLinear->apiFramework);
    ExtrasTarget inner;
    inner.record = nonLinear;
    inner.resources.Start(&nonLinear->resources);
    inner.urls.Start(&nonLinear->clickTrackings);
    LoadTag(node, &inner, &CVASTParser::LoadNonLinearTag);
    return KA_OK;
}

unsigned int CVASTParser::LoadNonLinearTag(void* node, void* target, char* name,
                                           unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    ExtrasTarget& t = *static_cast<ExtrasTarget*>(target);
    KaNonLinear* nonLinear = static_cast<KaNonLinear*>(t.record);
    if (LoadResource(node, name, nameLength, t.resources)) return KA_OK;
    if (NameIs(name, nameLength, "AdParameters")) {
        GetElementText(node, nonLinear->adParameters);
    } else if (NameIs(name, nameLength, "NonLinearClickThrough")) {
        GetElementText(node, nonLinear->clickThrough);
    } else if (NameIs(name, nameLength, "NonLinearClickTracking")) {
        AppendUrl(node, t.urls);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadCompanionAdsTag(void* node, void* /*target*/, char* name,
                                              unsigned int nameLength) {
    if (node == nullptr || name == nullptr || !NameIs(name, nameLength, "Companion")) return KA_OK;
    KaCompanion* companion = mArena->New<KaCompanion>();
    mCreativeBuild.companions.Add(companion);
    static constexpr auto kNames = ka::AttributeNames(
        "id", "width", "height", "assetWidth", "assetHeight", "expandedWidth", "expandedHeight",
        "apiFramework", "adSlotId", "adSlotID", "pxratio", "renderingMode");
    XMLAttributeValue values[12];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], companion->id);
    Number(values[1], companion->width);
    Number(values[2], companion->height);
    Number(values[3], companion->assetWidth);
    Number(values[4], companion->assetHeight);
    Number(values[5], companion->expandedWidth);
    Number(values[6], companion->expandedHeight);
    CopyAttribute(values[7], companion->apiFramework);
    // VAST 4.1 spells it adSlotId; earlier documents adSlotID.
    if (!CopyAttribute(values[8], companion->adSlotId))
        CopyAttribute(values[9], companion->adSlotId);
    CopyAttribute(values[10], companion->pxratio);
    CopyAttribute(values[11], companion->renderingMode);
    ExtrasTarget inner;
    inner.record = companion;
    inner.resources.Start(&companion->resources);
    inner.urls.Start(&companion->clickTrackings);
    inner.tracking.Start(&companion->trackingEvents);
    inner.trackingCount = &companion->trackingCount;
    LoadTag(node, &inner, &CVASTParser::LoadCompanionTag);
    return KA_OK;
}

unsigned int CVASTParser::LoadCompanionTag(void* node, void* target, char* name,
                                           unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    ExtrasTarget& t = *static_cast<ExtrasTarget*>(target);
    KaCompanion* companion = static_cast<KaCompanion*>(t.record);
    if (LoadResource(node, name, nameLength, t.resources)) return KA_OK;
    if (NameIs(name, nameLength, "AdParameters")) {
        GetElementText(node, companion->adParameters);
    } else if (NameIs(name, nameLength, "AltText")) {
        GetElementText(node, companion->altText);
    } else if (NameIs(name, nameLength, "CompanionClickThrough")) {
        GetElementText(node, companion->clickThrough);
    } else if (NameIs(name, nameLength, "CompanionClickTracking")) {
        AppendUrl(node, t.urls);
    } else if (NameIs(name, nameLength, "TrackingEvents")) {
        LoadTag(node, &t, &CVASTParser::LoadExtraTrackingTag);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadIconsTag(void* node, void* /*target*/, char* name,
                                       unsigned int nameLength) {
    if (node == nullptr || name == nullptr || !NameIs(name, nameLength, "Icon")) return KA_OK;
    KaIcon* icon = mArena->New<KaIcon>();
    CreativeExtras();
    mCreativeBuild.icons.Add(icon);
    static constexpr auto kNames =
        ka::AttributeNames("program", "width", "height", "xPosition", "yPosition", "duration",
                           "offset", "apiFramework", "pxratio");
    XMLAttributeValue values[9];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], icon->program);
    Number(values[1], icon->width);
    Number(values[2], icon->height);
    CopyAttribute(values[3], icon->xPosition);
    CopyAttribute(values[4], icon->yPosition);
    if (values[5].Present()) icon->duration = string2time(values[5].value, values[5].length);
    if (values[6].Present()) icon->offset = string2time(values[6].value, values[6].length);
    CopyAttribute(values[7], icon->apiFramework);
    CopyAttribute(values[8], icon->pxratio);
    ExtrasTarget inner;
    inner.record = icon;
    inner.resources.Start(&icon->resources);
    inner.urls.Start(&icon->clickTrackings);
    inner.moreUrls.Start(&icon->viewTrackings);
    inner.images.Start(&icon->fallbackImages);
    LoadTag(node, &inner, &CVASTParser::LoadIconTag);
    return KA_OK;
}

unsigned int CVASTParser::LoadIconTag(void* node, void* target, char* name,
                                      unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    ExtrasTarget& t = *static_cast<ExtrasTarget*>(target);
    KaIcon* icon = static_cast<KaIcon*>(t.record);
    if (LoadResource(node, name, nameLength, t.resources)) return KA_OK;
    if (NameIs(name, nameLength, "IconClicks")) {
        LoadTag(node, &t, &CVASTParser::LoadIconTag);
    } else if (NameIs(name, nameLength, "IconClickThrough")) {
        GetElementText(node, icon->clickThrough);
    } else if (NameIs(name, nameLength, "IconClickTracking")) {
        AppendUrl(node, t.urls);
    } else if (NameIs(name, nameLength, "IconViewTracking")) {
        AppendUrl(node, t.moreUrls);
    } else if (NameIs(name, nameLength, "IconClickFallbackImages")) {
        LoadTag(node, &t, &CVASTParser::LoadIconTag);
    } else if (NameIs(name, nameLength, "IconClickFallbackImage")) {
        KaFallbackImage* image = mArena->New<KaFallbackImage>();
        t.images.Add(image);
        static constexpr auto kNames = ka::AttributeNames("width", "height");
        XMLAttributeValue values[2];
        ReadAttributes(node, kNames, values);
        Number(values[0], image->width);
        Number(values[1], image->height);
        LoadTag(node, image, &CVASTParser::LoadFallbackImageTag);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadFallbackImageTag(void* node, void* target, char* name,
                                               unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    KaFallbackImage* image = static_cast<KaFallbackImage*>(target);
    if (NameIs(name, nameLength, "AltText")) {
        GetElementText(node, image->altText);
    } else if (NameIs(name, nameLength, "StaticResource")) {
        CopyAttribute(node, "creativeType", image->creativeType);
        GetElementText(node, image->url);
    }
    return KA_OK;
}

void CVASTParser::LoadMediaExtra(void* node, char* name, unsigned int nameLength) {
    if (NameIs(name, nameLength, "ClosedCaptionFiles")) {
        LoadTag(node, this, &CVASTParser::LoadCaptionsTag);
        return;
    }
    const bool mezzanine = NameIs(name, nameLength, "Mezzanine");
    if (!mezzanine && !NameIs(name, nameLength, "InteractiveCreativeFile")) return;
    KaMediaAsset* asset = mArena->New<KaMediaAsset>();
    CreativeExtras();
    (mezzanine ? mCreativeBuild.mezzanines : mCreativeBuild.interactive).Add(asset);
    static constexpr auto kNames =
        ka::AttributeNames("type", "delivery", "width", "height", "codec", "id", "fileSize",
                           "mediaType", "apiFramework", "variableDuration");
    XMLAttributeValue values[10];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], asset->type);
    CopyAttribute(values[1], asset->delivery);
    Number(values[2], asset->width);
    Number(values[3], asset->height);
    CopyAttribute(values[4], asset->codec);
    CopyAttribute(values[5], asset->id);
    asset->fileSize = Number64(values[6]);
    CopyAttribute(values[7], asset->mediaType);
    CopyAttribute(values[8], asset->apiFramework);
    asset->variableDuration = Flag(values[9]);
    GetElementText(node, asset->url);
}

unsigned int CVASTParser::LoadCaptionsTag(void* node, void* /*target*/, char* name,
                                          unsigned int nameLength) {
    if (node == nullptr || name == nullptr) return KA_OK;
    if (!NameIs(name, nameLength, "ClosedCaptionFile")) return KA_OK;
    KaMediaAsset* asset = mArena->New<KaMediaAsset>();
    CreativeExtras();
    mCreativeBuild.captions.Add(asset);
    static constexpr auto kNames = ka::AttributeNames("type", "language");
    XMLAttributeValue values[2];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], asset->type);
    CopyAttribute(values[1], asset->language);
    asset->variableDuration = KA_FLAG_ABSENT;
    GetElementText(node, asset->url);
    return KA_OK;
}

void CVASTParser::LoadMediaFileExtras(const AdMediaFile* mediaFile,
                                      const XMLAttributeValue* values) {
    if (!mReadExtras || (!values[0].Present() && !values[1].Present() && !values[2].Present()))
        return;
    KaMediaFileExtras* extras = mArena->New<KaMediaFileExtras>();
    CreativeExtras();
    mCreativeBuild.mediaFiles.Add(extras);
    extras->mediaFile = mediaFile;
    extras->fileSize = Number64(values[0]);
    CopyAttribute(values[1], extras->mediaType);
    CopyAttribute(values[2], extras->apiFramework);
}
