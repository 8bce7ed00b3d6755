/* VAST ad records: one VastAdData per VAST document, holding a list of AdData records. Every
 * record is zero-filled when created; every string is a heap copy owned by its record. */
#ifndef KA_VAST_RECORDS_H
#define KA_VAST_RECORDS_H

#include <stdint.h>

#include "ka/types.h"

#ifdef __cplusplus
extern "C" {
#endif

struct AdData;

/* The result of one VAST document. */
typedef struct VastAdData {
    uint32_t adCount;       /* <Ad> elements read; not changed by the wrapper merge */
    struct AdData* firstAd; /* first ad in document order, or null */
    char* errorUrl;         /* root <Error> text (last non-empty wins), or null */
    uint32_t depth;         /* wrapper hops above this document: 0 for the caller's own */
} VastAdData;

#ifdef __cplusplus
}
#endif

#endif /* KA_VAST_RECORDS_H */
