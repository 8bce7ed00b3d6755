/* What the library offers beyond the eight-slot table of "ka/vmap_parser_api.h": a second table,
 * filled by its own exported entry, and the records it lends. A player that never calls
 * kaGetVMAPParserExtAPI sees the library exactly as before; the records of the first table are
 * not changed by anything here. */
#ifndef KA_VMAP_PARSER_EXT_H
#define KA_VMAP_PARSER_EXT_H

#include <stdint.h>

#include "ka/export.h"
#include "ka/result_codes.h"
#include "ka/vast_extras.h"
#include "ka/vast_records.h"

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KaChainOutcome KaChainOutcome;
typedef struct KaMacroValues KaMacroValues;

/* ---- Chain outcomes ---- */

/* What became of each ad of the player's document once its wrapper chain was followed: one
 * KaChainOutcome per ad, in document order (in VMAP, per ad of each inline VAST element), with
 * every download of the chain and every Error URL along it, for the Error ping a player owes the
 * ad servers when the chain failed. An ad that was an InLine from the start gets a record with
 * no hops. The records belong to the handle: built by Process, released by the next Process,
 * Reset or Close. With merging off the same outcomes are reported. */

/* KaChainOutcome.state: what the chain reached. */
#define KA_CHAIN_NOT_WRAPPED 0u /* the ad was no Wrapper in the player's document: no chain */
#define KA_CHAIN_RESOLVED 1u    /* the chain reached an InLine ad (merged in, or nestedParser's) */
#define KA_CHAIN_WRAPPER 2u     /* the chain stopped at a Wrapper: the ad is still a wrapper */
/* A wrapped document gave no ad: merged, the ad has lost its wrapper data (type Wrapper, no
 * body, no id); unmerged, it keeps them and its nestedParser holds an empty container. */
#define KA_CHAIN_EMPTIED 3u

/* KaChainOutcome.vastError: the IAB VAST error code to send to the Error URLs. */
#define KA_VAST_ERROR_NONE 0u        /* resolved, or an InLine from the start */
#define KA_VAST_ERROR_XML 100u       /* a wrapped document was not XML */
#define KA_VAST_ERROR_SCHEMA 101u    /* a Wrapper without VASTAdTagURI, an Ad without a body */
#define KA_VAST_ERROR_VERSION 102u   /* a wrapped document of a VAST version other than 2 to 4 */
#define KA_VAST_ERROR_WRAPPER 300u   /* a download failed: connection, HTTP status, URL refused */
#define KA_VAST_ERROR_TIMEOUT 301u   /* the deadline passed, or the player's stop flag was set */
#define KA_VAST_ERROR_LIMIT 302u     /* the depth limit or a budget of ka/chain_limits.h */
#define KA_VAST_ERROR_NO_AD 303u     /* a wrapped document held no ad, or nothing at all */
#define KA_VAST_ERROR_UNDEFINED 900u /* anything else */

/* KaChainOutcome.reason: why the chain ended where it did, finer than the VAST code. */
#define KA_CHAIN_REASON_NONE 0u        /* resolved, or not wrapped */
#define KA_CHAIN_REASON_NO_URI 1u      /* a Wrapper without (or with an empty) VASTAdTagURI: 101 */
#define KA_CHAIN_REASON_NO_BODY 2u     /* the ad had neither InLine nor Wrapper: 101 */
#define KA_CHAIN_REASON_URL_REFUSED 3u /* reference too long, or a scheme not allowed: 300 */
#define KA_CHAIN_REASON_DOWNLOAD 4u    /* the download failed (see the last hop's result): 300 */
#define KA_CHAIN_REASON_DEADLINE 5u    /* KA_PID_VMAP_DEADLINE_MS passed: 301 */
#define KA_CHAIN_REASON_STOPPED 6u     /* the KA_PID_VMAP_STOP_FLAG flag was set: 301 */
#define KA_CHAIN_REASON_NOT_XML 7u     /* the wrapped document could not be loaded: 100 */
#define KA_CHAIN_REASON_VERSION 8u     /* an unsupported version and no usable ad: 102 */
#define KA_CHAIN_REASON_NO_AD 9u       /* an empty download or a document without ads: 303 */
#define KA_CHAIN_REASON_DEPTH 10u      /* the wrapper depth limit (ten hops): 302 */
#define KA_CHAIN_REASON_FETCHES 11u    /* KA_VMAP_FETCHES_PER_AD spent: 302 */
#define KA_CHAIN_REASON_BYTES 12u      /* KA_PID_VMAP_FETCH_BYTES spent: 302 */
/* Resolved, but the merge share of KA_VMAP_MERGE_BYTES_FLOOR cut the copies of the wrappers'
 * tracking: the ad plays, without some of its wrappers' tracking: 302. */
#define KA_CHAIN_REASON_MERGE_SHARE 13u

/* One download of a chain. */
typedef struct KaChainHop {
    char* url;             /* the URL asked for, resolved against its document; never null */
    char* finalUrl;        /* the URL reached after redirects; null when the download failed */
    uint32_t depth;        /* 1: named by the player's document, 2: by the document of depth 1 */
    uint32_t result;       /* the download's result code (ka/result_codes.h); 0: downloaded */
    uint64_t bytes;        /* bytes read; of a failed download what arrived, mostly 0 */
    uint32_t milliseconds; /* how long the download took */
    uint32_t onPath;       /* 1 when the hop leads to the ad the player got; 0: fan-out dropped */
} KaChainHop;

/* The outcome of one ad's chain (typedef above). Strings and arrays are owned by the handle. */
struct KaChainOutcome {
    AdData* ad;         /* the ad of the player's records (the node the merge keeps); not owned */
    uint32_t state;     /* KA_CHAIN_* */
    uint32_t vastError; /* KA_VAST_ERROR_*: 0 when resolved (302 when the merge share cut) */
    uint32_t reason;    /* KA_CHAIN_REASON_* */
    uint32_t hopCount;  /* records in hops; at most KA_VMAP_FETCHES_PER_AD */
    KaChainHop* hops;   /* every download of the chain, in pre-order (a tree by depth); or null */
    uint32_t errorUrlCount; /* strings in errorUrls */
    /* The Error URLs along the chain, outermost first: the player's document's root <Error> and
     * the ad's own, then each wrapped document's root <Error> and its first ad's, down to the
     * InLine's; copies taken before the merge released them; or null. */
    char** errorUrls;
    struct KaChainOutcome* next; /* the next ad's outcome, or null */
};

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
     * ad); they live until the next Process, Reset or Close. */
    uint32_t (*GetChainOutcomes)(void* handle, KaChainOutcome** out);
    /* kaExpandVASTMacros, for a player that looked up only the entry. */
    uint32_t (*ExpandMacros)(const char* urlTemplate, const KaMacroValues* values, char* out,
                             uint32_t outSize, uint32_t* outLength);
    /* The extras (ka/vast_extras.h) of an ad or creative of the handle's records, nested
     * parsers' included, through *out: null when it has none. An ad's extras follow its body,
     * so an ad the merge filled with a wrapped InLine gives the InLine's, with its wrappers'
     * verifications and viewability pings appended. They live as long as the records. */
    uint32_t (*GetAdExtras)(void* handle, const AdData* ad, const KaAdExtras** out);
    uint32_t (*GetCreativeExtras)(void* handle, const AdCreative* creative,
                                  const KaCreativeExtras** out);
    /* The same from a nested parser (an unmerged wrapper's nestedParser, as slot 6 takes). */
    uint32_t (*GetNestedAdExtras)(void* parser, const AdData* ad, const KaAdExtras** out);
    uint32_t (*GetNestedCreativeExtras)(void* parser, const AdCreative* creative,
                                        const KaCreativeExtras** out);
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
