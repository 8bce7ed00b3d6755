// VMAP documents through the public table, inline VAST included, then the same bytes in
// VAST-only mode. Wrapper downloads fail at once and never reach the network.
#include <cstddef>
#include <cstdint>

#include "api_harness.h"

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    kafuzz::Setup();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    kafuzz::RunOptions options;
    // Half the inputs read VMAP elements leniently too.
    options.lenient = size % 2 == 1;
    kafuzz::RunDocument(data, size, options);
    return 0;
}
