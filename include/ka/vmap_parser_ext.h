/* What the library offers beyond the eight-slot table of "ka/vmap_parser_api.h": a second table,
 * filled by its own exported entry, and the records it lends. A player that never calls
 * kaGetVMAPParserExtAPI sees the library exactly as before; the records of the first table are
 * not changed by anything here. */
#ifndef KA_VMAP_PARSER_EXT_H
#define KA_VMAP_PARSER_EXT_H

#include <stdint.h>

#include "ka/export.h"
#include "ka/result_codes.h"
#include "ka/vast_records.h"

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KaChainOutcome KaChainOutcome;
typedef struct KaMacroValues KaMacroValues;

/* ---- Chain outcomes ---- */

/* ---- Macro expansion ---- */

/* What a numeric field of KaMacroValues holds when the player does not know the value: the
 * macro becomes "-1". Any other negative number but the one below reads the same (all but
 * utcOffsetMinutes, where negative offsets are real). */
#define KA_MACRO_UNKNOWN (-1)
/* The value does not apply to this ping (no error for [ERRORCODE], no ad playing for
 * [ADPLAYHEAD]): the macro becomes "-2". A text field says so with the text "-2" itself. */
#define KA_MACRO_NOT_APPLICABLE (-2)
/* utcOffsetMinutes: print [TIMESTAMP] with the device's own UTC offset. */
#define KA_MACRO_LOCAL_OFFSET INT32_MIN

/* What the player knows when it pings a tracking or error URL, one field per VAST macro. The
 * caller sets size to sizeof(KaMacroValues) as it was compiled; fields beyond size read as
 * unknown, so later versions only append fields. Texts are NUL-terminated, borrowed for the call
 * and substituted URL-encoded (null: unknown, "-1"); lists are comma-separated as the macro
 * defines them. Times are milliseconds. Start from KA_MACRO_VALUES_INIT, which sets every value
 * unknown: a zero-filled record says 0 for every number. */
typedef struct KaMacroValues {
    uint32_t size;            /* sizeof(KaMacroValues), set by the caller */
    int32_t errorCode;        /* [ERRORCODE]: a VAST error code such as 303 */
    int64_t timestampMs;      /* [TIMESTAMP]: ms since 1970-01-01 UTC; unknown: now */
    int32_t utcOffsetMinutes; /* [TIMESTAMP]: offset printed, e.g. -300; or KA_MACRO_LOCAL_OFFSET */
    int32_t breakPosition;    /* [BREAKPOSITION]: 1 preroll, 2 midroll, 3 postroll, 4 standalone */
    int64_t mediaPlayheadMs;  /* [MEDIAPLAYHEAD] and the older [CONTENTPLAYHEAD] */
    int64_t adPlayheadMs;     /* [ADPLAYHEAD] */
    int32_t adCount;          /* [ADCOUNT]: ads played so far in the break or stream */
    int32_t podSequence;      /* [PODSEQUENCE]: the ad's sequence attribute in its pod */
    int32_t breakMaxDuration; /* [BREAKMAXDURATION]: seconds */
    int32_t breakMinDuration; /* [BREAKMINDURATION]: seconds */
    int32_t breakMaxAdLength; /* [BREAKMAXADLENGTH]: seconds */
    int32_t breakMinAdLength; /* [BREAKMINADLENGTH]: seconds */
    int32_t breakMaxAds;      /* [BREAKMAXADS] */
    int32_t reason;           /* [REASON]: why a Verification did not run, 1 to 3 */
    int32_t limitAdTracking;  /* [LIMITADTRACKING]: 0 or 1 */
    int32_t serverSide;       /* [SERVERSIDE]: 0 client, 1 server for the client, 2 server */
    int32_t placementType;    /* [PLACEMENTTYPE]: 1 to 5 */
    int32_t clickType;        /* [CLICKTYPE]: 0 to 3 */
    int32_t playerWidth;      /* [PLAYERSIZE] "width,height", pixels; unknown if either is */
    int32_t playerHeight;     /* [PLAYERSIZE] */
    int32_t clickX;           /* [CLICKPOS] "x,y", pixels; unknown if either is */
    int32_t clickY;           /* [CLICKPOS] */
    const char* assetUri;     /* [ASSETURI]: the ad's media file URL */
    const char* contentId;    /* [CONTENTID] */
    const char* contentUri;   /* [CONTENTURI] */
    const char* ifa;          /* [IFA]: the device's advertising identifier */
    const char* ifaType;      /* [IFATYPE]: such as "aaid" */
    const char* clientUa;     /* [CLIENTUA]: "player/version vastclient/version" */
    const char* serverUa;     /* [SERVERUA] */
    const char* deviceUa;     /* [DEVICEUA] */
    const char* deviceIp;     /* [DEVICEIP] */
    const char* latLong;      /* [LATLONG]: "latitude,longitude" */
    const char* domain;       /* [DOMAIN] */
    const char* pageUrl;      /* [PAGEURL] */
    const char* appBundle;    /* [APPBUNDLE]: such as "com.example.player" */
    const char* storeId;      /* [STOREID] */
    const char* storeUrl;     /* [STOREURL] */
    const char* inventoryState;      /* [INVENTORYSTATE]: such as "skippable,autoplayed" */
    const char* playerState;         /* [PLAYERSTATE]: such as "fullscreen,muted" */
    const char* playerCapabilities;  /* [PLAYERCAPABILITIES]: such as "skip,mute" */
    const char* regulations;         /* [REGULATIONS]: such as "gdpr,coppa" */
    const char* gdprConsent;         /* [GDPRCONSENT]: the consent string */
    const char* transactionId;       /* [TRANSACTIONID] */
    const char* universalAdId;       /* [UNIVERSALADID]: "registry value" pairs */
    const char* adServingId;         /* [ADSERVINGID] */
    const char* adType;              /* [ADTYPE]: "video", "audio" or "hybrid" */
    const char* adCategories;        /* [ADCATEGORIES] */
    const char* blockedAdCategories; /* [BLOCKEDADCATEGORIES] */
    const char* apiFrameworks;       /* [APIFRAMEWORKS]: such as "2,7" */
    const char* extensions;          /* [EXTENSIONS]: extension types the player reads */
    const char* mediaMime;           /* [MEDIAMIME]: such as "video/mp4" */
    const char* vastVersions;        /* [VASTVERSIONS]: such as "2,3,5,6,7,8,11,12,13,14" */
    const char* verificationVendors; /* [VERIFICATIONVENDORS] */
    const char* omidPartner;         /* [OMIDPARTNER]: "name/version" */
} KaMacroValues;

/* Every value unknown, timestamp "now" in the device's zone; for "KaMacroValues v = ...;". */
#define KA_MACRO_VALUES_INIT                                                                     \
    {                                                                                            \
        (uint32_t)sizeof(KaMacroValues), -1, -1, KA_MACRO_LOCAL_OFFSET, -1, -1, -1, -1, -1, -1,  \
            -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, -1, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, \
            0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0                        \
    }

/* Copies urlTemplate into out with each VAST macro replaced: "[NAME]" matched whole and
 * case-sensitively, and "%5BNAME%5D" as URLs that were encoded once carry it. [CACHEBUSTING]
 * is eight random digits, fresh for each call; [TIMESTAMP] is ISO 8601 with milliseconds and
 * offset (2016-01-17T08:15:07.127-05:00); playheads read HH:MM:SS.mmm. Every substituted value
 * is percent-encoded but for RFC 3986's unreserved characters; the rest of the template is
 * copied as it is, and bracketed words that are no macro stay as written. values may be null
 * (all unknown). Returns 0 with a NUL-terminated out and *outLength its length (outLength may
 * be null); KA_ERR_NULL_ARGUMENT when urlTemplate or out is null; KA_ERR_BUFFER_TOO_SMALL when
 * the result with its terminator exceeds outSize: out is then "" (when outSize > 0), never a
 * URL cut short, and *outLength is the outSize that would fit it (UINT32_MAX: more than fits
 * a uint32_t). Thread-safe; takes no memory of its own. */
KA_EXTERN_C KA_API uint32_t kaExpandVASTMacros(const char* urlTemplate, const KaMacroValues* values,
                                               char* out, uint32_t outSize, uint32_t* outLength);

/* Signature of kaExpandVASTMacros, for players that look it up with dlsym. */
typedef uint32_t (*KaExpandVASTMacrosFn)(const char* urlTemplate, const KaMacroValues* values,
                                         char* out, uint32_t outSize, uint32_t* outLength);

/* The second table. The caller sets size to sizeof(VMAPParserExtAPI) as it was compiled; the
 * library fills the slots that lie inside both its own table and the caller's, nulls none
 * beyond them, and writes back the size it filled. Later versions only append slots. */
typedef struct VMAPParserExtAPI {
    uint32_t size; /* in: bytes the caller's table has; out: bytes the library filled */
    /* Lends the chain outcomes of the handle's last Process through *out (null when it read no
     * ad); they live until the next Process or Close. */
    uint32_t (*GetChainOutcomes)(void* handle, KaChainOutcome** out);
    /* kaExpandVASTMacros, for a player that looked up only the entry. */
    uint32_t (*ExpandMacros)(const char* urlTemplate, const KaMacroValues* values, char* out,
                             uint32_t outSize, uint32_t* outLength);
} VMAPParserExtAPI;

/* Fills *api as described above; KA_ERR_NULL_ARGUMENT when api is null or its size holds no
 * slot. */
KA_EXTERN_C KA_API uint32_t kaGetVMAPParserExtAPI(VMAPParserExtAPI* api);

/* Signature of kaGetVMAPParserExtAPI, for players that look it up with dlsym. */
typedef uint32_t (*KaGetVMAPParserExtAPIFn)(VMAPParserExtAPI* api);

#ifdef __cplusplus
}
#endif

#endif /* KA_VMAP_PARSER_EXT_H */
