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
    kafuzz::RunDocument(data, size, kafuzz::RunOptions());
    return 0;
}
