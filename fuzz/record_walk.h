// Reads every record a Process left behind, the way a player would: follows each list to its
// end, reads each string to its terminator and checks the counts against the lists. Under
// AddressSanitizer a dangling or unterminated record shows here instead of in a player.
// Header-only: the fuzz targets and the regression test share it.
#pragma once

#include <cstdint>
#include <cstring>

#include "ka/vmap_parser_api.h"
#include "ka/vmap_parser_ext.h"

namespace kawalk {

// A summary that depends on every byte read, so the reads cannot be optimised away.
struct Walk {
    const VMAPParserAPI* api = nullptr;
    // The second table and the handle, for the extras of each ad and creative; may be null.
    const VMAPParserExtAPI* ext = nullptr;
    void* handle = nullptr;
    uint64_t sum = 0;
    uint64_t records = 0;
    uint64_t nestedDocuments = 0;  // wrapped documents reached through nested parsers
    bool countsAgree = true;       // false when a count field disagrees with its list

    void Text(const char* text) {
        if (text == nullptr) return;
        sum += strlen(text);
    }

    template <typename Record>
    uint32_t Count(const Record* first) {
        uint32_t n = 0;
        for (; first != nullptr; first = first->next) ++n;
        return n;
    }

    void Check(uint32_t expected, uint32_t actual) {
        if (expected != actual) countsAgree = false;
    }

    void Clicks(const AdClick* click) {
        for (; click != nullptr; click = click->next) {
            ++records;
            Text(click->id);
            Text(click->url);
        }
    }

    void Linear(const AdLinear& linear) {
        sum += linear.duration + static_cast<uint64_t>(linear.skipOffset);
        Check(linear.mediaFileCount, Count(linear.mediaFiles));
        for (const AdMediaFile* m = linear.mediaFiles; m != nullptr; m = m->next) {
            ++records;
            Text(m->type);
            Text(m->codec);
            Text(m->url);
            sum += static_cast<uint32_t>(m->width + m->height + m->bitrate) + m->delivery;
        }
        for (const AdVideoClicks* v = linear.videoClicks; v != nullptr; v = v->next) {
            ++records;
            Check(v->clickThroughCount, Count(v->clickThroughs));
            Check(v->clickTrackingCount, Count(v->clickTrackings));
            Check(v->customClickCount, Count(v->customClicks));
            Clicks(v->clickThroughs);
            Clicks(v->clickTrackings);
            Clicks(v->customClicks);
        }
        for (const AdParameters* p = linear.adParameters; p != nullptr; p = p->next) ++records;
        Check(linear.trackingCount, Count(linear.trackingEvents));
        for (const AdTracking* t = linear.trackingEvents; t != nullptr; t = t->next) {
            ++records;
            Text(t->event);
            Text(t->url);
            sum += t->offsetKind + static_cast<uint64_t>(t->offset);
        }
        for (const AdIcon* i = linear.icons; i != nullptr; i = i->next) ++records;
    }

    void Creatives(const AdCreative* creative) {
        for (; creative != nullptr; creative = creative->next) {
            ++records;
            Text(creative->id);
            Text(creative->adId);
            if (creative->kind == AD_CREATIVE_LINEAR) Linear(creative->content);
            CreativeExtras(creative);
        }
    }

    // Lists whose nodes hold a url (and maybe more strings read by the caller's lambda).
    template <typename Record, typename Each>
    void List(const Record* first, Each each) {
        for (; first != nullptr; first = first->next) {
            ++records;
            each(*first);
        }
    }
    void Urls(const KaUrl* list) {
        List(list, [this](const KaUrl& u) { Text(u.id), Text(u.url); });
    }
    void Resources(const KaResource* list) {
        List(list, [this](const KaResource& r) { Text(r.creativeType), Text(r.content); });
    }
    void Tracking(uint32_t count, const AdTracking* list) {
        Check(count, Count(list));
        List(list, [this](const AdTracking& t) { Text(t.event), Text(t.url); });
    }

    void AdExtras(const AdData* ad) {
        const KaAdExtras* e = nullptr;
        if (ext == nullptr || ext->GetAdExtras(handle, ad, &e) != 0 || e == nullptr) return;
        Text(e->adType);
        Text(e->adServingId);
        List(e->categories, [this](const KaCategory& c) { Text(c.authority), Text(c.code); });
        List(e->blockedAdCategories, [this](const KaCategory& c) { Text(c.code); });
        if (e->pricing != nullptr) Text(e->pricing->value);
        Urls(e->viewable);
        Urls(e->notViewable);
        Urls(e->viewUndetermined);
        List(e->verifications, [this](const KaVerification& v) {
            Text(v.vendor);
            Text(v.verificationParameters);
            for (const KaVerificationResource* r : {v.javaScriptResources, v.executableResources})
                List(r, [this](const KaVerificationResource& x) { Text(x.type), Text(x.url); });
            Tracking(v.trackingCount, v.trackingEvents);
        });
    }

    void CreativeExtras(const AdCreative* creative) {
        const KaCreativeExtras* e = nullptr;
        if (ext == nullptr || ext->GetCreativeExtras(handle, creative, &e) != 0 || e == nullptr)
            return;
        List(e->universalAdIds, [this](const KaUniversalAdId& u) { Text(u.value); });
        Text(e->apiFramework);
        Text(e->legacyAdId);
        List(e->icons, [this](const KaIcon& i) {
            Text(i.program), Text(i.clickThrough), Resources(i.resources);
            Urls(i.clickTrackings), Urls(i.viewTrackings);
            List(i.fallbackImages, [this](const KaFallbackImage& f) { Text(f.url); });
        });
        for (const KaMediaAsset* list : {e->mezzanines, e->interactiveFiles, e->closedCaptionFiles})
            List(list, [this](const KaMediaAsset& a) { Text(a.type), Text(a.url); });
        List(e->mediaFiles, [this](const KaMediaFileExtras& m) { Text(m.mediaType); });
        if (const KaNonLinearAds* n = e->nonLinearAds) {
            Tracking(n->trackingCount, n->trackingEvents);
            List(n->nonLinears, [this](const KaNonLinear& x) {
                Text(x.id), Text(x.adParameters), Resources(x.resources), Urls(x.clickTrackings);
            });
        }
        if (const KaCompanionAds* c = e->companionAds) {
            Text(c->required);
            List(c->companions, [this](const KaCompanion& x) {
                Text(x.adSlotId), Text(x.altText), Resources(x.resources), Urls(x.clickTrackings);
                Tracking(x.trackingCount, x.trackingEvents);
            });
        }
    }

    // Each ad's chain outcome; the ad it names must be a live record.
    void Outcomes() {
        KaChainOutcome* o = nullptr;
        if (ext == nullptr || ext->GetChainOutcomes(handle, &o) != 0) return;
        List(o, [this](const KaChainOutcome& x) {
            Text(x.ad->id);
            for (uint32_t i = 0; i < x.hopCount; ++i) Text(x.hops[i].url), Text(x.hops[i].finalUrl);
            for (uint32_t i = 0; i < x.errorUrlCount; ++i) Text(x.errorUrls[i]);
        });
    }

    void Impressions(const AdImpression* impression) {
        for (; impression != nullptr; impression = impression->next) {
            ++records;
            Text(impression->url);
        }
    }

    // depth bounds the walk into wrapped documents; the library bounds the chain itself.
    void Vast(const VastAdData* data, int depth) {
        if (data == nullptr) return;
        // adCount counts <Ad> elements, not list records: nothing to compare it with.
        Text(data->errorUrl);
        for (const AdData* ad = data->firstAd; ad != nullptr; ad = ad->next) {
            ++records;
            Text(ad->id);
            AdExtras(ad);
            if (ad->body == nullptr) continue;
            if (ad->type == AD_TYPE_INLINE) {
                const AdInLine* in = static_cast<const AdInLine*>(ad->body);
                Text(in->adSystem);
                Text(in->adTitle);
                Text(in->description);
                Text(in->advertiser);
                Text(in->survey);
                Text(in->error);
                Check(in->creativeCount, Count(in->creatives));
                Impressions(in->impressions);
                Creatives(in->creatives);
            } else if (ad->type == AD_TYPE_WRAPPER) {
                const AdWrapper* w = static_cast<const AdWrapper*>(ad->body);
                Text(w->adSystem);
                Text(w->vastAdTagUri);
                Text(w->error);
                Impressions(w->impressions);
                Creatives(w->creatives);
                if (w->nestedParser != nullptr && depth < 16 && api != nullptr) {
                    VastAdData* nested = nullptr;
                    api->GetVastParserVastAdData(w->nestedParser, &nested);
                    ++nestedDocuments;
                    Vast(nested, depth + 1);
                }
            }
        }
    }

    void Vmap(const AdInfo* info) {
        if (info == nullptr) return;
        Check(info->adBreakCount, Count(info->adBreaks));
        for (const AdBreak* b = info->adBreaks; b != nullptr; b = b->next) {
            ++records;
            Text(b->breakId);
            sum += b->timeOffsetType + static_cast<uint64_t>(b->timeOffset) + b->breakType +
                   b->repeatAfter + b->linearDuration;
            if (const AdSource* s = b->adSource) {
                Text(s->adTagUri);
                Text(s->reservedText);
                Vast(s->vastAdData, 0);
            }
            for (const AdBreakTracking* t = b->trackings; t != nullptr; t = t->next) {
                ++records;
                Text(t->event);
                Text(t->url);
            }
        }
    }
};

// Everything a handle lends after a Process: its AdInfo, its VAST container and content URI,
// and through the second table (when given) the extras and the chain outcomes.
inline Walk WalkHandle(const VMAPParserAPI& api, void* handle,
                       const VMAPParserExtAPI* ext = nullptr) {
    Walk walk;
    walk.api = &api;
    walk.ext = ext;
    walk.handle = handle;
    AdInfo* info = nullptr;
    api.GetAdInfo(handle, &info);
    walk.Vmap(info);
    VastAdData* data = nullptr;
    api.GetVastAdData(handle, &data);
    walk.Vast(data, 0);
    char* contentUri = nullptr;
    api.GetParam(handle, KA_PID_VMAP_CONTENT_URI, &contentUri);
    walk.Text(contentUri);
    walk.Outcomes();
    return walk;
}

}  // namespace kawalk
