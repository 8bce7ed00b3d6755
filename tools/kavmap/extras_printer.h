// The extras of ka/vast_extras.h as JSON, printed under an ad's body and each creative when
// kavmap runs with --extras.
#pragma once

#include <cstdio>

#include "json_block.h"
#include "ka/vast_extras.h"

// "extras": the record, or null.
void JsonAdExtras(FILE* out, JsonBlock& parent, const KaAdExtras* extras);
void JsonCreativeExtras(FILE* out, JsonBlock& parent, const KaCreativeExtras* extras);
