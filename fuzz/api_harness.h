// What the two document fuzz targets share: the library's table loaded as a player loads it,
// with every download made to fail at once and without any network.
#pragma once

#include <cstddef>
#include <cstdint>

#include "ka/vmap_parser_api.h"

namespace kafuzz {

// Once per process (later calls change nothing): blocks network sockets, sets the source-IO
// module's limits and fills the table. fileDir, when given, is where relative wrapper
// references are read from; otherwise files are refused too. Aborts when the library or the
// modules cannot be loaded.
const VMAPParserAPI& Setup(const char* fileDir = nullptr);

// How one document is run.
struct RunOptions {
    bool vastOnly = false;          // the mode of the first Process
    bool stopped = true;            // the stop flag is already set: VAST-only downloads never start
    bool merge = true;              // wrapper ads are merged into the ads they lead to
    uint64_t fetchBytes = 0;        // KA_PID_VMAP_FETCH_BYTES; 0: the default
    uint32_t deadlineMs = 0;        // KA_PID_VMAP_DEADLINE_MS; 0: none
    const char* baseUrl = nullptr;  // KA_PID_VMAP_BASE_URL
    bool lenient = false;           // KA_PID_VMAP_LENIENT
};

// One document through a fresh handle on the build's modules: Open, Process in the first mode,
// a full read of the records, the same again in the other mode, Close. Returns what the first
// Process returned.
uint32_t RunDocument(const uint8_t* data, size_t size, const RunOptions& options);

}  // namespace kafuzz
