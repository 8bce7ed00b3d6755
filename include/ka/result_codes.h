/* Result codes of libkaVMAPParser: 32-bit unsigned, 0 for success. */
#ifndef KA_RESULT_CODES_H
#define KA_RESULT_CODES_H

#define KA_OK 0x00000000u
/* An auxiliary module (XML parser, logging library) is not loaded. */
#define KA_ERR_MODULE_NOT_LOADED 0x90000001u
/* A document could not be loaded or has no root element; also a failed CDATA extraction and
 * several download failures. */
#define KA_ERR_LOAD_FAILED 0x91001000u
/* A null handle or argument at the public table, or a null URL for a download. */
#define KA_ERR_NULL_ARGUMENT 0x9100100bu
/* A download ran past its read time limit or its retry limit. */
#define KA_ERR_DOWNLOAD_TIMEOUT 0x91005002u
/* The source-IO module reported a failed transfer, or the caller stopped the download. */
#define KA_ERR_DOWNLOAD_FAILED 0x91127000u
/* The source-IO table lacks Init or Open, or Init gave no handle. */
#define KA_ERR_DOWNLOAD_OPEN 0x91127002u

#endif /* KA_RESULT_CODES_H */
