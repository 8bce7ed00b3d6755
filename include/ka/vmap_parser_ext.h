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
