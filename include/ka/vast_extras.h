/* What a VAST 4 response carries beyond the records of ka/vast_records.h: companion banners,
 * non-linear overlays, icons, verification scripts, the universal ad id, viewability pings,
 * pricing. They are looked up from the ad and creative records through the second table
 * (ka/vmap_parser_ext.h) and live exactly as long as those records: built by Process, released
 * by the next Process, Reset or Close. Strings are null when absent; lists end with null. */
#ifndef KA_VAST_EXTRAS_H
#define KA_VAST_EXTRAS_H

#include <stdint.h>

#include "ka/vast_records.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Parameter of the first table's SetParam: non-null (the default) reads the extras, null skips
 * them; the first table's records are the same either way. */
#define KA_PID_VMAP_READ_EXTRAS 0x44000201u
/* Parameter of the first table's SetParam: non-null also matches VMAP elements written without
 * a prefix or under any prefix bound to the VMAP namespace; null (the default) keeps "vmap:". */
#define KA_PID_VMAP_LENIENT 0x44000202u

/* KaResource.kind: which resource element it was. */
#define KA_RESOURCE_STATIC 1u /* StaticResource: content is an image or script URL */
#define KA_RESOURCE_IFRAME 2u /* IFrameResource: content is the URL of a page */
#define KA_RESOURCE_HTML 3u   /* HTMLResource: content is HTML markup */

/* A boolean attribute: 1 "true" (or "1"), 0 any other value, KA_FLAG_ABSENT when not there. */
#define KA_FLAG_ABSENT (-1)

/* One URL element: a click tracking, a view tracking, a viewability ping. */
typedef struct KaUrl {
    char* id;           /* attribute "id", or null */
    char* url;          /* the element's text, "&amp;" decoded; null when empty */
    struct KaUrl* next; /* next of the same list */
} KaUrl;

/* One StaticResource, IFrameResource or HTMLResource. */
typedef struct KaResource {
    uint32_t kind;           /* KA_RESOURCE_* */
    char* creativeType;      /* StaticResource's "creativeType", such as "image/png"; or null */
    char* content;           /* URL (static, iframe) or markup (HTML), CDATA unwrapped */
    struct KaResource* next; /* next resource of the same element */
} KaResource;

/* One Category or BlockedAdCategories element. */
typedef struct KaCategory {
    char* authority;         /* attribute "authority": the taxonomy's URL; or null */
    char* code;              /* the element's text: the category code(s) */
    struct KaCategory* next; /* next of the same ad */
} KaCategory;

/* <Pricing>. */
typedef struct KaPricing {
    char* model;    /* attribute "model": "CPM", "CPC", "CPE" or "CPV" as written */
    char* currency; /* attribute "currency": ISO 4217, such as "USD" */
    char* value;    /* the element's text: the price as written, such as "25.00" */
} KaPricing;

/* One JavaScriptResource or ExecutableResource of a Verification. */
typedef struct KaVerificationResource {
    char* apiFramework;      /* attribute "apiFramework", such as "omid" */
    int32_t browserOptional; /* JavaScriptResource's "browserOptional": KA_FLAG_ABSENT, 0, 1 */
    char* type;              /* ExecutableResource's "type"; null for JavaScriptResource */
    char* url;               /* the element's text: the script's URL */
    struct KaVerificationResource* next; /* next resource of the same kind */
} KaVerificationResource;

/* One <Verification> of AdVerifications (or of an Extension of type "AdVerifications"). */
typedef struct KaVerification {
    char* vendor;                                /* attribute "vendor", or null */
    KaVerificationResource* javaScriptResources; /* JavaScriptResource elements */
    KaVerificationResource* executableResources; /* ExecutableResource elements */
    char* verificationParameters;                /* <VerificationParameters>, CDATA unwrapped */
    uint32_t trackingCount;                      /* records in trackingEvents */
    AdTracking* trackingEvents;                  /* such as "verificationNotExecuted" */
    struct KaVerification* next;                 /* next verification of the ad */
} KaVerification;

/* What an ad (InLine or Wrapper) carries beyond AdInLine and AdWrapper. */
typedef struct KaAdExtras {
    char* adType;                     /* the Ad's "adType": "video", "audio" or "hybrid" */
    char* adServingId;                /* <AdServingId> */
    KaCategory* categories;           /* <Category> elements */
    KaCategory* blockedAdCategories;  /* <BlockedAdCategories> elements (Wrapper) */
    KaPricing* pricing;               /* <Pricing>, or null */
    int32_t expires;                  /* <Expires>: seconds the response may be cached; 0: none */
    KaUrl* viewable;                  /* ViewableImpression's <Viewable>, then wrappers' */
    KaUrl* notViewable;               /* ViewableImpression's <NotViewable>, then wrappers' */
    KaUrl* viewUndetermined;          /* ViewableImpression's <ViewUndetermined>, then wrappers' */
    KaVerification* verifications;    /* the ad's own, then those of its wrappers */
    int32_t followAdditionalWrappers; /* Wrapper attribute: KA_FLAG_ABSENT, 0 or 1 */
    int32_t allowMultipleAds;         /* Wrapper attribute: KA_FLAG_ABSENT, 0 or 1 */
    int32_t fallbackOnNoAd;           /* Wrapper attribute: KA_FLAG_ABSENT, 0 or 1 */
} KaAdExtras;

/* One <UniversalAdId>. */
typedef struct KaUniversalAdId {
    char* idRegistry;             /* attribute "idRegistry", such as "ad-id.org" */
    char* idValue;                /* attribute "idValue" of VAST 4.0, or null */
    char* value;                  /* the element's text: the id (VAST 4.1 and later) */
    struct KaUniversalAdId* next; /* next id of the creative */
} KaUniversalAdId;

/* One <IconClickFallbackImage>. */
typedef struct KaFallbackImage {
    int32_t width;                /* attribute "width" */
    int32_t height;               /* attribute "height" */
    char* altText;                /* <AltText> */
    char* creativeType;           /* its StaticResource's "creativeType" */
    char* url;                    /* its StaticResource's URL */
    struct KaFallbackImage* next; /* next image of the icon */
} KaFallbackImage;

/* One <Icon> of a Linear, such as the AdChoices mark. */
typedef struct KaIcon {
    char* program;                   /* attribute "program", such as "AdChoices" */
    int32_t width;                   /* pixels */
    int32_t height;                  /* pixels */
    char* xPosition;                 /* "left", "right" or pixels, as written */
    char* yPosition;                 /* "top", "bottom" or pixels, as written */
    uint64_t duration;               /* milliseconds; 0 when absent */
    uint64_t offset;                 /* milliseconds into the ad; 0 when absent */
    char* apiFramework;              /* attribute "apiFramework" */
    char* pxratio;                   /* attribute "pxratio", as written */
    KaResource* resources;           /* its Static/IFrame/HTML resources */
    char* clickThrough;              /* IconClicks' <IconClickThrough> */
    KaUrl* clickTrackings;           /* IconClicks' <IconClickTracking> */
    KaFallbackImage* fallbackImages; /* IconClicks' IconClickFallbackImages */
    KaUrl* viewTrackings;            /* <IconViewTracking> */
    struct KaIcon* next;             /* next icon of the creative */
} KaIcon;

/* A media element of MediaFiles other than MediaFile: Mezzanine, InteractiveCreativeFile,
 * ClosedCaptionFile. Attributes the element lacks stay null or 0. */
typedef struct KaMediaAsset {
    char* type;                /* MIME type */
    char* delivery;            /* Mezzanine's "delivery" */
    int32_t width;             /* Mezzanine's "width" */
    int32_t height;            /* Mezzanine's "height" */
    char* codec;               /* Mezzanine's "codec" */
    char* id;                  /* Mezzanine's "id" */
    int64_t fileSize;          /* Mezzanine's "fileSize", bytes */
    char* mediaType;           /* Mezzanine's "mediaType" */
    char* apiFramework;        /* InteractiveCreativeFile's "apiFramework" */
    int32_t variableDuration;  /* InteractiveCreativeFile's: KA_FLAG_ABSENT, 0 or 1 */
    char* language;            /* ClosedCaptionFile's "language" */
    char* url;                 /* the element's text */
    struct KaMediaAsset* next; /* next element of the same kind */
} KaMediaAsset;

/* The attributes of a MediaFile that AdMediaFile has no field for. */
typedef struct KaMediaFileExtras {
    const AdMediaFile* mediaFile;   /* the record these belong to */
    int64_t fileSize;               /* "fileSize", bytes; 0 when absent */
    char* mediaType;                /* "mediaType", such as "2D" */
    char* apiFramework;             /* "apiFramework", such as "VPAID" */
    struct KaMediaFileExtras* next; /* the next media file's */
} KaMediaFileExtras;

/* One <NonLinear> overlay. */
typedef struct KaNonLinear {
    char* id;                      /* attribute "id" */
    int32_t width;                 /* pixels */
    int32_t height;                /* pixels */
    int32_t expandedWidth;         /* pixels */
    int32_t expandedHeight;        /* pixels */
    int32_t scalable;              /* KA_FLAG_ABSENT, 0 or 1 */
    int32_t maintainAspectRatio;   /* KA_FLAG_ABSENT, 0 or 1 */
    uint64_t minSuggestedDuration; /* milliseconds; 0 when absent */
    char* apiFramework;            /* attribute "apiFramework" */
    KaResource* resources;         /* its Static/IFrame/HTML resources */
    char* adParameters;            /* <AdParameters> */
    char* clickThrough;            /* <NonLinearClickThrough> */
    KaUrl* clickTrackings;         /* <NonLinearClickTracking>, then wrappers' */
    struct KaNonLinear* next;      /* next overlay of the block */
} KaNonLinear;

/* <NonLinearAds>. */
typedef struct KaNonLinearAds {
    KaNonLinear* nonLinears;    /* NonLinear elements */
    uint32_t trackingCount;     /* records in trackingEvents */
    AdTracking* trackingEvents; /* the block's own, then wrappers' */
} KaNonLinearAds;

/* One <Companion> banner. */
typedef struct KaCompanion {
    char* id;                   /* attribute "id" */
    int32_t width;              /* pixels */
    int32_t height;             /* pixels */
    int32_t assetWidth;         /* pixels */
    int32_t assetHeight;        /* pixels */
    int32_t expandedWidth;      /* pixels */
    int32_t expandedHeight;     /* pixels */
    char* apiFramework;         /* attribute "apiFramework" */
    char* adSlotId;             /* attribute "adSlotId" (also read as "adSlotID") */
    char* pxratio;              /* attribute "pxratio", as written */
    char* renderingMode;        /* "default", "end-card" or "concurrent" */
    KaResource* resources;      /* its Static/IFrame/HTML resources */
    char* adParameters;         /* <AdParameters> */
    char* altText;              /* <AltText> */
    char* clickThrough;         /* <CompanionClickThrough> */
    KaUrl* clickTrackings;      /* <CompanionClickTracking>, then wrappers' */
    uint32_t trackingCount;     /* records in trackingEvents */
    AdTracking* trackingEvents; /* such as "creativeView", then wrappers' */
    struct KaCompanion* next;   /* next companion of the block */
} KaCompanion;

/* <CompanionAds>. */
typedef struct KaCompanionAds {
    char* required;          /* attribute "required": "all", "any" or "none"; or null */
    KaCompanion* companions; /* Companion elements */
} KaCompanionAds;

/* What a creative carries beyond AdCreative. */
typedef struct KaCreativeExtras {
    KaUniversalAdId* universalAdIds;  /* <UniversalAdId> elements */
    char* apiFramework;               /* the Creative's "apiFramework" */
    char* legacyAdId;                 /* the Creative's "AdID" of VAST 2 */
    KaIcon* icons;                    /* the Linear's Icons */
    KaMediaAsset* mezzanines;         /* the Linear's Mezzanine elements */
    KaMediaAsset* interactiveFiles;   /* the Linear's InteractiveCreativeFile elements */
    KaMediaAsset* closedCaptionFiles; /* the Linear's ClosedCaptionFiles */
    KaMediaFileExtras* mediaFiles;    /* one per MediaFile that has any of these attributes */
    KaNonLinearAds* nonLinearAds;     /* <NonLinearAds>, or null */
    KaCompanionAds* companionAds;     /* <CompanionAds>, or null */
} KaCreativeExtras;

#ifdef __cplusplus
}
#endif

#endif /* KA_VAST_EXTRAS_H */
