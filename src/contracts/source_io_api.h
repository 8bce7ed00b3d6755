// What the library, the stand-in source-IO module and the command-line host agree on beyond the
// table in "ka/download.h": parameter ids, their value records, and the codes GetSourceSize
// answers.
#pragma once

#include <cstdint>

#include "ka/download.h"

namespace ka {

// ---- Parameters the library passes (value shapes belong to the module) ----

// SetParam, null handle, right after the entry: the working path (char*).
constexpr uint32_t kSioWorkPath = 0x4700001d;
// SetParam after Init: the host's four request records, opaque to the library.
constexpr uint32_t kSioRequest1 = 0x47000054;
constexpr uint32_t kSioRequest2 = 0x47000060;
constexpr uint32_t kSioRequest3 = 0x11000006;
constexpr uint32_t kSioRequest4 = 0x11000008;
// SetParam after Init: the host's string (char*). The stand-in sends it as the User-Agent.
constexpr uint32_t kSioHostText = 0x11000013;
// GetParam in the read loop: the number of attempts made so far (uint64_t*).
constexpr uint32_t kSioRetryCount = 0x11000002;
// GetParam after a complete read: SourceFinalUrlQuery*.
constexpr uint32_t kSioFinalUrl = 0x11000004;
// GetParam at the end of a successful download: the host's out record. The stand-in fills a
// SourceResponseInfo there.
constexpr uint32_t kSioResponseInfo = 0x11000012;

// ---- Module-wide settings of the stand-in module (SetParam / GetParam on a null handle) ----
// Numbers pass as const uint32_t*; they apply to sources created by later Init calls.

// Connect timeout in ms (default 5000, 0 restores it).
constexpr uint32_t kSioConnectTimeoutMs = 0x7a000001;
// Total transfer time limit in ms (default 15000, 0 restores it).
constexpr uint32_t kSioTotalTimeoutMs = 0x7a000002;
// Non-zero allows file:// URLs and plain paths (default 0: http and https only).
constexpr uint32_t kSioAllowFiles = 0x7a000003;
// Directory (const char*, null clears) against which relative paths are read when files are
// allowed. Only files whose real path (symlinks resolved) lies inside it are read; without one
// no file is read.
constexpr uint32_t kSioFileBaseDir = 0x7a000004;
// Redirects followed at most (default 5).
constexpr uint32_t kSioMaxRedirects = 0x7a000005;

// Defaults of the stand-in module.
constexpr uint32_t kSioDefaultConnectTimeoutMs = 5000;
constexpr uint32_t kSioDefaultTotalTimeoutMs = 15000;
constexpr uint32_t kSioDefaultMaxRedirects = 5;
// Largest body the module keeps; the same bound as the host operations'.
constexpr uint32_t kSioMaxBodySize = KA_DOWNLOAD_MAX_SIZE;

// ---- Codes ----

// GetSourceSize: the transfer failed (network error, HTTP status >= 400, timeout, body too
// large, URL not allowed). Init: the URL does not fit the module's 2048 bytes; it is never cut.
constexpr uint32_t kSioFailed = 0x91127000;
// GetSourceSize: the body has not fully arrived yet; Read: nothing available yet.
constexpr uint32_t kSioNotReady = 2;
// Read: the source ended; the bytes returned are its last ones.
constexpr uint32_t kSioEnd = 1;

// GetParam kSioFinalUrl: the module writes the URL reached after redirects into out.
struct SourceFinalUrlQuery {
    char* url;           // the request URL
    uint32_t urlLength;  // strlen(url)
    char* out;           // receives the final URL, terminated
    uint32_t outSize;    // bytes in out (2048)
};

// GetParam kSioResponseInfo, as the stand-in fills it.
struct SourceResponseInfo {
    uint32_t httpStatus;  // last HTTP status, 0 for files
    uint32_t redirects;   // redirects followed
    uint64_t bodySize;    // bytes received
};

}  // namespace ka
