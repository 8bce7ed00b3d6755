// Wrapper chains: the input is up to nine documents separated by NUL bytes (chain_files.h).
// The first is processed in VAST-only mode, then in VMAP mode; the others are files that
// relative VASTAdTagURI references ("1" to "8") lead to, as written or resolved against a base
// URL in the folder. The input's size also picks the merge setting, a small byte budget and a
// short deadline. Network URLs still fail at once and never leave the machine.
#include <stdlib.h>

#include <cstddef>
#include <cstdint>
#include <string>

#include "api_harness.h"
#include "chain_files.h"

namespace {

std::string gDir;
std::string gBaseUrl;

void RemoveFolder() { kachain::RemoveFolder(gDir); }

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    char pattern[] = "/tmp/ka-fuzz-chain-XXXXXX";
    if (mkdtemp(pattern) == nullptr) abort();
    gDir = pattern;
    gBaseUrl = "file://localhost" + gDir + "/0";
    atexit(RemoveFolder);
    kafuzz::Setup(gDir.c_str());
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const auto first = kachain::WriteFiles(gDir, data, size);
    if (!first.second) abort();
    kafuzz::RunOptions options;
    options.vastOnly = true;
    options.stopped = false;
    // Merging on for most inputs, off for some, and the limits, chosen by the input itself.
    options.merge = size % 4 != 0;
    options.fetchBytes = size % 3 == 0 ? size / 2 + 1 : 0;
    options.deadlineMs = size % 5 == 0 ? 5 : 0;
    options.baseUrl = size % 2 == 0 ? gBaseUrl.c_str() : nullptr;
    kafuzz::RunDocument(first.first.first, first.first.second, options);
    return 0;
}
