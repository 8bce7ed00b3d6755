#include "extras_printer.h"

#include <cstdlib>
#include <cstring>
#include <string>

namespace {

// A list under key: each record printed by fields into its own block.
template <typename Record, typename Fields>
void List(FILE* out, JsonBlock& parent, const char* key, const Record* first, Fields fields) {
    parent.Key(key);
    JsonBlock list(out, parent.Inner(), '[');
    for (const Record* r = first; r != nullptr; r = r->next) {
        list.Item();
        JsonBlock o(out, list.Inner(), '{');
        fields(o, *r);
        o.End();
    }
    list.End();
}

void Urls(FILE* out, JsonBlock& parent, const char* key, const KaUrl* urls) {
    List(out, parent, key, urls, [out](JsonBlock& o, const KaUrl& u) {
        JsonKeyString(out, o, "id", u.id);
        JsonKeyString(out, o, "url", u.url);
    });
}

void Tracking(FILE* out, JsonBlock& parent, uint32_t count, const AdTracking* events) {
    JsonKeyU64(out, parent, "trackingCount", count);
    List(out, parent, "trackingEvents", events, [out](JsonBlock& o, const AdTracking& t) {
        JsonKeyString(out, o, "event", t.event);
        JsonKeyU64(out, o, "offsetKind", t.offsetKind);
        JsonKeyI64(out, o, "offset", t.offset);
        JsonKeyString(out, o, "url", t.url);
    });
}

void Resources(FILE* out, JsonBlock& parent, const KaResource* resources) {
    List(out, parent, "resources", resources, [out](JsonBlock& o, const KaResource& r) {
        JsonKeyU64(out, o, "kind", r.kind);
        JsonKeyString(out, o, "creativeType", r.creativeType);
        JsonKeyString(out, o, "content", r.content);
    });
}

void Categories(FILE* out, JsonBlock& parent, const char* key, const KaCategory* categories) {
    List(out, parent, key, categories, [out](JsonBlock& o, const KaCategory& c) {
        JsonKeyString(out, o, "authority", c.authority);
        JsonKeyString(out, o, "code", c.code);
    });
}

void Scripts(FILE* out, JsonBlock& parent, const char* key, const KaVerificationResource* list) {
    List(out, parent, key, list, [out](JsonBlock& o, const KaVerificationResource& r) {
        JsonKeyString(out, o, "apiFramework", r.apiFramework);
        JsonKeyI64(out, o, "browserOptional", r.browserOptional);
        JsonKeyString(out, o, "type", r.type);
        JsonKeyString(out, o, "url", r.url);
    });
}

void Assets(FILE* out, JsonBlock& parent, const char* key, const KaMediaAsset* assets) {
    List(out, parent, key, assets, [out](JsonBlock& o, const KaMediaAsset& a) {
        JsonKeyString(out, o, "type", a.type);
        JsonKeyString(out, o, "delivery", a.delivery);
        JsonKeyI64(out, o, "width", a.width);
        JsonKeyI64(out, o, "height", a.height);
        JsonKeyString(out, o, "codec", a.codec);
        JsonKeyString(out, o, "id", a.id);
        JsonKeyI64(out, o, "fileSize", a.fileSize);
        JsonKeyString(out, o, "mediaType", a.mediaType);
        JsonKeyString(out, o, "apiFramework", a.apiFramework);
        JsonKeyI64(out, o, "variableDuration", a.variableDuration);
        JsonKeyString(out, o, "language", a.language);
        JsonKeyString(out, o, "url", a.url);
    });
}

void Icons(FILE* out, JsonBlock& parent, const KaIcon* icons) {
    List(out, parent, "icons", icons, [out](JsonBlock& o, const KaIcon& i) {
        JsonKeyString(out, o, "program", i.program);
        JsonKeyI64(out, o, "width", i.width);
        JsonKeyI64(out, o, "height", i.height);
        JsonKeyString(out, o, "xPosition", i.xPosition);
        JsonKeyString(out, o, "yPosition", i.yPosition);
        JsonKeyU64(out, o, "duration", i.duration);
        JsonKeyU64(out, o, "offset", i.offset);
        JsonKeyString(out, o, "apiFramework", i.apiFramework);
        JsonKeyString(out, o, "pxratio", i.pxratio);
        Resources(out, o, i.resources);
        JsonKeyString(out, o, "clickThrough", i.clickThrough);
        Urls(out, o, "clickTrackings", i.clickTrackings);
        List(out, o, "fallbackImages", i.fallbackImages,
             [out](JsonBlock& f, const KaFallbackImage& image) {
                 JsonKeyI64(out, f, "width", image.width);
                 JsonKeyI64(out, f, "height", image.height);
                 JsonKeyString(out, f, "altText", image.altText);
                 JsonKeyString(out, f, "creativeType", image.creativeType);
                 JsonKeyString(out, f, "url", image.url);
             });
        Urls(out, o, "viewTrackings", i.viewTrackings);
    });
}

void NonLinearAds(FILE* out, JsonBlock& parent, const KaNonLinearAds* ads) {
    parent.Key("nonLinearAds");
    if (ads == nullptr) {
        fputs("null", out);
        return;
    }
    JsonBlock o(out, parent.Inner(), '{');
    List(out, o, "nonLinears", ads->nonLinears, [out](JsonBlock& n, const KaNonLinear& l) {
        JsonKeyString(out, n, "id", l.id);
        JsonKeyI64(out, n, "width", l.width);
        JsonKeyI64(out, n, "height", l.height);
        JsonKeyI64(out, n, "expandedWidth", l.expandedWidth);
        JsonKeyI64(out, n, "expandedHeight", l.expandedHeight);
        JsonKeyI64(out, n, "scalable", l.scalable);
        JsonKeyI64(out, n, "maintainAspectRatio", l.maintainAspectRatio);
        JsonKeyU64(out, n, "minSuggestedDuration", l.minSuggestedDuration);
        JsonKeyString(out, n, "apiFramework", l.apiFramework);
        Resources(out, n, l.resources);
        JsonKeyString(out, n, "adParameters", l.adParameters);
        JsonKeyString(out, n, "clickThrough", l.clickThrough);
        Urls(out, n, "clickTrackings", l.clickTrackings);
    });
    Tracking(out, o, ads->trackingCount, ads->trackingEvents);
    o.End();
}

void CompanionAds(FILE* out, JsonBlock& parent, const KaCompanionAds* ads) {
    parent.Key("companionAds");
    if (ads == nullptr) {
        fputs("null", out);
        return;
    }
    JsonBlock o(out, parent.Inner(), '{');
    JsonKeyString(out, o, "required", ads->required);
    List(out, o, "companions", ads->companions, [out](JsonBlock& n, const KaCompanion& c) {
        JsonKeyString(out, n, "id", c.id);
        JsonKeyI64(out, n, "width", c.width);
        JsonKeyI64(out, n, "height", c.height);
        JsonKeyI64(out, n, "assetWidth", c.assetWidth);
        JsonKeyI64(out, n, "assetHeight", c.assetHeight);
        JsonKeyI64(out, n, "expandedWidth", c.expandedWidth);
        JsonKeyI64(out, n, "expandedHeight", c.expandedHeight);
        JsonKeyString(out, n, "apiFramework", c.apiFramework);
        JsonKeyString(out, n, "adSlotId", c.adSlotId);
        JsonKeyString(out, n, "pxratio", c.pxratio);
        JsonKeyString(out, n, "renderingMode", c.renderingMode);
        Resources(out, n, c.resources);
        JsonKeyString(out, n, "adParameters", c.adParameters);
        JsonKeyString(out, n, "altText", c.altText);
        JsonKeyString(out, n, "clickThrough", c.clickThrough);
        Urls(out, n, "clickTrackings", c.clickTrackings);
        Tracking(out, n, c.trackingCount, c.trackingEvents);
    });
    o.End();
}

}  // namespace

void JsonAdExtras(FILE* out, JsonBlock& parent, const KaAdExtras* e) {
    parent.Key("extras");
    if (e == nullptr) {
        fputs("null", out);
        return;
    }
    JsonBlock o(out, parent.Inner(), '{');
    JsonKeyString(out, o, "adType", e->adType);
    JsonKeyString(out, o, "adServingId", e->adServingId);
    Categories(out, o, "categories", e->categories);
    Categories(out, o, "blockedAdCategories", e->blockedAdCategories);
    o.Key("pricing");
    if (e->pricing == nullptr) {
        fputs("null", out);
    } else {
        JsonBlock p(out, o.Inner(), '{');
        JsonKeyString(out, p, "model", e->pricing->model);
        JsonKeyString(out, p, "currency", e->pricing->currency);
        JsonKeyString(out, p, "value", e->pricing->value);
        p.End();
    }
    JsonKeyI64(out, o, "expires", e->expires);
    Urls(out, o, "viewable", e->viewable);
    Urls(out, o, "notViewable", e->notViewable);
    Urls(out, o, "viewUndetermined", e->viewUndetermined);
    List(out, o, "verifications", e->verifications, [out](JsonBlock& v, const KaVerification& x) {
        JsonKeyString(out, v, "vendor", x.vendor);
        Scripts(out, v, "javaScriptResources", x.javaScriptResources);
        Scripts(out, v, "executableResources", x.executableResources);
        JsonKeyString(out, v, "verificationParameters", x.verificationParameters);
        Tracking(out, v, x.trackingCount, x.trackingEvents);
    });
    JsonKeyI64(out, o, "followAdditionalWrappers", e->followAdditionalWrappers);
    JsonKeyI64(out, o, "allowMultipleAds", e->allowMultipleAds);
    JsonKeyI64(out, o, "fallbackOnNoAd", e->fallbackOnNoAd);
    o.End();
}

void JsonCreativeExtras(FILE* out, JsonBlock& parent, const KaCreativeExtras* e) {
    parent.Key("extras");
    if (e == nullptr) {
        fputs("null", out);
        return;
    }
    JsonBlock o(out, parent.Inner(), '{');
    List(out, o, "universalAdIds", e->universalAdIds,
         [out](JsonBlock& u, const KaUniversalAdId& id) {
             JsonKeyString(out, u, "idRegistry", id.idRegistry);
             JsonKeyString(out, u, "idValue", id.idValue);
             JsonKeyString(out, u, "value", id.value);
         });
    JsonKeyString(out, o, "apiFramework", e->apiFramework);
    JsonKeyString(out, o, "legacyAdId", e->legacyAdId);
    Icons(out, o, e->icons);
    Assets(out, o, "mezzanines", e->mezzanines);
    Assets(out, o, "interactiveFiles", e->interactiveFiles);
    Assets(out, o, "closedCaptionFiles", e->closedCaptionFiles);
    List(out, o, "mediaFiles", e->mediaFiles, [out](JsonBlock& m, const KaMediaFileExtras& f) {
        JsonKeyString(out, m, "url", f.mediaFile != nullptr ? f.mediaFile->url : nullptr);
        JsonKeyI64(out, m, "fileSize", f.fileSize);
        JsonKeyString(out, m, "mediaType", f.mediaType);
        JsonKeyString(out, m, "apiFramework", f.apiFramework);
    });
    NonLinearAds(out, o, e->nonLinearAds);
    CompanionAds(out, o, e->companionAds);
    o.End();
}

namespace {

// The JSON of print, as indented "key: value" lines: only the values that are set (no null, no
// empty list or object), list items marked "-".
template <typename Print>
void AsText(FILE* out, int level, Print print) {
    char* text = nullptr;
    size_t length = 0;
    FILE* memory = open_memstream(&text, &length);
    if (memory == nullptr) return;
    {
        JsonBlock root(memory, 0, '{');
        print(memory, root);
        root.End();
    }
    fclose(memory);
    const char* line = text;
    bool item = false;  // the next line opens an item of a list
    while (line != nullptr && *line != '\0') {
        const char* end = strchr(line, '\n');
        std::string s(line, end != nullptr ? static_cast<size_t>(end - line) : strlen(line));
        line = end != nullptr ? end + 1 : nullptr;
        const size_t indent = s.find_first_not_of(' ');
        if (indent == std::string::npos) continue;
        std::string body = s.substr(indent);
        if (!body.empty() && body.back() == ',') body.pop_back();
        // A "{" of its own opens a list item; objects under a key open on the key's line.
        if (body == "{" && indent > 0) item = true;
        if (body == "{" || body == "}" || body == "]" || body == "[" || body == "[]") continue;
        const size_t colon = body.find("\": ");
        if (body[0] == '"' && colon != std::string::npos) {
            std::string value = body.substr(colon + 3);
            if (value == "null" || value == "[]" || value == "{}") continue;
            body = body.substr(1, colon - 1) + ":" +
                   (value == "{" || value == "[" ? std::string() : " " + value);
        }
        Indent(out, level + static_cast<int>(indent / 2) - 1);
        fprintf(out, "%s%s\n", item ? "- " : "", body.c_str());
        item = false;
    }
    free(text);
}

}  // namespace

void PrintAdExtras(FILE* out, int level, const KaAdExtras* extras) {
    if (extras == nullptr) return;
    AsText(out, level,
           [extras](FILE* memory, JsonBlock& root) { JsonAdExtras(memory, root, extras); });
}

void PrintCreativeExtras(FILE* out, int level, const KaCreativeExtras* extras) {
    if (extras == nullptr) return;
    AsText(out, level,
           [extras](FILE* memory, JsonBlock& root) { JsonCreativeExtras(memory, root, extras); });
}
