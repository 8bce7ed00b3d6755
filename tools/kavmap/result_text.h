// Readable phrases for the library's result codes, for messages of the host.
#pragma once

#include <cstdint>

// A short phrase for code; "unknown result" for codes the library does not document.
const char* ResultText(uint32_t code);
