// Downloads through the source-IO module. ka_download_by_url loads the module for one document
// and is what the parsers use; ReadSourceData is the read loop shared with the host operations
// in "ka/download.h".
#pragma once

#include <cstdint>

#include "ka/download.h"
#include "ka/os_utils.h"
#include "ka/types.h"
#include "platform/limits.h"

// Fetches url (handed to the module unchanged) with the module found in workPath (may be null).
// Once the read stage is reached, *data holds a buffer from array new (owned by the caller, also
// on failure) and *size the bytes read; earlier failures leave both untouched. stopFlag may be
// null; a flag set by another thread ends the waiting. 0 on success; KA_ERR_NO_MEMORY when
// the buffer cannot be had (nothing is thrown).
uint32_t ka_download_by_url(char* url, unsigned char** data, uint32_t* size, char* workPath,
                            KA_BOOL* stopFlag);

namespace ka {

// The clock of download deadlines: milliseconds of CLOCK_MONOTONIC.
inline uint64_t MonotonicMs() { return GetTimeNs() / 1000000u; }

// What a wrapped document's download may spend, and what it reports besides the body.
struct DocumentFetch {
    uint64_t maxBytes;        // a larger document fails and nothing of it is kept; 0: no limit
    uint64_t deadline;        // MonotonicMs at which the wait ends; 0: none
    char finalUrl[kUrlSize];  // on success, the URL reached after redirects, or ""
    bool overLimit;           // set when the document was larger than maxBytes
};

// ka_download_by_url with the limits of fetch (may be null: none). A download still waiting at
// the deadline ends with KA_ERR_DOWNLOAD_TIMEOUT within one poll of it.
uint32_t DownloadDocument(char* url, unsigned char** data, uint32_t* size, char* workPath,
                          KA_BOOL* stopFlag, DocumentFetch* fetch);

}  // namespace ka

// Reads *ioSize bytes into dst; *ioSize then holds the bytes read. maxRetries all ones and
// timeoutMs 0xFFFFFFFF mean no limit. 0, 1 when the source ended early, 0x91127000 when stopped
// with the flag at 1, 0x91005002 past a limit, or the module's code.
uint32_t ReadSourceData(SourceIOApi* api, void* handle, uint8_t* dst, uint32_t* ioSize,
                        KA_BOOL* stopFlag, uint64_t maxRetries, uint32_t timeoutMs);
uint32_t ReadSourceData(SourceIOApi* api, void* handle, uint8_t* dst, uint32_t* ioSize,
                        KA_BOOL* stopFlag, uint64_t maxRetries);
