#include "printer.h"

#include <cinttypes>

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

void PrintVastSummary(FILE* out, const char* indent, const VastAdData& data) {
    fprintf(out, "%sVAST: %" PRIu32 " ads, depth %" PRIu32 ", error URL %s\n", indent, data.adCount,
            data.depth, OrDash(data.errorUrl));
}

// JSON strings: quotes, backslashes and control characters escaped, other bytes as they are.
void JsonString(FILE* out, const char* text) {
    if (text == nullptr) {
        fputs("null", out);
        return;
    }
    fputc('"', out);
    for (const unsigned char* p = reinterpret_cast<const unsigned char*>(text); *p; ++p) {
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
    }
    fputc('"', out);
}

void JsonVast(FILE* out, const VastAdData* data) {
    if (data == nullptr) {
        fputs("null", out);
        return;
    }
    fprintf(out, "{\"adCount\": %" PRIu32 ", \"errorUrl\": ", data->adCount);
    JsonString(out, data->errorUrl);
    fprintf(out, ", \"depth\": %" PRIu32 "}", data->depth);
}

void JsonSource(FILE* out, const AdSource* source) {
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
    JsonVast(out, source->vastAdData);
    fputs("\n      }", out);
}

void JsonBreak(FILE* out, const AdBreak& adBreak) {
    fprintf(out,
            "    {\n      \"timeOffsetType\": %" PRIu32 ",\n      \"timeOffset\": %" PRId64
            ",\n      \"linearDuration\": %" PRIu64 ",\n      \"breakType\": %" PRIu32
            ",\n      \"breakId\": ",
            adBreak.timeOffsetType, adBreak.timeOffset, adBreak.linearDuration, adBreak.breakType);
    JsonString(out, adBreak.breakId);
    fprintf(out,
            ",\n      \"repeatAfter\": %" PRIu64 ",\n      \"adSource\": ", adBreak.repeatAfter);
    JsonSource(out, adBreak.adSource);
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

}  // namespace

void PrintText(FILE* out, const ProcessResult& result) {
    if (result.contentUri != nullptr) fprintf(out, "content URI: %s\n", result.contentUri);
    const AdInfo* info = result.adInfo;
    const uint32_t count = info != nullptr ? info->adBreakCount : 0;
    fprintf(out, "%" PRIu32 " ad break%s\n", count, count == 1 ? "" : "s");
    if (info != nullptr) {
        ForEach(info->adBreaks, count, [out](const AdBreak& adBreak, uint32_t i) {
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
                    PrintVastSummary(out, "    ", *source->vastAdData);
                }
            } else {
                fputs("  ad source: -\n", out);
            }
            ForEach(adBreak.trackings, [out](const AdBreakTracking& tracking, uint32_t) {
                fprintf(out, "  tracking %s: %s\n", OrDash(tracking.event), OrDash(tracking.url));
            });
        });
    }
    if (result.vastAdData != nullptr) PrintVastSummary(out, "", *result.vastAdData);
}

void PrintJson(FILE* out, const ProcessResult& result) {
    const AdInfo* info = result.adInfo;
    const uint32_t count = info != nullptr ? info->adBreakCount : 0;
    fputs("{\n  \"contentUri\": ", out);
    JsonString(out, result.contentUri);
    fprintf(out, ",\n  \"adBreakCount\": %" PRIu32 ",\n  \"adBreaks\": [", count);
    if (info != nullptr) {
        ForEach(info->adBreaks, count, [out](const AdBreak& adBreak, uint32_t i) {
            fputs(i == 0 ? "\n" : ",\n", out);
            JsonBreak(out, adBreak);
        });
    }
    fputs(count != 0 ? "\n  ],\n  \"vastAdData\": " : "],\n  \"vastAdData\": ", out);
    JsonVast(out, result.vastAdData);
    fputs("\n}\n", out);
}
