// The public KaChainOutcome records built from a ChainTrace, and their release. Every block they
// own is allocated and freed by the few functions of outcome_records.cpp.
#pragma once

#include "ka/vmap_parser_ext.h"
#include "vast/chain_trace.h"

namespace ka {

// Appends one outcome per ad of trace at the end of *head. Each record is linked in before
// anything below it is allocated: when an allocation throws, ReleaseChainOutcomes frees all.
void BuildChainOutcomes(const ChainTrace& trace, KaChainOutcome** head);
// Frees the list and everything it owns; sets head to null.
void ReleaseChainOutcomes(KaChainOutcome*& head);

}  // namespace ka
