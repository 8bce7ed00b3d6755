/* Field offsets and widths of the public VAST records on LP64, shared by the C and the C++ side
 * of the layout test: X(record, field, offset, size). */
#ifndef KA_TEST_VAST_LAYOUT_FIELDS_H
#define KA_TEST_VAST_LAYOUT_FIELDS_H

#define KA_VAST_FIELDS(X)                       \
    X(VastAdData, adCount, 0, 4)                \
    X(VastAdData, firstAd, 8, 8)                \
    X(VastAdData, errorUrl, 16, 8)              \
    X(VastAdData, depth, 24, 4)                 \
    X(AdData, id, 0, 8)                         \
    X(AdData, sequence, 8, 4)                   \
    X(AdData, type, 12, 4)                      \
    X(AdData, body, 16, 8)                      \
    X(AdData, next, 24, 8)                      \
    X(AdInLine, adSystem, 0, 8)                 \
    X(AdInLine, adTitle, 8, 8)                  \
    X(AdInLine, impressionCount, 16, 4)         \
    X(AdInLine, impressions, 24, 8)             \
    X(AdInLine, description, 32, 8)             \
    X(AdInLine, advertiser, 40, 8)              \
    X(AdInLine, survey, 48, 8)                  \
    X(AdInLine, error, 56, 8)                   \
    X(AdInLine, extensions, 64, 8)              \
    X(AdInLine, creativeCount, 72, 4)           \
    X(AdInLine, creatives, 80, 8)               \
    X(AdWrapper, adSystem, 0, 8)                \
    X(AdWrapper, vastAdTagUri, 8, 8)            \
    X(AdWrapper, error, 16, 8)                  \
    X(AdWrapper, impressions, 24, 8)            \
    X(AdWrapper, creatives, 32, 8)              \
    X(AdWrapper, extensions, 40, 8)             \
    X(AdWrapper, nestedParser, 48, 8)           \
    X(AdImpression, url, 0, 8)                  \
    X(AdImpression, next, 8, 8)                 \
    X(AdCreative, id, 0, 8)                     \
    X(AdCreative, sequence, 8, 4)               \
    X(AdCreative, adId, 16, 8)                  \
    X(AdCreative, kind, 24, 4)                  \
    X(AdCreative, content, 32, 96)              \
    X(AdCreative, next, 128, 8)                 \
    X(AdLinear, duration, 0, 8)                 \
    X(AdLinear, skipOffset, 8, 8)               \
    X(AdLinear, mediaFileCount, 16, 4)          \
    X(AdLinear, mediaFiles, 24, 8)              \
    X(AdLinear, videoClicksCount, 32, 4)        \
    X(AdLinear, videoClicks, 40, 8)             \
    X(AdLinear, adParametersCount, 48, 4)       \
    X(AdLinear, adParameters, 56, 8)            \
    X(AdLinear, trackingCount, 64, 4)           \
    X(AdLinear, trackingEvents, 72, 8)          \
    X(AdLinear, iconCount, 80, 4)               \
    X(AdLinear, icons, 88, 8)                   \
    X(AdVideoClicks, clickThroughCount, 0, 4)   \
    X(AdVideoClicks, clickThroughs, 8, 8)       \
    X(AdVideoClicks, clickTrackingCount, 16, 4) \
    X(AdVideoClicks, clickTrackings, 24, 8)     \
    X(AdVideoClicks, customClickCount, 32, 4)   \
    X(AdVideoClicks, customClicks, 40, 8)       \
    X(AdVideoClicks, next, 48, 8)               \
    X(AdClick, id, 0, 8)                        \
    X(AdClick, url, 8, 8)                       \
    X(AdClick, next, 16, 8)                     \
    X(AdMediaFile, delivery, 0, 4)              \
    X(AdMediaFile, type, 8, 8)                  \
    X(AdMediaFile, width, 16, 4)                \
    X(AdMediaFile, height, 20, 4)               \
    X(AdMediaFile, codec, 24, 8)                \
    X(AdMediaFile, id, 32, 4)                   \
    X(AdMediaFile, bitrate, 36, 4)              \
    X(AdMediaFile, minBitrate, 40, 4)           \
    X(AdMediaFile, maxBitrate, 44, 4)           \
    X(AdMediaFile, scalable, 48, 4)             \
    X(AdMediaFile, maintainAspectRatio, 52, 4)  \
    X(AdMediaFile, url, 56, 8)                  \
    X(AdMediaFile, next, 64, 8)                 \
    X(AdTracking, event, 0, 8)                  \
    X(AdTracking, offsetKind, 8, 4)             \
    X(AdTracking, offset, 16, 8)                \
    X(AdTracking, url, 24, 8)                   \
    X(AdTracking, next, 32, 8)                  \
    X(AdParameters, next, 0, 8)                 \
    X(AdIcon, next, 0, 8)

/* X(record, size) */
#define KA_VAST_SIZES(X) \
    X(VastAdData, 32)    \
    X(AdData, 32)        \
    X(AdInLine, 88)      \
    X(AdWrapper, 56)     \
    X(AdImpression, 16)  \
    X(AdCreative, 136)   \
    X(AdLinear, 96)      \
    X(AdVideoClicks, 56) \
    X(AdClick, 24)       \
    X(AdMediaFile, 72)   \
    X(AdTracking, 40)    \
    X(AdParameters, 8)   \
    X(AdIcon, 8)

/* One measured field, as the C compiler laid it out. */
typedef struct KaVastFieldLayout {
    const char* name;
    unsigned long offset;
    unsigned long size;
} KaVastFieldLayout;

#ifdef __cplusplus
extern "C" {
#endif
/* The C compiler's view of every field of KA_VAST_FIELDS, in list order. */
const KaVastFieldLayout* ka_vast_layout_c(unsigned long* count);
/* The C compiler's sizeof of every record of KA_VAST_SIZES, in list order. */
const unsigned long* ka_vast_sizes_c(unsigned long* count);
#ifdef __cplusplus
}
#endif

#endif /* KA_TEST_VAST_LAYOUT_FIELDS_H */
