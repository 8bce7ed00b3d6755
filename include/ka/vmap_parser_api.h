/* The parser's table of eight functions, the parameter identifiers and the two exported
 * entries. A player calls kaGetVMAPParserAPI once, then Open, any number of Process calls
 * with their reads, and Close. Every function returns a result code (ka/result_codes.h). */
#ifndef KA_VMAP_PARSER_API_H
#define KA_VMAP_PARSER_API_H

#include <stdint.h>

#include "ka/export.h"
#include "ka/result_codes.h"
#include "ka/types.h"
#include "ka/vast_records.h"
#include "ka/vmap_records.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Parameter identifiers for SetParam and GetParam; the value is the pointer argument itself. */
/* Get: value is a char** receiving the content URI of the last Process (handle-owned), or
 * null. Set: ignored. */
#define KA_PID_VMAP_CONTENT_URI 0x44000001u
/* Set: bare VAST documents when value is non-null, VMAP when null. Get: value is an
 * unsigned int* receiving 1 or 0. */
#define KA_PID_VMAP_VAST_ONLY 0x44000002u
/* Set: merge wrapper ads into the ads they lead to when value is non-null (default). */
#define KA_PID_VMAP_MERGE_WRAPPERS 0x44000003u
/* Set: value is a caller-owned KA_BOOL* that stops downloads when it becomes true; it must
 * stay valid while Process runs. Null (default) means never stopped. */
#define KA_PID_VMAP_STOP_FLAG 0x44000004u

/* The table kaGetVMAPParserAPI fills, in this slot order. */
typedef struct VMAPParserAPI {
    /* Creates a handle into *handle (untouched on failure). workPath is the module
     * directory, ending in "/"; it is kept by pointer, so it must live until Close. */
    uint32_t (*Open)(void** handle, char* workPath);
    /* Releases every record and the handle itself; the handle must not be used again. */
    uint32_t (*Close)(void* handle);
    /* Parses size bytes of buffer (a VMAP document, or VAST in VAST-only mode), first
     * releasing what the previous Process built. The buffer is not kept. */
    uint32_t (*Process)(void* handle, void* buffer, uint32_t size);
    /* Lends the handle's AdInfo through *out (when out is not null). */
    uint32_t (*GetAdInfo)(void* handle, AdInfo** out);
    /* Lends the handle's VAST result through *out; *out untouched when there is none. */
    uint32_t (*GetVastAdData)(void* handle, VastAdData** out);
    /* Lends the VAST result of a nested VAST parser object (not a handle) through *out. */
    uint32_t (*GetVastParserVastAdData)(void* parser, VastAdData** out);
    /* Sets one KA_PID_VMAP_* parameter; unknown identifiers are ignored. */
    uint32_t (*SetParam)(void* handle, uint32_t id, void* value);
    /* Reads one KA_PID_VMAP_* parameter through value (nothing written when value is null). */
    uint32_t (*GetParam)(void* handle, uint32_t id, void* value);
} VMAPParserAPI;

/* Fills the eight slots of *api (must not be null); returns 0. */
KA_EXTERN_C KA_API uint32_t kaGetVMAPParserAPI(VMAPParserAPI* api);
/* The address of kaGetVMAPParserAPI, as an integer. */
KA_EXTERN_C KA_API uintptr_t kaGetVMAPParserAPIAdapter(void);

/* Signature of kaGetVMAPParserAPI, for players that look it up with dlsym. */
typedef uint32_t (*KaGetVMAPParserAPIFn)(VMAPParserAPI* api);

#ifdef __cplusplus
}
#endif

#endif /* KA_VMAP_PARSER_API_H */
