#include "printer.h"

#include <cinttypes>
#include <cstdlib>
#include <cstring>

#include "extras_printer.h"
#include "json_block.h"
#include "ka/result_codes.h"
#include "result_text.h"

namespace {

// Lists are walked at most as far as their count says, like the library does.
template <typename Record, typename Visit>
void ForEach(const Record* first, uint32_t limit, Visit visit) {
    const Record* record = first;
    for (uint32_t i = 0; i < limit && record != nullptr; ++i, record = record->next) {
        visit(*record, i);
    }
}

template <typename Record, typename Visit>
void ForEach(const Record* first, Visit visit) {
    uint32_t i = 0;
    for (const Record* record = first; record != nullptr; record = record->next) {
        visit(*record, i++);
    }
}

const char* OrDash(const char* text) { return text != nullptr ? text : "-"; }

// The records of a wrapper's nested parser look their extras up on that parser.
ProcessResult Nested(const ProcessResult& result, const AdWrapper& wrapper) {
    ProcessResult nested = result;
    nested.handle = wrapper.nestedParser;
    nested.nestedOwner = true;
    return nested;
}

const KaAdExtras* AdExtrasOf(const ProcessResult& result, const AdData& ad) {
    const KaAdExtras* extras = nullptr;
    (result.nestedOwner ? result.extrasApi->GetNestedAdExtras : result.extrasApi->GetAdExtras)(
        result.handle, &ad, &extras);
    return extras;
}

const KaCreativeExtras* CreativeExtrasOf(const ProcessResult& result, const AdCreative& c) {
    const KaCreativeExtras* extras = nullptr;
    (result.nestedOwner ? result.extrasApi->GetNestedCreativeExtras
                        : result.extrasApi->GetCreativeExtras)(result.handle, &c, &extras);
    return extras;
}

void PrintBreakType(FILE* out, uint32_t flags) {
    static const struct {
        uint32_t flag;
        const char* name;
    } kNames[] = {{BREAK_TYPE_LINEAR, "linear"},
                  {BREAK_TYPE_NONLINEAR, "nonlinear"},
                  {BREAK_TYPE_COMPANION, "Companion"},
                  {BREAK_TYPE_SKIPPABLE, "Skippable"},
                  {BREAK_TYPE_ADPODS, "AdPods"}};
    const char* separator = "";
    for (const auto& entry : kNames) {
        if ((flags & entry.flag) == 0) continue;
        fprintf(out, "%s%s", separator, entry.name);
        separator = ",";
    }
    fprintf(out, "%s(%" PRIu32 ")\n", *separator != '\0' ? " " : "none ", flags);
}

void PrintClock(FILE* out, uint64_t ms) {
    fprintf(out, "%02" PRIu64 ":%02" PRIu64 ":%02" PRIu64 ".%03" PRIu64, ms / 3600000,
            ms / 60000 % 60, ms / 1000 % 60, ms % 1000);
}

void PrintTimeOffset(FILE* out, const AdBreak& adBreak) {
    switch (adBreak.timeOffsetType) {
        case TIME_OFFSET_CLOCK:
            PrintClock(out, static_cast<uint64_t>(adBreak.timeOffset));
            fprintf(out, " (%" PRId64 " ms)\n", adBreak.timeOffset);
            break;
        case TIME_OFFSET_PERCENT:
            fprintf(out, "%" PRId64 "%%\n", adBreak.timeOffset);
            break;
        case TIME_OFFSET_START_END:
            fprintf(out, "%s\n", adBreak.timeOffset == 0 ? "start" : "end");
            break;
        case TIME_OFFSET_POSITION:
            fprintf(out, "position #%" PRId64 "\n", adBreak.timeOffset);
            break;
        default:
            fprintf(out, "none\n");
            break;
    }
}

const char* TypeName(uint32_t type) {
    switch (type) {
        case AD_TYPE_INLINE:
            return "InLine";
        case AD_TYPE_WRAPPER:
            return "Wrapper";
        default:
            return "unknown";
    }
}

}  // namespace

void Indent(FILE* out, int level) {
    for (int i = 0; i < level; ++i) fputs("  ", out);
}

namespace {

void PrintImpressions(FILE* out, int level, const AdImpression* impressions) {
    ForEach(impressions, [out, level](const AdImpression& impression, uint32_t) {
        Indent(out, level);
        fprintf(out, "impression: %s\n", OrDash(impression.url));
    });
}

void PrintClicks(FILE* out, int level, const char* what, const AdClick* clicks, uint32_t count) {
    ForEach(clicks, count, [out, level, what](const AdClick& click, uint32_t) {
        Indent(out, level);
        fprintf(out, "%s", what);
        if (click.id != nullptr) fprintf(out, " [%s]", click.id);
        fprintf(out, ": %s\n", OrDash(click.url));
    });
}

void PrintLinear(FILE* out, int level, const AdLinear& linear) {
    Indent(out, level);
    fputs("duration: ", out);
    PrintClock(out, linear.duration);
    fprintf(out, " (%" PRIu64 " ms), skip offset: ", linear.duration);
    if (linear.skipOffset < 0) {
        fputs("-\n", out);
    } else {
        fprintf(out, "%" PRId64 " ms\n", linear.skipOffset);
    }
    ForEach(linear.mediaFiles, linear.mediaFileCount,
            [out, level](const AdMediaFile& file, uint32_t i) {
                Indent(out, level);
                fprintf(out,
                        "media file %" PRIu32 ": %s %s %" PRId32 "x%" PRId32 ", id %" PRId32
                        ", codec %s, bitrate %" PRId32 " (min %" PRId32 ", max %" PRId32
                        "), scalable %" PRId32 ", maintainAspectRatio %" PRId32 "\n",
                        i + 1, file.delivery == AD_DELIVERY_STREAMING ? "streaming" : "progressive",
                        OrDash(file.type), file.width, file.height, file.id, OrDash(file.codec),
                        file.bitrate, file.minBitrate, file.maxBitrate, file.scalable,
                        file.maintainAspectRatio);
                Indent(out, level + 1);
                fprintf(out, "%s\n", OrDash(file.url));
            });
    if (linear.videoClicks != nullptr && linear.videoClicksCount != 0) {
        const AdVideoClicks& clicks = *linear.videoClicks;
        PrintClicks(out, level, "click through", clicks.clickThroughs, clicks.clickThroughCount);
        PrintClicks(out, level, "click tracking", clicks.clickTrackings, clicks.clickTrackingCount);
        PrintClicks(out, level, "custom click", clicks.customClicks, clicks.customClickCount);
    }
    if (linear.adParametersCount != 0) {
        Indent(out, level);
        fputs("ad parameters: present\n", out);
    }
    ForEach(linear.trackingEvents, linear.trackingCount,
            [out, level](const AdTracking& tracking, uint32_t) {
                Indent(out, level);
                fprintf(out, "tracking %s", OrDash(tracking.event));
                if (tracking.offsetKind == AD_OFFSET_TIME) {
                    fprintf(out, " at %" PRId64 " ms", tracking.offset);
                } else if (tracking.offsetKind == AD_OFFSET_PERCENT) {
                    fprintf(out, " at %" PRId64 "%%", tracking.offset);
                }
                fprintf(out, ": %s\n", OrDash(tracking.url));
            });
}

void PrintCreatives(FILE* out, int level, const AdCreative* creatives,
                    const ProcessResult& result) {
    ForEach(creatives, [out, level, &result](const AdCreative& creative, uint32_t i) {
        Indent(out, level);
        fprintf(out, "creative %" PRIu32 ": id %s, sequence %" PRId32 ", adId %s, %s\n", i + 1,
                OrDash(creative.id), creative.sequence, OrDash(creative.adId),
                creative.kind == AD_CREATIVE_LINEAR ? "linear" : "not read");
        if (creative.kind == AD_CREATIVE_LINEAR) PrintLinear(out, level + 1, creative.content);
        if (result.extrasApi != nullptr) {
            const KaCreativeExtras* extras = CreativeExtrasOf(result, creative);
            PrintCreativeExtras(out, level + 1, extras);
        }
    });
}

void PrintVast(FILE* out, int level, const VastAdData& data, const ProcessResult& result,
               unsigned int nesting);

void PrintInLine(FILE* out, int level, const AdInLine& inLine, const ProcessResult& result) {
    const struct {
        const char* label;
        const char* value;
    } kTexts[] = {{"ad system", inLine.adSystem},      {"title", inLine.adTitle},
                  {"description", inLine.description}, {"advertiser", inLine.advertiser},
                  {"survey", inLine.survey},           {"error", inLine.error}};
    for (const auto& text : kTexts) {
        if (text.value == nullptr) continue;
        Indent(out, level);
        fprintf(out, "%s: %s\n", text.label, text.value);
    }
    Indent(out, level);
    fprintf(out, "%" PRIu32 " impressions, %" PRIu32 " creatives%s\n", inLine.impressionCount,
            inLine.creativeCount, inLine.extensions != nullptr ? ", extensions" : "");
    PrintImpressions(out, level, inLine.impressions);
    PrintCreatives(out, level, inLine.creatives, result);
}

void PrintWrapper(FILE* out, int level, const AdWrapper& wrapper, const ProcessResult& result,
                  unsigned int nesting) {
    Indent(out, level);
    fprintf(out, "ad system: %s\n", OrDash(wrapper.adSystem));
    Indent(out, level);
    fprintf(out, "VAST ad tag URI: %s\n", OrDash(wrapper.vastAdTagUri));
    if (wrapper.error != nullptr) {
        Indent(out, level);
        fprintf(out, "error: %s\n", wrapper.error);
    }
    if (wrapper.extensions != nullptr) {
        Indent(out, level);
        fputs("extensions: present\n", out);
    }
    PrintImpressions(out, level, wrapper.impressions);
    PrintCreatives(out, level, wrapper.creatives, result);
    if (wrapper.nestedParser == nullptr || result.nestedVast == nullptr) return;
    Indent(out, level);
    VastAdData* nested = nullptr;
    if (nesting >= kMaxPrintedNesting ||
        result.nestedVast(wrapper.nestedParser, &nested) != KA_OK || nested == nullptr) {
        fputs("wrapped document: not shown\n", out);
        return;
    }
    fputs("wrapped document:\n", out);
    PrintVast(out, level + 1, *nested, Nested(result, wrapper), nesting + 1);
}

void PrintVast(FILE* out, int level, const VastAdData& data, const ProcessResult& result,
               unsigned int nesting) {
    Indent(out, level);
    fprintf(out, "VAST: %" PRIu32 " ads, depth %" PRIu32 ", error URL %s\n", data.adCount,
            data.depth, OrDash(data.errorUrl));
    // Every ad of the list: a merge may have put more ads in it than the document had.
    ForEach(data.firstAd, [out, level, &result, nesting](const AdData& ad, uint32_t i) {
        Indent(out, level);
        fprintf(out, "ad %" PRIu32 ": id %s, sequence %" PRId32 ", %s\n", i + 1, OrDash(ad.id),
                ad.sequence, TypeName(ad.type));
        if (ad.body == nullptr) return;
        if (result.extrasApi != nullptr) {
            const KaAdExtras* extras = AdExtrasOf(result, ad);
            PrintAdExtras(out, level + 1, extras);
        }
        if (ad.type == AD_TYPE_INLINE) {
            PrintInLine(out, level + 1, *static_cast<const AdInLine*>(ad.body), result);
        } else if (ad.type == AD_TYPE_WRAPPER) {
            PrintWrapper(out, level + 1, *static_cast<const AdWrapper*>(ad.body), result, nesting);
        }
    });
}

// Length of the well-formed UTF-8 sequence at p (1 to 4), or 0 when the bytes there are not one;
// *bad then holds how many bytes make up the broken part (at least 1), all of which one U+FFFD
// replaces. Overlong forms, surrogates and code points above U+10FFFF are not well-formed.
size_t Utf8Sequence(const unsigned char* p, size_t* bad) {
    const unsigned char lead = p[0];
    size_t length = 0;
    unsigned char low = 0x80;  // the range the second byte must lie in
    unsigned char high = 0xbf;
    if (lead < 0x80) return 1;
    if (lead >= 0xc2 && lead <= 0xdf) {
        length = 2;
    } else if (lead >= 0xe0 && lead <= 0xef) {
        length = 3;
        if (lead == 0xe0) low = 0xa0;   // overlong below U+0800
        if (lead == 0xed) high = 0x9f;  // surrogates
    } else if (lead >= 0xf0 && lead <= 0xf4) {
        length = 4;
        if (lead == 0xf0) low = 0x90;   // overlong below U+10000
        if (lead == 0xf4) high = 0x8f;  // above U+10FFFF
    } else {
        *bad = 1;
        return 0;
    }
    for (size_t i = 1; i < length; ++i) {
        const unsigned char lowest = i == 1 ? low : 0x80;
        const unsigned char highest = i == 1 ? high : 0xbf;
        if (p[i] < lowest || p[i] > highest) {  // the terminator ends a sequence here too
            *bad = i;
            return 0;
        }
    }
    return length;
}

// JSON strings: quotes, backslashes and control characters escaped, well-formed UTF-8 as it is,
// and each broken UTF-8 sequence replaced by U+FFFD, so that the output is valid JSON whatever
// bytes the document held.
}  // namespace

void JsonString(FILE* out, const char* text) {
    if (text == nullptr) {
        fputs("null", out);
        return;
    }
    fputc('"', out);
    for (const unsigned char* p = reinterpret_cast<const unsigned char*>(text); *p;) {
        size_t bad = 0;
        const size_t length = Utf8Sequence(p, &bad);
        if (length == 0) {
            fputs("\xef\xbf\xbd", out);  // U+FFFD
            p += bad;
            continue;
        }
        if (length > 1) {
            fwrite(p, 1, length, out);
            p += length;
            continue;
        }
        switch (*p) {
            case '"':
                fputs("\\\"", out);
                break;
            case '\\':
                fputs("\\\\", out);
                break;
            case '\n':
                fputs("\\n", out);
                break;
            case '\r':
                fputs("\\r", out);
                break;
            case '\t':
                fputs("\\t", out);
                break;
            default:
                if (*p < 0x20) {
                    fprintf(out, "\\u%04x", *p);
                } else {
                    fputc(*p, out);
                }
        }
        ++p;
    }
    fputc('"', out);
}

namespace {

// One JSON object or array whose members go on lines of their own; level is the indentation
// of the line that holds the opening bracket. An empty one prints as {} or [].
// The extensions object belongs to the host that built it: only its presence is shown.
void JsonExtensions(FILE* out, JsonBlock& block, const CAdExtensions* extensions) {
    block.Key("extensions");
    fputs(extensions != nullptr ? "{}" : "null", out);
}

void JsonImpressions(FILE* out, JsonBlock& parent, const AdImpression* impressions) {
    parent.Key("impressions");
    JsonBlock list(out, parent.Inner(), '[');
    ForEach(impressions, [out, &list](const AdImpression& impression, uint32_t) {
        list.Item();
        fputs("{\"url\": ", out);
        JsonString(out, impression.url);
        fputc('}', out);
    });
    list.End();
}

void JsonClicks(FILE* out, JsonBlock& parent, const char* key, const AdClick* clicks,
                uint32_t count) {
    parent.Key(key);
    JsonBlock list(out, parent.Inner(), '[');
    ForEach(clicks, count, [out, &list](const AdClick& click, uint32_t) {
        list.Item();
        fputs("{\"id\": ", out);
        JsonString(out, click.id);
        fputs(", \"url\": ", out);
        JsonString(out, click.url);
        fputc('}', out);
    });
    list.End();
}

void JsonLinear(FILE* out, JsonBlock& parent, const AdLinear& linear) {
    parent.Key("content");
    JsonBlock o(out, parent.Inner(), '{');
    JsonKeyU64(out, o, "duration", linear.duration);
    JsonKeyI64(out, o, "skipOffset", linear.skipOffset);
    JsonKeyU64(out, o, "mediaFileCount", linear.mediaFileCount);
    o.Key("mediaFiles");
    JsonBlock files(out, o.Inner(), '[');
    ForEach(linear.mediaFiles, linear.mediaFileCount,
            [out, &files](const AdMediaFile& f, uint32_t) {
                files.Item();
                JsonBlock file(out, files.Inner(), '{');
                JsonKeyU64(out, file, "delivery", f.delivery);
                JsonKeyString(out, file, "type", f.type);
                JsonKeyI64(out, file, "width", f.width);
                JsonKeyI64(out, file, "height", f.height);
                JsonKeyString(out, file, "codec", f.codec);
                JsonKeyI64(out, file, "id", f.id);
                JsonKeyI64(out, file, "bitrate", f.bitrate);
                JsonKeyI64(out, file, "minBitrate", f.minBitrate);
                JsonKeyI64(out, file, "maxBitrate", f.maxBitrate);
                JsonKeyI64(out, file, "scalable", f.scalable);
                JsonKeyI64(out, file, "maintainAspectRatio", f.maintainAspectRatio);
                JsonKeyString(out, file, "url", f.url);
                file.End();
            });
    files.End();
    JsonKeyU64(out, o, "videoClicksCount", linear.videoClicksCount);
    o.Key("videoClicks");
    if (linear.videoClicks == nullptr) {
        fputs("null", out);
    } else {
        const AdVideoClicks& clicks = *linear.videoClicks;
        JsonBlock c(out, o.Inner(), '{');
        JsonKeyU64(out, c, "clickThroughCount", clicks.clickThroughCount);
        JsonClicks(out, c, "clickThroughs", clicks.clickThroughs, clicks.clickThroughCount);
        JsonKeyU64(out, c, "clickTrackingCount", clicks.clickTrackingCount);
        JsonClicks(out, c, "clickTrackings", clicks.clickTrackings, clicks.clickTrackingCount);
        JsonKeyU64(out, c, "customClickCount", clicks.customClickCount);
        JsonClicks(out, c, "customClicks", clicks.customClicks, clicks.customClickCount);
        c.End();
    }
    JsonKeyU64(out, o, "adParametersCount", linear.adParametersCount);
    o.Key("adParameters");
    JsonBlock parameters(out, o.Inner(), '[');
    ForEach(linear.adParameters, linear.adParametersCount,
            [out, &parameters](const AdParameters&, uint32_t) {
                parameters.Item();
                fputs("{}", out);
            });
    parameters.End();
    JsonKeyU64(out, o, "trackingCount", linear.trackingCount);
    o.Key("trackingEvents");
    JsonBlock trackings(out, o.Inner(), '[');
    ForEach(linear.trackingEvents, linear.trackingCount,
            [out, &trackings](const AdTracking& t, uint32_t) {
                trackings.Item();
                fputs("{\"event\": ", out);
                JsonString(out, t.event);
                fprintf(out, ", \"offsetKind\": %" PRIu32 ", \"offset\": %" PRId64 ", \"url\": ",
                        t.offsetKind, t.offset);
                JsonString(out, t.url);
                fputc('}', out);
            });
    trackings.End();
    JsonKeyU64(out, o, "iconCount", linear.iconCount);
    o.Key("icons");
    JsonBlock icons(out, o.Inner(), '[');
    ForEach(linear.icons, linear.iconCount, [out, &icons](const AdIcon&, uint32_t) {
        icons.Item();
        fputs("{}", out);
    });
    icons.End();
    o.End();
}

void JsonCreatives(FILE* out, JsonBlock& parent, const AdCreative* creatives,
                   const ProcessResult& result) {
    parent.Key("creatives");
    JsonBlock list(out, parent.Inner(), '[');
    ForEach(creatives, [out, &list, &result](const AdCreative& creative, uint32_t) {
        list.Item();
        JsonBlock o(out, list.Inner(), '{');
        JsonKeyString(out, o, "id", creative.id);
        JsonKeyI64(out, o, "sequence", creative.sequence);
        JsonKeyString(out, o, "adId", creative.adId);
        JsonKeyU64(out, o, "kind", creative.kind);
        JsonLinear(out, o, creative.content);
        if (result.extrasApi != nullptr) {
            const KaCreativeExtras* extras = CreativeExtrasOf(result, creative);
            JsonCreativeExtras(out, o, extras);
        }
        o.End();
    });
    list.End();
}

void JsonVast(FILE* out, const VastAdData* data, int level, const ProcessResult& result,
              unsigned int nesting);

void JsonBody(FILE* out, JsonBlock& parent, const AdData& ad, const ProcessResult& result,
              unsigned int nesting) {
    parent.Key("body");
    if (ad.body == nullptr || (ad.type != AD_TYPE_INLINE && ad.type != AD_TYPE_WRAPPER)) {
        fputs("null", out);
        return;
    }
    JsonBlock o(out, parent.Inner(), '{');
    if (ad.type == AD_TYPE_INLINE) {
        const AdInLine& inLine = *static_cast<const AdInLine*>(ad.body);
        JsonKeyString(out, o, "adSystem", inLine.adSystem);
        JsonKeyString(out, o, "adTitle", inLine.adTitle);
        JsonKeyU64(out, o, "impressionCount", inLine.impressionCount);
        JsonImpressions(out, o, inLine.impressions);
        JsonKeyString(out, o, "description", inLine.description);
        JsonKeyString(out, o, "advertiser", inLine.advertiser);
        JsonKeyString(out, o, "survey", inLine.survey);
        JsonKeyString(out, o, "error", inLine.error);
        JsonExtensions(out, o, inLine.extensions);
        JsonKeyU64(out, o, "creativeCount", inLine.creativeCount);
        JsonCreatives(out, o, inLine.creatives, result);
    } else {
        const AdWrapper& wrapper = *static_cast<const AdWrapper*>(ad.body);
        JsonKeyString(out, o, "adSystem", wrapper.adSystem);
        JsonKeyString(out, o, "vastAdTagUri", wrapper.vastAdTagUri);
        JsonKeyString(out, o, "error", wrapper.error);
        JsonImpressions(out, o, wrapper.impressions);
        JsonCreatives(out, o, wrapper.creatives, result);
        JsonExtensions(out, o, wrapper.extensions);
        // A nested parser is shown by the container it lends through the table.
        o.Key("nestedParser");
        VastAdData* nested = nullptr;
        if (wrapper.nestedParser == nullptr) {
            fputs("null", out);
        } else if (result.nestedVast == nullptr || nesting >= kMaxPrintedNesting ||
                   result.nestedVast(wrapper.nestedParser, &nested) != KA_OK || nested == nullptr) {
            fputs("\"not shown\"", out);
        } else {
            JsonVast(out, nested, o.Inner(), Nested(result, wrapper), nesting + 1);
        }
    }
    if (result.extrasApi != nullptr) {
        const KaAdExtras* extras = AdExtrasOf(result, ad);
        JsonAdExtras(out, o, extras);
    }
    o.End();
}

void JsonVast(FILE* out, const VastAdData* data, int level, const ProcessResult& result,
              unsigned int nesting) {
    if (data == nullptr) {
        fputs("null", out);
        return;
    }
    JsonBlock o(out, level, '{');
    JsonKeyU64(out, o, "adCount", data->adCount);
    o.Key("firstAd");
    JsonBlock ads(out, o.Inner(), '[');
    ForEach(data->firstAd, [out, &ads, &result, nesting](const AdData& ad, uint32_t) {
        ads.Item();
        JsonBlock a(out, ads.Inner(), '{');
        JsonKeyString(out, a, "id", ad.id);
        JsonKeyI64(out, a, "sequence", ad.sequence);
        JsonKeyU64(out, a, "type", ad.type);
        JsonBody(out, a, ad, result, nesting);
        a.End();
    });
    ads.End();
    JsonKeyString(out, o, "errorUrl", data->errorUrl);
    JsonKeyU64(out, o, "depth", data->depth);
    o.End();
}

void JsonSource(FILE* out, const AdSource* source, const ProcessResult& result) {
    if (source == nullptr) {
        fputs("null", out);
        return;
    }
    fprintf(out,
            "{\n        \"id\": %" PRId32 ",\n        \"allowMultipleAds\": %" PRId32
            ",\n        \"followRedirects\": %" PRId32 ",\n        \"adTagUri\": ",
            source->id, source->allowMultipleAds, source->followRedirects);
    JsonString(out, source->adTagUri);
    fputs(",\n        \"reservedText\": ", out);
    JsonString(out, source->reservedText);
    fputs(",\n        \"vastAdData\": ", out);
    JsonVast(out, source->vastAdData, 4, result, 0);
    fputs("\n      }", out);
}

void JsonBreak(FILE* out, const AdBreak& adBreak, const ProcessResult& result) {
    fprintf(out,
            "    {\n      \"timeOffsetType\": %" PRIu32 ",\n      \"timeOffset\": %" PRId64
            ",\n      \"linearDuration\": %" PRIu64 ",\n      \"breakType\": %" PRIu32
            ",\n      \"breakId\": ",
            adBreak.timeOffsetType, adBreak.timeOffset, adBreak.linearDuration, adBreak.breakType);
    JsonString(out, adBreak.breakId);
    fprintf(out,
            ",\n      \"repeatAfter\": %" PRIu64 ",\n      \"adSource\": ", adBreak.repeatAfter);
    JsonSource(out, adBreak.adSource, result);
    fputs(",\n      \"trackings\": [", out);
    ForEach(adBreak.trackings, [out](const AdBreakTracking& tracking, uint32_t i) {
        fputs(i == 0 ? "\n        {\"event\": " : ",\n        {\"event\": ", out);
        JsonString(out, tracking.event);
        fputs(", \"url\": ", out);
        JsonString(out, tracking.url);
        fputs("}", out);
    });
    fputs(adBreak.trackings != nullptr ? "\n      ]\n    }" : "]\n    }", out);
}

// The readable tree, document strings as they are.
void PrintTree(FILE* out, const ProcessResult& result) {
    if (result.contentUri != nullptr) fprintf(out, "content URI: %s\n", result.contentUri);
    const AdInfo* info = result.adInfo;
    const uint32_t count = info != nullptr ? info->adBreakCount : 0;
    if (!result.vastOnly) fprintf(out, "%" PRIu32 " ad break%s\n", count, count == 1 ? "" : "s");
    if (info != nullptr) {
        ForEach(info->adBreaks, count, [out, &result](const AdBreak& adBreak, uint32_t i) {
            fprintf(out, "break %" PRIu32 ": id %s\n", i + 1, OrDash(adBreak.breakId));
            fputs("  time offset: ", out);
            PrintTimeOffset(out, adBreak);
            fputs("  break type: ", out);
            PrintBreakType(out, adBreak.breakType);
            fputs("  repeat after: ", out);
            if (adBreak.repeatAfter != 0) {
                PrintClock(out, adBreak.repeatAfter);
                fputc('\n', out);
            } else {
                fputs("-\n", out);
            }
            fprintf(out, "  linear duration: %" PRIu64 " ms\n", adBreak.linearDuration);
            if (const AdSource* source = adBreak.adSource) {
                fprintf(out,
                        "  ad source: id %" PRId32 ", allowMultipleAds %" PRId32
                        ", followRedirects %" PRId32 "\n",
                        source->id, source->allowMultipleAds, source->followRedirects);
                fprintf(out, "    ad tag URI: %s\n", OrDash(source->adTagUri));
                if (source->vastAdData != nullptr) {
                    PrintVast(out, 2, *source->vastAdData, result, 0);
                }
            } else {
                fputs("  ad source: -\n", out);
            }
            ForEach(adBreak.trackings, [out](const AdBreakTracking& tracking, uint32_t) {
                fprintf(out, "  tracking %s: %s\n", OrDash(tracking.event), OrDash(tracking.url));
            });
        });
    }
    if (result.vastAdData == nullptr) return;
    // After a VMAP document the handle's container repeats the last inline VAST document.
    if (!result.vastOnly) fputs("handle's VAST container (the last inline document):\n", out);
    PrintVast(out, result.vastOnly ? 0 : 1, *result.vastAdData, result, 0);
}

// Each ad's chain: its outcome, its downloads as a tree (indented by depth), its Error URLs.
void PrintOutcomes(FILE* out, const KaChainOutcome* outcomes) {
    fputs("chain outcomes:\n", out);
    ForEach(outcomes, [out](const KaChainOutcome& o, uint32_t i) {
        fprintf(out, "  ad %" PRIu32 " (id %s): %s, VAST error %" PRIu32 " (%s)\n", i + 1,
                OrDash(o.ad != nullptr ? o.ad->id : nullptr), ChainStateText(o.state), o.vastError,
                ChainReasonText(o.reason));
        for (uint32_t h = 0; h < o.hopCount && o.hops != nullptr; ++h) {
            const KaChainHop& hop = o.hops[h];
            Indent(out, 1 + static_cast<int>(hop.depth < 16 ? hop.depth : 16));
            fprintf(out, "%s%s", hop.onPath != 0 ? "" : "(dropped) ", OrDash(hop.url));
            if (hop.finalUrl != nullptr && (hop.url == nullptr || strcmp(hop.url, hop.finalUrl)))
                fprintf(out, " -> %s", hop.finalUrl);
            fprintf(out, ": 0x%08" PRIx32 " (%s), %" PRIu64 " bytes, %" PRIu32 " ms\n", hop.result,
                    ResultText(hop.result), hop.bytes, hop.milliseconds);
        }
        for (uint32_t e = 0; e < o.errorUrlCount && o.errorUrls != nullptr; ++e) {
            fprintf(out, "    error URL: %s\n", OrDash(o.errorUrls[e]));
        }
    });
}

void JsonOutcomes(FILE* out, const KaChainOutcome* outcomes) {
    fputs(",\n  \"chainOutcomes\": ", out);
    JsonBlock list(out, 1, '[');
    ForEach(outcomes, [out, &list](const KaChainOutcome& o, uint32_t) {
        list.Item();
        JsonBlock a(out, list.Inner(), '{');
        JsonKeyString(out, a, "adId", o.ad != nullptr ? o.ad->id : nullptr);
        JsonKeyU64(out, a, "state", o.state);
        JsonKeyU64(out, a, "vastError", o.vastError);
        JsonKeyU64(out, a, "reason", o.reason);
        a.Key("hops");
        JsonBlock hops(out, a.Inner(), '[');
        for (uint32_t h = 0; h < o.hopCount && o.hops != nullptr; ++h) {
            const KaChainHop& hop = o.hops[h];
            hops.Item();
            fprintf(out, "{\"depth\": %" PRIu32 ", \"onPath\": %" PRIu32 ", \"url\": ", hop.depth,
                    hop.onPath);
            JsonString(out, hop.url);
            fputs(", \"finalUrl\": ", out);
            JsonString(out, hop.finalUrl);
            fprintf(out,
                    ", \"result\": %" PRIu32 ", \"bytes\": %" PRIu64 ", \"milliseconds\": %" PRIu32
                    "}",
                    hop.result, hop.bytes, hop.milliseconds);
        }
        hops.End();
        a.Key("errorUrls");
        JsonBlock urls(out, a.Inner(), '[');
        for (uint32_t e = 0; e < o.errorUrlCount && o.errorUrls != nullptr; ++e) {
            urls.Item();
            JsonString(out, o.errorUrls[e]);
        }
        urls.End();
        a.End();
    });
    list.End();
}

// Writes text to out with the control characters a terminal would act on shown as \xNN instead:
// C0 controls but the line break, DEL, and C1 controls encoded in UTF-8.
void WriteVisible(FILE* out, const char* text, size_t size) {
    const unsigned char* p = reinterpret_cast<const unsigned char*>(text);
    for (size_t i = 0; i < size; ++i) {
        const bool c1 = p[i] == 0xc2 && i + 1 < size && p[i + 1] >= 0x80 && p[i + 1] <= 0x9f;
        if ((p[i] < 0x20 && p[i] != '\n') || p[i] == 0x7f) {
            fprintf(out, "\\x%02x", p[i]);
        } else if (c1) {
            fprintf(out, "\\x%02x\\x%02x", p[i], p[i + 1]);
            ++i;
        } else {
            fputc(p[i], out);
        }
    }
}

}  // namespace

void PrintText(FILE* out, const ProcessResult& result) {
    // The tree goes to memory first so that every document string it holds passes the filter.
    char* text = nullptr;
    size_t size = 0;
    FILE* memory = open_memstream(&text, &size);
    if (memory == nullptr) {
        fputs("(out of memory)\n", out);
        return;
    }
    PrintTree(memory, result);
    if (result.trace) PrintOutcomes(memory, result.outcomes);
    fclose(memory);
    WriteVisible(out, text, size);
    free(text);
}

void PrintJson(FILE* out, const ProcessResult& result) {
    const AdInfo* info = result.adInfo;
    const uint32_t count = info != nullptr ? info->adBreakCount : 0;
    fputs("{\n  \"contentUri\": ", out);
    JsonString(out, result.contentUri);
    fprintf(out, ",\n  \"adBreakCount\": %" PRIu32 ",\n  \"adBreaks\": [", count);
    if (info != nullptr) {
        ForEach(info->adBreaks, count, [out, &result](const AdBreak& adBreak, uint32_t i) {
            fputs(i == 0 ? "\n" : ",\n", out);
            JsonBreak(out, adBreak, result);
        });
    }
    fputs(count != 0 ? "\n  ],\n  \"vastAdData\": " : "],\n  \"vastAdData\": ", out);
    JsonVast(out, result.vastAdData, 1, result, 0);
    if (result.trace) JsonOutcomes(out, result.outcomes);
    fputs("\n}\n", out);
}

ProcessResult ReadResult(const VMAPParserAPI& api, void* handle, bool vastOnly) {
    ProcessResult records = {};
    AdInfo* info = nullptr;
    api.GetAdInfo(handle, &info);
    records.adInfo = info;
    char* contentUri = nullptr;
    api.GetParam(handle, KA_PID_VMAP_CONTENT_URI, &contentUri);
    records.contentUri = contentUri;
    VastAdData* vast = nullptr;
    api.GetVastAdData(handle, &vast);
    records.vastAdData = vast;
    records.nestedVast = api.GetVastParserVastAdData;
    records.vastOnly = vastOnly;
    return records;
}
