// Printing the records a Process built: a readable tree, or JSON keyed by the record fields.
#pragma once

#include <cstdint>
#include <cstdio>

#include "ka/vast_records.h"
#include "ka/vmap_parser_api.h"
#include "ka/vmap_parser_ext.h"
#include "ka/vmap_records.h"

// Slot 5 of the table: the container of a nested VAST parser object.
typedef uint32_t (*NestedVastFn)(void* parser, VastAdData** out);

// What one Process left for the host to read; any pointer may be null.
struct ProcessResult {
    const AdInfo* adInfo;
    const char* contentUri;
    const VastAdData* vastAdData;  // the handle's VAST result, when it lent one
    NestedVastFn nestedVast;       // reads unmerged wrappers' nested parsers; null: not shown
    bool vastOnly;                 // the document was a bare VAST document
    // The chain outcomes, printed after the records when trace is set (--trace).
    const KaChainOutcome* outcomes;
    bool trace;
    // With a table here (--extras), each ad body and creative also shows its extras, looked
    // up on handle; null: the records alone, as without the option.
    const VMAPParserExtAPI* extrasApi;
    void* handle;
    bool nestedOwner;  // handle is a wrapper's nestedParser: the GetNested* slots apply
};

// Nested parsers are shown down to this many levels below the document; the library stops
// following wrappers well before, so deeper ones would only come from a broken record tree.
constexpr unsigned int kMaxPrintedNesting = 16;

// What the handle lends after a Process, read through the table as a player reads it.
ProcessResult ReadResult(const VMAPParserAPI& api, void* handle, bool vastOnly);

void PrintText(FILE* out, const ProcessResult& result);
void PrintJson(FILE* out, const ProcessResult& result);
