// Printing the records a Process built: a readable tree, or JSON keyed by the record fields.
#pragma once

#include <cstdio>

#include "ka/vast_records.h"
#include "ka/vmap_records.h"

// What one Process left for the host to read; any pointer may be null.
struct ProcessResult {
    const AdInfo* adInfo;
    const char* contentUri;
    const VastAdData* vastAdData;  // the handle's VAST result, when it lent one
};

void PrintText(FILE* out, const ProcessResult& result);
void PrintJson(FILE* out, const ProcessResult& result);
