// The public KaChainOutcome records built from a ChainTrace, and their release. Each outcome is
// one block, allocated and freed by the two functions of outcome_records.cpp.
#pragma once

#include "ka/vmap_parser_ext.h"
#include "vast/chain_trace.h"

namespace ka {

// Appends one outcome per ad of trace at the end of *head, each linked in as soon as it exists:
// when an allocation throws, ReleaseChainOutcomes frees what was built.
void BuildChainOutcomes(const ChainTrace& trace, KaChainOutcome** head);
// Frees the list and everything it owns; sets head to null.
void ReleaseChainOutcomes(KaChainOutcome*& head);

}  // namespace ka
