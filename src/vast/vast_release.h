// Releases of the VAST records. They free everything below the record, null what they freed,
// accept null and always return 0; they need no parser, so the VMAP parser calls them directly
// and CVASTParser's members of the same names forward to them.
#pragma once

#include "ka/vast_records.h"

namespace ka {

// Frees the container's ads and error URL; depth stays.
unsigned int ReleaseVastAdData(VastAdData* data);
// Frees the ad's id and body (a wrapper's nested parser with its records included); the node
// itself, its sequence, type and next stay.
unsigned int ReleaseAdData(AdData* ad);
// Frees the lists of a linear creative and zeroes it.
unsigned int ReleaseLinear(AdLinear* linear);

}  // namespace ka
