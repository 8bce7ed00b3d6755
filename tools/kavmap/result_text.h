// Readable phrases for the library's result codes, for messages of the host.
#pragma once

#include <cstdint>

// A short phrase for code; "unknown result" for codes the library does not document.
const char* ResultText(uint32_t code);

// Names of KaChainOutcome's state and reason (ka/vmap_parser_ext.h); "unknown" for others.
const char* ChainStateText(uint32_t state);
const char* ChainReasonText(uint32_t reason);
