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
/* Memory ran out inside the library. The call did nothing lasting: a Process releases whatever
 * it had built (the handle then holds no records, as after a failed load, and keeps its
 * parameters), Open leaves *handle untouched, SetParam keeps the earlier value. The handle stays
 * usable; a later Process may succeed. */
#define KA_ERR_NO_MEMORY 0x91001002u
/* A C++ exception other than an allocation failure reached the public table, such as one thrown
 * by a host's extension parser; the handle is left as after KA_ERR_NO_MEMORY. */
#define KA_ERR_INTERNAL 0x91001003u
/* The result does not fit the caller's buffer; the buffer holds an empty string and the size
 * that fits is reported (kaExpandVASTMacros). */
#define KA_ERR_BUFFER_TOO_SMALL 0x91003001u

#endif /* KA_RESULT_CODES_H */
