/* What the Linux kernel tells about the processor, read once per process. */
#ifndef KA_CPU_INFO_H
#define KA_CPU_INFO_H

#include <stdint.h>

#include "ka/export.h"

/* Bits of CpuInfoRecord.features. */
#define KA_CPU_FEATURE_ARMV7 0x1u /* architecture 7 or later, not a "(v6l)" processor */
#define KA_CPU_FEATURE_VFPV3 0x2u /* "vfpv3" or "vfpv3d16" (also set by NEON) */
#define KA_CPU_FEATURE_NEON 0x4u  /* "neon" in the feature list */
#define KA_CPU_FEATURE_ARMV6 0x8u /* architecture 6 or later */

/* Processor type values of CpuInfoRecord.type. */
#define KA_CPU_TYPE_UNKNOWN 0 /* the processor description could not be read */
#define KA_CPU_TYPE_ARM 1

typedef struct CpuInfoRecord {
    int32_t type;        /* KA_CPU_TYPE_... */
    uint64_t features;   /* KA_CPU_FEATURE_... bits */
    int32_t count;       /* number of cores, at least 1 */
    int32_t maxCpuSpeed; /* core 0's maximum frequency in the kernel's unit (kHz); 0 if unknown */
    int32_t minCpuSpeed; /* core 0's minimum frequency, as above */
} CpuInfoRecord;

#ifdef __cplusplus
extern "C" {
#endif

/* Fills the caller's record; -1 for a null record, otherwise 0 (or pthread_once's error). The
 * description is read on the first call only; the record owns nothing. */
KA_API int get_cpu_info(CpuInfoRecord* info);

#ifdef __cplusplus
}
#endif

#endif /* KA_CPU_INFO_H */
