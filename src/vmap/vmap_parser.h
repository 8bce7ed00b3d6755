// CVMAPParser is the object behind every handle of the public table: it reads a VMAP document
// into the AdInfo records, walking the tree through the XML module it holds as a CXMLDocument
// and dispatching each element's direct children by name to one handler per parent element.
// VAST documents, inline in an ad source or bare in VAST-only mode, go to the one CVASTParser
// the handle owns.
#pragma once

#include <string>

#include "ka/types.h"
#include "ka/vast_records.h"
#include "ka/vmap_parser_ext.h"
#include "ka/vmap_records.h"
#include "vast/chain_context.h"
#include "vast/chain_trace.h"
#include "xml/record_lists.h"
#include "xml/xml_document.h"

class CVASTParser;

class CVMAPParser : public CXMLDocument {
public:
    // A child handler: (child element, target record, element name, name length); always 0.
    typedef unsigned int (CVMAPParser::*TagHandler)(void* node, void* target, char* name,
                                                    unsigned int length);

    CVMAPParser();
    ~CVMAPParser() override;

    // Virtual slots after the loader's, in this order: the public table calls them by slot.
    // Stores workPath by pointer and loads the XML module: 0, Init's code, or 0x90000001.
    virtual unsigned int Open(char* workPath);
    // Releases every record and unloads the XML module; always 0.
    virtual unsigned int Close();
    // Releases the previous records, then reads the buffer: 0 or 0x91001000.
    virtual unsigned int Process(void* buffer, unsigned int size);
    // Writes the address of mAdInfo when out is not null; always 0.
    virtual unsigned int GetAdInfo(AdInfo** out);
    // Writes the owned VAST parser's container when one exists, else nothing; always 0.
    virtual unsigned int GetVastAdData(VastAdData** out);
    // The KA_PID_VMAP_* parameters; unknown identifiers are ignored; always 0.
    virtual unsigned int SetParam(unsigned int id, void* value);
    virtual unsigned int GetParam(unsigned int id, void* value);

    // Writes the chain outcomes of the last Process (null when it read no ad) when out is not
    // null; always 0.
    unsigned int GetChainOutcomes(KaChainOutcome** out);
    // The extras of an ad body or creative of the last Process (ka/vast_extras.h); null: none.
    const ka::Arena& Records() const { return mRecords; }

    // Close without unloading the module: the handle stays open; always 0.
    unsigned int Reset();
    // Frees the records of the last Process, leaving an empty AdInfo; always 0.
    unsigned int ReleaseAdInfo();

    // The owned VAST parser: created on the working path, building its records in this
    // handle's arena and reading through this handle's XML module (nothing is loaded per
    // Process), and closed and destroyed. Destroying it does not release its container; the
    // object is set aside for the next one to reuse.
    void CreateVASTParser();
    void DestroyVASTParser();
    // Reads the VAST child of a vmap:VASTAdData / vmap:VASTData element into block, which then
    // owns the records; no VAST child leaves the block as it is. Always 0.
    unsigned int LoadVASTAdData(void* node, VastAdData* block);
    // Adds the durations of the linear creatives of the break's inline InLine ads to its
    // linearDuration.
    void SumLinearDuration(AdBreak* adBreak);

    // Calls handler for each direct child of node that has a name; always 0.
    unsigned int LoadTag(void* node, void* target, TagHandler handler);
    unsigned int LoadVMAPTag(void* node, void* target, char* name, unsigned int length);
    unsigned int LoadAdBreakTag(void* node, void* target, char* name, unsigned int length);
    unsigned int LoadAdSourceTag(void* node, void* target, char* name, unsigned int length);
    unsigned int LoadTrackingTag(void* node, void* target, char* name, unsigned int length);
    unsigned int ParseAdBreakAttributes(void* node, AdBreak* adBreak);
    unsigned int ParseAdSourceAttributes(void* node, AdSource* source);
    unsigned int ParseTrackingEvent(void* node, AdBreakTracking* tracking);

    char* mContentUri;
    AdInfo mAdInfo;
    CVASTParser* mVastParser;
    unsigned int mVastOnly;
    unsigned int mMergeWrappers;
    KA_BOOL* mStopFlag;
    bool mReadExtras = true;  // KA_PID_VMAP_READ_EXTRAS
    bool mLenient = false;    // KA_PID_VMAP_LENIENT

private:
    // KA_PID_VMAP_LENIENT: the prefixes the root binds to the VMAP namespace (declarations on
    // other elements are not seen), kept as pointers into the document being read.
    void FindVmapPrefixes(void* root);
    // Whether name is the VMAP element local: "vmap:" + local, and when lenient also local
    // alone or under a prefix FindVmapPrefixes found.
    bool IsVmap(const char* name, unsigned int length, const char* local) const;
    struct Prefix {
        const char* name;
        unsigned int length;
    };
    static constexpr unsigned int kMaxVmapPrefixes = 4;
    Prefix mPrefixes[kMaxVmapPrefixes] = {};
    unsigned int mPrefixCount = 0;

    // Everything Close does before unloading the module, the spare VAST parser aside.
    void ReleaseAll();
    // The VAST parser that DestroyVASTParser set aside, closed, for CreateVASTParser to renew;
    // null when there is none. Freed at Close.
    CVASTParser* mSpareVastParser = nullptr;
    void FreeSpareVASTParser();
    // Turns the trace of the Process that ends into the records GetChainOutcomes lends.
    void PublishOutcomes();
    void ReadContentUri(void* extensions);
    // Frees the VAST records of an ad source's block, then the block.
    void ReleaseVastBlock(VastAdData* block);
    // What each Process may spend on its wrapper chains, from the parameters of
    // "ka/chain_limits.h"; the budget is started anew by each Process.
    uint64_t mFetchBytes;
    uint32_t mDeadlineMs;
    std::string mBaseUrl;  // empty: none
    ka::ChainBudget mBudget;
    // The chain of the VAST elements of the last VMAP Process, started by that Process.
    ka::ChainContext mInlineChain;
    // What the chains of the running Process did, and the records made of it when it ended.
    ka::ChainTrace mTrace;
    KaChainOutcome* mOutcomes;
    // Every record and string of the last Process, the VAST parsers' included; given back at
    // once when they are released.
    ka::Arena mRecords;
    // The last records appended, so that long lists are filled in linear time.
    ka::ListTail<AdBreak> mBreakTail;
    ka::ListTail<AdBreakTracking> mTrackingTail;
    // 1 when the records of the last Process are the VAST parser's own container (a VAST-only
    // Process), 0 when they are the AdBreak list. The caller may switch mVastOnly between
    // Processes, so releases go by this, not by the current mode.
    unsigned int mBuiltVastOnly;
};
