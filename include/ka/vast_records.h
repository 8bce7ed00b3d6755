/* VAST ad records: one VastAdData per VAST document, holding a list of AdData records. Every
 * record is zero-filled when created; every string is a heap copy owned by its record. */
#ifndef KA_VAST_RECORDS_H
#define KA_VAST_RECORDS_H

#include <stdint.h>

#include "ka/types.h"

/* Objects of the library's C++ side that records point to. A C player sees them as opaque
 * structures and never dereferences them; the pointers are plain pointer-sized values. */
#ifdef __cplusplus
class CVASTParser;   /* parser holding a wrapped document's result (src/vast/vast_parser.h) */
class CAdExtensions; /* object built from <Extensions> (ka/vast_extension.h) */
#else
typedef struct CVASTParser CVASTParser;
typedef struct CAdExtensions CAdExtensions;
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* AdData.type: the kind of the ad's body. */
#define AD_TYPE_UNKNOWN 0u /* no body read yet */
#define AD_TYPE_INLINE 1u  /* body is an AdInLine */
#define AD_TYPE_WRAPPER 2u /* body is an AdWrapper */

/* Parameter id of CVASTParser::SetParam: installs a CExtensionParser* (ka/vast_extension.h). */
#define KA_PID_VAST_EXTENSION_PARSER 0x45000001u

/* AdCreative.kind: what the creative's content holds. */
typedef uint32_t AdCreativeKind;
#define AD_CREATIVE_NONE 0u   /* nothing: content is all zero */
#define AD_CREATIVE_LINEAR 1u /* content is a filled AdLinear */

/* AdMediaFile.delivery. */
typedef uint32_t AdDelivery;
#define AD_DELIVERY_PROGRESSIVE 0u /* "progressive", also any unknown or absent value */
#define AD_DELIVERY_STREAMING 1u   /* exactly "streaming" */

/* AdTracking.offsetKind: how to read AdTracking.offset. */
typedef uint32_t AdOffsetKind;
#define AD_OFFSET_NONE 0u    /* no "offset" attribute: offset is 0 */
#define AD_OFFSET_TIME 1u    /* offset is a time in milliseconds */
#define AD_OFFSET_PERCENT 2u /* offset is a percentage of the duration (0 to 99) */

struct AdData;

/* The result of one VAST document. */
typedef struct VastAdData {
    uint32_t adCount;       /* <Ad> elements read; not changed by the wrapper merge */
    struct AdData* firstAd; /* first ad in document order, or null */
    char* errorUrl;         /* root <Error> text (last non-empty wins), or null */
    uint32_t depth;         /* wrapper hops above this document: 0 for the caller's own */
} VastAdData;

/* One Impression URL. */
typedef struct AdImpression {
    char* url;                 /* never null or empty in a node the parser made */
    struct AdImpression* next; /* next impression of the same ad, or null */
} AdImpression;

/* One click element (ClickThrough, ClickTracking or CustomClick). */
typedef struct AdClick {
    char* id;             /* attribute "id", or null */
    char* url;            /* the element's text, or null when it had none */
    struct AdClick* next; /* next click of the same list, or null */
} AdClick;

/* One VideoClicks element of a linear creative. */
typedef struct AdVideoClicks {
    uint32_t clickThroughCount;  /* records in clickThroughs */
    AdClick* clickThroughs;      /* ClickThrough elements in document order */
    uint32_t clickTrackingCount; /* records in clickTrackings */
    AdClick* clickTrackings;     /* ClickTracking elements, then those merged from wrappers */
    uint32_t customClickCount;   /* records in customClicks */
    AdClick* customClicks;       /* CustomClick elements, then those merged from wrappers */
    struct AdVideoClicks* next;  /* always null when parsed */
} AdVideoClicks;

/* One MediaFile element. Numbers are atoi of their attributes, 0 when absent. */
typedef struct AdMediaFile {
    AdDelivery delivery;         /* AD_DELIVERY_* from attribute "delivery" */
    char* type;                  /* MIME type, or null */
    int32_t width;               /* pixels */
    int32_t height;              /* pixels */
    char* codec;                 /* attribute "codec", or null */
    int32_t id;                  /* attribute "id" as a number ("abc" gives 0) */
    int32_t bitrate;             /* kbit/s */
    int32_t minBitrate;          /* kbit/s */
    int32_t maxBitrate;          /* kbit/s */
    int32_t scalable;            /* "1" gives 1; "true" gives 0 */
    int32_t maintainAspectRatio; /* "1" gives 1; "true" gives 0 */
    char* url;                   /* the element's text: the media URL, or null */
    struct AdMediaFile* next;    /* next media file of the same linear, or null */
} AdMediaFile;

/* One Tracking element. */
typedef struct AdTracking {
    char* event;             /* attribute "event" as written, or null */
    AdOffsetKind offsetKind; /* AD_OFFSET_* */
    int64_t offset;          /* milliseconds or a percentage, by offsetKind; 0 when none */
    char* url;               /* the element's text: the tracking URL, or null */
    struct AdTracking* next; /* next tracking event of the same linear, or null */
} AdTracking;

/* Placeholder for one AdParameters element; its content is not kept. */
typedef struct AdParameters {
    struct AdParameters* next; /* always null */
} AdParameters;

/* Placeholder for an icon; icons are not stored, so no such record is ever made. */
typedef struct AdIcon {
    struct AdIcon* next; /* next icon, or null */
} AdIcon;

/* The content of a linear creative, held inside its AdCreative. */
typedef struct AdLinear {
    uint64_t duration;          /* milliseconds from <Duration>; 0 when absent */
    int64_t skipOffset;         /* milliseconds; -1 (all bits set) when there is no skipoffset */
    uint32_t mediaFileCount;    /* records in mediaFiles */
    AdMediaFile* mediaFiles;    /* media files in document order, or null */
    uint32_t videoClicksCount;  /* 1 once a VideoClicks element was read, else 0 */
    AdVideoClicks* videoClicks; /* the first VideoClicks element, or null */
    uint32_t adParametersCount; /* 1 once an AdParameters element was read, else 0 */
    AdParameters* adParameters; /* placeholder record, or null */
    uint32_t trackingCount;     /* records in trackingEvents */
    AdTracking* trackingEvents; /* tracking events in document order, then merged ones */
    uint32_t iconCount;         /* always 0 */
    AdIcon* icons;              /* always null */
} AdLinear;

/* One Creative element. */
typedef struct AdCreative {
    char* id;                /* attribute "id", or null */
    int32_t sequence;        /* atoi of attribute "sequence"; 0 when absent */
    char* adId;              /* attribute "adId", or null */
    AdCreativeKind kind;     /* AD_CREATIVE_*: what content holds */
    AdLinear content;        /* the linear content; all zero unless kind is AD_CREATIVE_LINEAR */
    struct AdCreative* next; /* next creative of the same ad, or null */
} AdCreative;

/* Body of an InLine ad: the ad itself. */
typedef struct AdInLine {
    char* adSystem;               /* <AdSystem>, CDATA unwrapped, or null */
    char* adTitle;                /* <AdTitle>, CDATA unwrapped, or null */
    uint32_t impressionCount;     /* <Impression> elements met, empty ones included */
    AdImpression* impressions;    /* impression URLs in document order, then merged ones */
    char* description;            /* <Description>, CDATA unwrapped, or null */
    char* advertiser;             /* <Advertiser>, CDATA unwrapped, or null */
    char* survey;                 /* <Survey>, CDATA unwrapped and "&amp;" decoded, or null */
    char* error;                  /* <Error> URL (last non-empty wins), or null */
    CAdExtensions* extensions;    /* built by the installed extension parser; owned; or null */
    uint32_t creativeCount;       /* records in creatives */
    struct AdCreative* creatives; /* creatives in document order, or null */
} AdInLine;

/* Body of a Wrapper ad: points at another VAST document and adds tracking to it. */
typedef struct AdWrapper {
    char* adSystem;               /* <AdSystem>, CDATA unwrapped, or null */
    char* vastAdTagUri;           /* URL of the wrapped document (last non-empty wins), or null */
    char* error;                  /* <Error> URL (last non-empty wins), or null */
    AdImpression* impressions;    /* impression URLs in document order; no count kept */
    struct AdCreative* creatives; /* creatives in document order; no count kept */
    CAdExtensions* extensions;    /* as in AdInLine */
    CVASTParser* nestedParser;    /* parser holding the wrapped document's ads; owned; or null */
} AdWrapper;

/* One <Ad>. */
typedef struct AdData {
    char* id;            /* attribute "id", or null */
    int32_t sequence;    /* atoi of attribute "sequence"; 0 when absent */
    uint32_t type;       /* AD_TYPE_*: the kind of body */
    void* body;          /* AdInLine* or AdWrapper* by type; may be null: test before use */
    struct AdData* next; /* next ad of the same container, or null */
} AdData;

#ifdef __cplusplus
}
#endif

#endif /* KA_VAST_RECORDS_H */
