// The extras of ka/vast_extras.h as JSON or text, printed under an ad's body and each creative when
// kavmap runs with --extras.
#pragma once

#include <cstdio>

#include "json_block.h"
#include "ka/vast_extras.h"

// "extras": the record, or null.
void JsonAdExtras(FILE* out, JsonBlock& parent, const KaAdExtras* extras);
void JsonCreativeExtras(FILE* out, JsonBlock& parent, const KaCreativeExtras* extras);
// The same as indented text lines under "extras:", only what is set; nothing for null.
void PrintAdExtras(FILE* out, int level, const KaAdExtras* extras);
void PrintCreativeExtras(FILE* out, int level, const KaCreativeExtras* extras);
