// The public KaChainOutcome records built from a ChainTrace. Each outcome is one block of the
// handle's arena, given back with the other records of the Process.
#pragma once

#include "ka/vmap_parser_ext.h"
#include "platform/arena.h"
#include "vast/chain_trace.h"

namespace ka {

// Appends one outcome per ad of trace at the end of *head, each allocated from records.
void BuildChainOutcomes(const ChainTrace& trace, Arena& records, KaChainOutcome** head);

}  // namespace ka
