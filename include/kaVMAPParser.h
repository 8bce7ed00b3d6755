/* Everything a player includes to use libkaVMAPParser: the API table, the records, the
 * parameter identifiers and the result codes. */
#ifndef KA_VMAP_PARSER_H
#define KA_VMAP_PARSER_H

#include "ka/chain_limits.h"
#include "ka/export.h"
#include "ka/result_codes.h"
#include "ka/types.h"
#include "ka/vast_records.h"
#include "ka/vmap_parser_api.h"
#include "ka/vmap_parser_ext.h"
#include "ka/vmap_records.h"

#endif /* KA_VMAP_PARSER_H */
