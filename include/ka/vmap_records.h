/* VMAP records: one AdInfo per handle, a list of AdBreak records, and below each break at most
 * one AdSource and a list of AdBreakTracking records. The handle owns every record; all of
 * them are zero-filled when created, every string is a heap copy owned by its record, and
 * everything stays valid until the next Process, or Close of the handle. */
#ifndef KA_VMAP_RECORDS_H
#define KA_VMAP_RECORDS_H

#include <stdint.h>

#include "ka/types.h"
#include "ka/vast_records.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Kinds of AdBreak.timeOffsetType, each giving timeOffset its meaning. */
#define TIME_OFFSET_NONE 0u      /* attribute absent or not understood; timeOffset 0 */
#define TIME_OFFSET_CLOCK 1u     /* milliseconds from the content's start */
#define TIME_OFFSET_PERCENT 2u   /* percent of the content ("%70" or "70%") */
#define TIME_OFFSET_START_END 3u /* 0 for "start", 1 for "end" */
#define TIME_OFFSET_POSITION 4u  /* ordinal break position ("#n"), at least 1 */

/* Flags of AdBreak.breakType, one per word of the breakType attribute. */
#define BREAK_TYPE_LINEAR 1u
#define BREAK_TYPE_NONLINEAR 2u
#define BREAK_TYPE_COMPANION 4u
#define BREAK_TYPE_SKIPPABLE 8u
#define BREAK_TYPE_ADPODS 16u

struct AdBreak;
struct AdSource;
struct AdBreakTracking;

/* Root of one VMAP document's records; embedded in the handle, its address never changes. */
typedef struct AdInfo {
    uint32_t adBreakCount;    /* number of breaks read; the length of the adBreaks list */
    struct AdBreak* adBreaks; /* first break in document order, null when there is none */
} AdInfo;

/* One vmap:AdBreak element. */
typedef struct AdBreak {
    uint32_t timeOffsetType;           /* TIME_OFFSET_* kind of timeOffset */
    int64_t timeOffset;                /* value of the timeOffset attribute; unit by kind */
    uint64_t linearDuration;           /* milliseconds of linear ads carried inline; 0 if none */
    uint32_t breakType;                /* BREAK_TYPE_* flags; 0 when the attribute is absent */
    char* breakId;                     /* breakId attribute (owned), or null */
    uint64_t repeatAfter;              /* repeatAfter in milliseconds; 0 if absent or no clock */
    struct AdSource* adSource;         /* first vmap:AdSource (owned), or null */
    struct AdBreakTracking* trackings; /* first break tracking record (owned), or null */
    struct AdBreak* next;              /* next break, or null at the end */
} AdBreak;

/* The first vmap:AdSource of a break: where the break's ads come from. */
typedef struct AdSource {
    int32_t id;               /* decimal id attribute; 0 when absent */
    KA_BOOL allowMultipleAds; /* 1 when the attribute is exactly "true", else 0 */
    KA_BOOL followRedirects;  /* 1 when the attribute is exactly "true", else 0 */
    char* adTagUri;           /* vmap:AdTagURI text (owned), never fetched; or null */
    char* reservedText;       /* kept for layout; never filled, freed with the record */
    VastAdData* vastAdData;   /* result of an inline VAST document (owned), or null */
} AdSource;

/* One vmap:Tracking element of a break's vmap:TrackingEvents. */
typedef struct AdBreakTracking {
    char* event;                  /* event attribute (owned), or null */
    char* url;                    /* element text (owned), or null */
    struct AdBreakTracking* next; /* next tracking record of the same break, or null */
} AdBreakTracking;

#ifdef __cplusplus
}
#endif

#endif /* KA_VMAP_RECORDS_H */
