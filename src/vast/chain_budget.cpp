#include "ka/logging.h"
#include "net/download.h"
#include "vast/chain_context.h"

namespace ka {

ChainBudget ChainBudget::Start(uint64_t fetchBytes, uint32_t deadlineMs) {
    ChainBudget budget = {};
    budget.fetchBytesLeft = fetchBytes;
    budget.deadline = deadlineMs != 0 ? MonotonicMs() + deadlineMs : 0;
    return budget;
}

bool ChainBudget::DeadlinePassed() const { return deadline != 0 && MonotonicMs() >= deadline; }

bool ChainBudget::TakeMergeBytes(size_t bytes) {
    const uint64_t cap =
        KA_VMAP_MERGE_BYTES_FLOOR + uint64_t{KA_VMAP_MERGE_BYTES_PER_PARSED_BYTE} * parsedBytes;
    if (mergeBytes + bytes <= cap) {
        mergeBytes += bytes;
        return true;
    }
    ++mergeRefusals;
    if (!mergeCapLogged) {
        mergeCapLogged = true;
        kalogPrint_ConstStr0x010d0000(
            0,
            "kaVMAPParser: merge copies reached their share of the parsed documents; "
            "further wrapper tracking is not copied");
    }
    return false;
}

}  // namespace ka
