/* Field offsets and widths of the public VMAP records and the API table on LP64, shared by the
 * C and the C++ side of the layout test: X(record, field, offset, size). */
#ifndef KA_TEST_VMAP_LAYOUT_FIELDS_H
#define KA_TEST_VMAP_LAYOUT_FIELDS_H

#define KA_VMAP_FIELDS(X)                            \
    X(AdInfo, adBreakCount, 0, 4)                    \
    X(AdInfo, adBreaks, 8, 8)                        \
    X(AdBreak, timeOffsetType, 0, 4)                 \
    X(AdBreak, timeOffset, 8, 8)                     \
    X(AdBreak, linearDuration, 16, 8)                \
    X(AdBreak, breakType, 24, 4)                     \
    X(AdBreak, breakId, 32, 8)                       \
    X(AdBreak, repeatAfter, 40, 8)                   \
    X(AdBreak, adSource, 48, 8)                      \
    X(AdBreak, trackings, 56, 8)                     \
    X(AdBreak, next, 64, 8)                          \
    X(AdSource, id, 0, 4)                            \
    X(AdSource, allowMultipleAds, 4, 4)              \
    X(AdSource, followRedirects, 8, 4)               \
    X(AdSource, adTagUri, 16, 8)                     \
    X(AdSource, reservedText, 24, 8)                 \
    X(AdSource, vastAdData, 32, 8)                   \
    X(AdBreakTracking, event, 0, 8)                  \
    X(AdBreakTracking, url, 8, 8)                    \
    X(AdBreakTracking, next, 16, 8)                  \
    X(VMAPParserAPI, Open, 0, 8)                     \
    X(VMAPParserAPI, Close, 8, 8)                    \
    X(VMAPParserAPI, Process, 16, 8)                 \
    X(VMAPParserAPI, GetAdInfo, 24, 8)               \
    X(VMAPParserAPI, GetVastAdData, 32, 8)           \
    X(VMAPParserAPI, GetVastParserVastAdData, 40, 8) \
    X(VMAPParserAPI, SetParam, 48, 8)                \
    X(VMAPParserAPI, GetParam, 56, 8)

#define KA_VMAP_SIZES(X)   \
    X(AdInfo, 16)          \
    X(AdBreak, 72)         \
    X(AdSource, 40)        \
    X(AdBreakTracking, 24) \
    X(VMAPParserAPI, 64)

typedef struct KaVmapFieldLayout {
    const char* name;
    unsigned long offset;
    unsigned long size;
} KaVmapFieldLayout;

#ifdef __cplusplus
extern "C" {
#endif

/* The layout as the C compiler sees it, in the order of KA_VMAP_FIELDS / KA_VMAP_SIZES. */
const KaVmapFieldLayout* ka_vmap_layout_c(unsigned long* count);
const unsigned long* ka_vmap_sizes_c(unsigned long* count);
/* Constants as the C compiler sees them: kinds, flags, identifiers, result codes. */
const unsigned long* ka_vmap_constants_c(unsigned long* count);

#ifdef __cplusplus
}
#endif

#endif /* KA_TEST_VMAP_LAYOUT_FIELDS_H */
