// Bare VAST documents through the public table in VAST-only mode (the stop flag already set,
// so wrapper downloads end before they start), then the same bytes in VMAP mode.
#include <cstddef>
#include <cstdint>

#include "api_harness.h"

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    kafuzz::Setup();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    kafuzz::RunOptions options;
    options.vastOnly = true;
    kafuzz::RunDocument(data, size, options);
    return 0;
}
