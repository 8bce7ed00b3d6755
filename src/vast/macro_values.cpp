// The VAST 4.x macro list and the spelling of each value. A field reads as unknown when it lies
// beyond the size the player's record declares, so a player built against a shorter record
// never has bytes read past its end.
#include "vast/macro_values.h"

#include <cinttypes>
#include <cstdio>
#include <cstring>
#include <ctime>

namespace ka {
namespace {

enum class Kind {
    kText,          // const char*, null for unknown
    kNumber,        // int32_t
    kClock,         // int64_t milliseconds, spelled HH:MM:SS.mmm
    kPair,          // two int32_t, spelled "a,b"
    kTimestamp,     // int64_t milliseconds since 1970 and the int32_t offset after it
    kCacheBusting,  // the call's random digits
};

struct Macro {
    const char* name;
    Kind kind;
    size_t field;   // offset in KaMacroValues
    size_t second;  // of the pair's second number
};

#define KA_FIELD(f) offsetof(KaMacroValues, f)
#define KA_TEXT(name, f) \
    { name, Kind::kText, KA_FIELD(f), 0 }
#define KA_NUMBER(name, f) \
    { name, Kind::kNumber, KA_FIELD(f), 0 }

const Macro kMacros[] = {
    {"CACHEBUSTING", Kind::kCacheBusting, 0, 0},
    {"TIMESTAMP", Kind::kTimestamp, KA_FIELD(timestampMs), KA_FIELD(utcOffsetMinutes)},
    KA_NUMBER("ERRORCODE", errorCode),
    KA_NUMBER("BREAKPOSITION", breakPosition),
    {"MEDIAPLAYHEAD", Kind::kClock, KA_FIELD(mediaPlayheadMs), 0},
    {"CONTENTPLAYHEAD", Kind::kClock, KA_FIELD(mediaPlayheadMs), 0},
    {"ADPLAYHEAD", Kind::kClock, KA_FIELD(adPlayheadMs), 0},
    KA_NUMBER("ADCOUNT", adCount),
    KA_NUMBER("PODSEQUENCE", podSequence),
    KA_NUMBER("BREAKMAXDURATION", breakMaxDuration),
    KA_NUMBER("BREAKMINDURATION", breakMinDuration),
    KA_NUMBER("BREAKMAXADLENGTH", breakMaxAdLength),
    KA_NUMBER("BREAKMINADLENGTH", breakMinAdLength),
    KA_NUMBER("BREAKMAXADS", breakMaxAds),
    KA_NUMBER("REASON", reason),
    KA_NUMBER("LIMITADTRACKING", limitAdTracking),
    KA_NUMBER("SERVERSIDE", serverSide),
    KA_NUMBER("PLACEMENTTYPE", placementType),
    KA_NUMBER("CLICKTYPE", clickType),
    {"PLAYERSIZE", Kind::kPair, KA_FIELD(playerWidth), KA_FIELD(playerHeight)},
    {"CLICKPOS", Kind::kPair, KA_FIELD(clickX), KA_FIELD(clickY)},
    KA_TEXT("ASSETURI", assetUri),
    KA_TEXT("CONTENTID", contentId),
    KA_TEXT("CONTENTURI", contentUri),
    KA_TEXT("IFA", ifa),
    KA_TEXT("IFATYPE", ifaType),
    KA_TEXT("CLIENTUA", clientUa),
    KA_TEXT("SERVERUA", serverUa),
    KA_TEXT("DEVICEUA", deviceUa),
    KA_TEXT("DEVICEIP", deviceIp),
    KA_TEXT("LATLONG", latLong),
    KA_TEXT("DOMAIN", domain),
    KA_TEXT("PAGEURL", pageUrl),
    KA_TEXT("APPBUNDLE", appBundle),
    KA_TEXT("STOREID", storeId),
    KA_TEXT("STOREURL", storeUrl),
    KA_TEXT("INVENTORYSTATE", inventoryState),
    KA_TEXT("PLAYERSTATE", playerState),
    KA_TEXT("PLAYERCAPABILITIES", playerCapabilities),
    KA_TEXT("REGULATIONS", regulations),
    KA_TEXT("GDPRCONSENT", gdprConsent),
    KA_TEXT("TRANSACTIONID", transactionId),
    KA_TEXT("UNIVERSALADID", universalAdId),
    KA_TEXT("ADSERVINGID", adServingId),
    KA_TEXT("ADTYPE", adType),
    KA_TEXT("ADCATEGORIES", adCategories),
    KA_TEXT("BLOCKEDADCATEGORIES", blockedAdCategories),
    KA_TEXT("APIFRAMEWORKS", apiFrameworks),
    KA_TEXT("EXTENSIONS", extensions),
    KA_TEXT("MEDIAMIME", mediaMime),
    KA_TEXT("VASTVERSIONS", vastVersions),
    KA_TEXT("VERIFICATIONVENDORS", verificationVendors),
    KA_TEXT("OMIDPARTNER", omidPartner),
};

#undef KA_NUMBER
#undef KA_TEXT
#undef KA_FIELD

// The field at offset as a T, or false when the player's record ends before it.
template <typename T>
bool Read(const KaMacroValues* values, size_t offset, T* out) {
    if (values == nullptr || values->size < offset + sizeof(T)) return false;
    memcpy(out, reinterpret_cast<const char*>(values) + offset, sizeof(T));
    return true;
}

// "-2" for a value that does not apply, "-1" for any other negative or missing one.
bool Sentinel(bool present, int64_t number, MacroValue* value) {
    if (present && number >= 0) return false;
    value->text = present && number == KA_MACRO_NOT_APPLICABLE ? "-2" : "-1";
    value->size = 2;
    return true;
}

void Spell(MacroValue* value, int written) {
    value->text = value->number;
    value->size = written > 0 ? static_cast<size_t>(written) : 0;
}

// Offsets past a day are no zone's: they read as the device's own.
constexpr int32_t kMaxOffsetMinutes = 24 * 60 - 1;
// The last millisecond of year 9999 UTC: years keep ISO 8601's four digits.
constexpr int64_t kLastTimestampMs = 253402300799999;

void SpellTimestamp(const KaMacroValues* values, const MacroCall& call, MacroValue* value) {
    int64_t ms = 0;
    if (!Read(values, offsetof(KaMacroValues, timestampMs), &ms) || ms == KA_MACRO_UNKNOWN ||
        (ms < 0 && ms != KA_MACRO_NOT_APPLICABLE)) {
        ms = call.nowMs;
    }
    int32_t offset = KA_MACRO_LOCAL_OFFSET;
    Read(values, offsetof(KaMacroValues, utcOffsetMinutes), &offset);
    if (Sentinel(true, ms, value)) return;
    if (offset < -kMaxOffsetMinutes || offset > kMaxOffsetMinutes) {
        const time_t seconds = static_cast<time_t>(ms / 1000);
        struct tm local = {};
        offset = localtime_r(&seconds, &local) != nullptr
                     ? static_cast<int32_t>(local.tm_gmtoff / 60)
                     : 0;
    }
    // Far-off times are checked before the shift, which could overflow otherwise.
    struct tm t = {};
    const int64_t shifted = ms <= kLastTimestampMs ? ms + int64_t{offset} * 60000 : -1;
    const time_t seconds = static_cast<time_t>(shifted / 1000 - (shifted % 1000 < 0 ? 1 : 0));
    if (ms > kLastTimestampMs || gmtime_r(&seconds, &t) == nullptr || t.tm_year + 1900 > 9999) {
        Sentinel(false, 0, value);
        return;
    }
    const int millis = static_cast<int>(shifted - int64_t{seconds} * 1000);
    const int32_t minutes = offset < 0 ? -offset : offset;
    Spell(value,
          snprintf(value->number, sizeof(value->number),
                   "%04d-%02d-%02dT%02d:%02d:%02d.%03d%c%02d:%02d", t.tm_year + 1900, t.tm_mon + 1,
                   t.tm_mday, t.tm_hour, t.tm_min, t.tm_sec, millis, offset < 0 ? '-' : '+',
                   static_cast<int>(minutes / 60), static_cast<int>(minutes % 60)));
}

void Fill(const Macro& macro, const KaMacroValues* values, const MacroCall& call,
          MacroValue* value) {
    switch (macro.kind) {
        case Kind::kText: {
            const char* text = nullptr;
            if (!Read(values, macro.field, &text) || text == nullptr) {
                Sentinel(false, 0, value);
            } else {
                value->text = text;
                value->size = strlen(text);
            }
            return;
        }
        case Kind::kNumber: {
            int32_t n = 0;
            const bool present = Read(values, macro.field, &n);
            if (!Sentinel(present, n, value)) {
                Spell(value, snprintf(value->number, sizeof(value->number), "%" PRId32, n));
            }
            return;
        }
        case Kind::kPair: {
            int32_t a = 0, b = 0;
            const bool present = Read(values, macro.field, &a) && Read(values, macro.second, &b);
            // Both must be known; one that does not apply makes the pair not apply.
            const int32_t worst = a < 0 || b < 0 ? (a == -2 || b == -2 ? -2 : -1) : 0;
            if (!Sentinel(present, worst, value)) {
                Spell(value,
                      snprintf(value->number, sizeof(value->number), "%" PRId32 ",%" PRId32, a, b));
            }
            return;
        }
        case Kind::kClock: {
            int64_t ms = 0;
            const bool present = Read(values, macro.field, &ms);
            if (!Sentinel(present, ms, value)) {
                Spell(value,
                      snprintf(value->number, sizeof(value->number), "%02" PRId64 ":%02d:%02d.%03d",
                               ms / 3600000, static_cast<int>(ms / 60000 % 60),
                               static_cast<int>(ms / 1000 % 60), static_cast<int>(ms % 1000)));
            }
            return;
        }
        case Kind::kTimestamp:
            SpellTimestamp(values, call, value);
            return;
        case Kind::kCacheBusting:
            Spell(value,
                  snprintf(value->number, sizeof(value->number), "%08" PRIu32, call.cacheBusting));
            return;
    }
}

}  // namespace

bool LookUpMacro(const char* name, size_t size, const KaMacroValues* values, const MacroCall& call,
                 MacroValue* value) {
    for (const Macro& macro : kMacros) {
        if (strlen(macro.name) == size && memcmp(macro.name, name, size) == 0) {
            Fill(macro, values, call, value);
            return true;
        }
    }
    return false;
}

}  // namespace ka
