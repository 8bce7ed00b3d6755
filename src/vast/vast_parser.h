// CVASTParser reads one VAST document, or the VAST element of another parser's document, into
// the VastAdData records of ka/vast_records.h. It walks the tree through the XML module it
// loads as a CXMLDocument: LoadTag hands each child element to one member handler per parent
// element, and the handlers fill the records.
#pragma once

#include <cstddef>

#include "ka/types.h"
#include "ka/vast_records.h"
#include "vast/chain_context.h"
#include "vast/extras_records.h"
#include "xml/record_lists.h"
#include "xml/xml_document.h"

class CExtensionParser;

class CVASTParser : public CXMLDocument {
public:
    // Handler of one child element: (child node, record being filled, tag name, name length).
    typedef unsigned int (CVASTParser::*TagHandler)(void* node, void* target, char* name,
                                                    unsigned int nameLength);

    CVASTParser();
    // Closes the parser; the records in mVastAdData belong to whoever holds them and stay.
    ~CVASTParser() override;

    // Virtual slots, after the eleven of CLibLoader, in this order.
    // Stores the working path (kept by pointer) and loads the XML module: InitXMLParser's result.
    virtual unsigned int Open(char* workingPath);
    // Unloads the XML module and, when that worked, destroys the extension parser.
    virtual unsigned int Close();
    // Parses a whole VAST document; 0, or 0x91001000 when it cannot be loaded or has no root.
    // Closes the parser when done: a second Process needs a new Open.
    virtual unsigned int Process(void* buffer, unsigned int size, KA_BOOL mergeWrappers,
                                 KA_BOOL* stopFlag);
    // KA_PID_VAST_EXTENSION_PARSER installs a CExtensionParser* that this object then owns;
    // other ids are ignored. Hides CXMLDocument's forwarder to the XML module on purpose.
    virtual unsigned int SetParam(unsigned int id, void* value);
    // Reports nothing; always 0.
    virtual unsigned int GetParam(unsigned int id, void* value);
    // Reads the children of a VAST element into mVastAdData, then walks its Wrapper ads. The
    // element heads a chain of its own, with this parser's flags and the fetches it has left.
    virtual unsigned int ParseVASTNode(void* node, bool ownsDocument, bool mergeWrappers);

    // Process and ParseVASTNode as a part of the given chain: a wrapped document, or a VAST
    // element of the VMAP parser's document. ProcessInChain takes its flags from the chain.
    unsigned int ProcessInChain(void* buffer, unsigned int size, ka::ChainContext& chain);
    unsigned int ParseVASTNodeInChain(void* node, bool ownsDocument, bool mergeWrappers,
                                      ka::ChainContext& chain);
    // Forgets the records of mVastAdData without releasing them: whoever copied the container
    // owns them now.
    void ForgetVastAdData();
    // Builds the records in arena, which must outlive them: the handle's arena for the handle's
    // parser, the parent's for a nested one. A parser made on its own uses an arena of its own,
    // freed with the parser.
    void UseArena(ka::Arena* arena) { mArena = arena; }
    // Closes the parser and returns it to the state of a new one, its arena aside, so that a
    // handle reads each document with the parser of the one before instead of a new one. What
    // mVastAdData held is forgotten: it must have been released or handed on.
    void Renew();

    // Calls handler for every child element of node that has a non-empty name; always 0.
    unsigned int LoadTag(void* node, void* target, TagHandler handler);

    // Document, ad, InLine and Wrapper levels (ad_handlers.cpp).
    unsigned int LoadVASTTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadAdAttributes(void* node, AdData* ad);
    unsigned int LoadAdTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadInLineTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadCreativesTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadWrapperTag(void* node, void* target, char* name, unsigned int nameLength);

    // Creative level (creative_handlers.cpp). LoadCreative's target is the head of a creative
    // list (AdCreative**); it returns 0x91001000 for anything but a "Creative" element.
    unsigned int LoadCreative(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadCreativeTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadCreativeAttributes(void* node, AdCreative* creative);
    unsigned int LoadIgnoredTag(void* node, void* target, char* name, unsigned int nameLength);

    // Linear level (linear_handlers.cpp).
    unsigned int LoadLinearTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadMediaFilesTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadVideoClicksTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadTrackingEventsTag(void* node, void* target, char* name,
                                       unsigned int nameLength);
    unsigned int LoadSkipOffset(void* node, AdLinear* linear);
    unsigned int LoadMediaFileAttributes(void* node, AdMediaFile* mediaFile);
    unsigned int LoadTrackingAttributes(void* node, AdTracking* tracking);

    // Wrapper chain (wrapper_chain.cpp).
    // Downloads the ad's vastAdTagUri and parses it with a nested parser one level deeper, in
    // the same chain, which the wrapper body then owns. 0 when there is nothing to fetch,
    // 0x91001000 when a limit of the chain (fetches, bytes, deadline, the reference's length or
    // scheme) refuses it or the download fails or is empty, otherwise the nested Process result.
    unsigned int FetchWrapper(AdData* ad, ka::ChainContext& chain);
    // Puts the first ad of the nested parser's result in the wrapper ad's place and copies the
    // wrapper's impressions, click tracking and tracking events into it; destroys the nested
    // parser. Leaves the ad as it is without a nested parser. Always 0.
    unsigned int MergeWrapper(AdData* ad);
    // Copies the tracking of the wrapper's Linear creatives into every Linear creative of
    // inlineCreatives.
    unsigned int MergeCreatives(AdWrapper* wrapper, AdCreative* inlineCreatives);
    // MergeCreatives for one pair: appends copies of wrapperCreative's click tracking, custom
    // clicks and tracking events to those of inlineCreative (both Linear) and sets their counts
    // to the list lengths.
    unsigned int MergeLinear(AdCreative* wrapperCreative, AdCreative* inlineCreative);
    // Appends deep copies of list, in list order, at end (each node and string newly
    // allocated), writing end's count into count after each node: a list whose releases go by
    // its count never holds a node past it. Past the Process's share of merge copies
    // (ka::ChainBudget) a list is copied only in part. list must not be the target list.
    void CopyImpressionList(const AdImpression* list, ka::ListEnd<AdImpression>& end,
                            uint32_t& count);
    void CopyClickList(const AdClick* list, ka::ListEnd<AdClick>& end, uint32_t& count);
    void CopyTrackingList(const AdTracking* list, ka::ListEnd<AdTracking>& end, uint32_t& count);

    // VAST 4 extras (extras_handlers.cpp): records of ka/vast_extras.h indexed beside the
    // records (extras_records.h), read in the same walk. The record handlers call these for
    // elements and attributes they do not keep.
    // Starts the extras of a new ad body: the Ad's adType, the Wrapper's attributes.
    void BeginAdExtras(void* bodyNode, const void* body, bool wrapper);
    void BeginCreativeExtras(const AdCreative* creative);
    // A child of InLine or Wrapper; a child of Creative other than Linear; a child of MediaFiles
    // other than MediaFile.
    void LoadAdExtra(void* node, char* name, unsigned int nameLength);
    void LoadCreativeExtra(void* node, char* name, unsigned int nameLength);
    void LoadMediaExtra(void* node, char* name, unsigned int nameLength);
    void LoadCreativeExtraAttributes(const XMLAttributeValue& apiFramework,
                                     const XMLAttributeValue& legacyAdId);
    // values: fileSize, mediaType, apiFramework.
    void LoadMediaFileExtras(const AdMediaFile* mediaFile, const XMLAttributeValue* values);
    struct ExtrasTarget;
    unsigned int LoadExtensionExtraTag(void* node, void* target, char* name,
                                       unsigned int nameLength);
    unsigned int LoadViewableTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadVerificationsTag(void* node, void* target, char* name,
                                      unsigned int nameLength);
    unsigned int LoadVerificationTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadExtraTrackingTag(void* node, void* target, char* name,
                                      unsigned int nameLength);
    unsigned int LoadNonLinearAdsTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadNonLinearTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadCompanionAdsTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadCompanionTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadIconsTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadIconTag(void* node, void* target, char* name, unsigned int nameLength);
    unsigned int LoadFallbackImageTag(void* node, void* target, char* name,
                                      unsigned int nameLength);
    unsigned int LoadCaptionsTag(void* node, void* target, char* name, unsigned int nameLength);
    // Appends copies of the wrapper body's verifications and viewability URLs to the InLine
    // body's extras, and of its creatives' companion and non-linear tracking to those of the
    // InLine's creatives (extras_merge.cpp).
    void MergeExtras(const AdWrapper* wrapper, const AdInLine* inLine);

    // Releases (vast_release.cpp): forward to the functions of vast_release.h, which free
    // everything below the record, null what they freed, accept null and always return 0.
    unsigned int ReleaseVastAdData(VastAdData* data);
    // Frees the ad's id and body; the node itself, its sequence, type and next stay.
    unsigned int ReleaseAdData(AdData* ad);
    // Frees the lists of a linear creative and zeroes it.
    unsigned int ReleaseLinear(AdLinear* linear);

    VastAdData mVastAdData;              // result of the documents parsed by this object
    unsigned int mMaxDepth;              // a parser at this wrapper depth follows no wrapper
    CExtensionParser* mExtensionParser;  // owned; null when none is installed
    KA_BOOL mMergeWrappers;              // merge flag of the last Process, for nested parsers
    KA_BOOL* mStopFlag;                  // stop flag of the last Process; null without one
    unsigned int mFetchesLeft;           // fetches left to the last chain this parser headed
    ka::ChainBudget* mBudget;            // the budget of the chain being read; null: none
    bool mReadExtras = true;             // KA_PID_VMAP_READ_EXTRAS; nested parsers inherit it

private:
    // <Extensions> of an InLine or Wrapper into its extensions field: the Parse result.
    unsigned int LoadExtensions(void* node, CAdExtensions*& extensions);
    // Wrapper ads of mVastAdData, in list order, while this document is above the depth limit.
    void WalkWrappers(bool mergeWrappers, ka::ChainContext& chain);
    // Whether the chain records an outcome for ad: every ad of the caller's document, and the
    // first ad of each wrapped document on the path.
    bool OnPath(const ka::ChainContext& chain, const AdData* ad) const;
    // Whether the root declares a VAST version from 2 to 4, or none.
    bool ReadsVersion(void* root);
    // The URL to fetch for a wrapper's reference, seen from documentUrl (may be null) into out
    // (kUrlSize bytes); false when it does not fit or is not allowed from that document.
    static bool ResolveWrappedUrl(const char* reference, const char* documentUrl, char* out);
    // Charges one merge copy to the budget; false when it is spent.
    bool TakeCopy(size_t recordBytes, const char* text);
    // The one merge primitive of MergeCreatives and MergeLinear: appends copies of the click
    // tracking, custom clicks (of each source's first VideoClicks) and tracking events of count
    // Linear sources, in their order, to target, walking each list of target to its end once.
    void AppendLinearTracking(AdLinear* target, AdLinear* const* sources, size_t count);
    // The extras of the ad or creative being read, made and indexed on first need.
    KaAdExtras* AdExtras();
    KaCreativeExtras* CreativeExtras();
    // A Static/IFrame/HTML resource appended to list; false for any other element.
    bool LoadResource(void* node, char* name, unsigned int nameLength, ka::Tail<KaResource>& list);
    // A URL element (text and "id") appended to list.
    void AppendUrl(void* node, ka::Tail<KaUrl>& list);
    // Copies of the extras lists for the merge, charged to the budget like the others.
    void CopyUrlList(const KaUrl* list, ka::Tail<KaUrl>& end);
    void CopyVerifications(const KaVerification* list, ka::Tail<KaVerification>& end);

    // Forgets the remembered list ends; called around every walk and by every release.
    void ResetTails();
    // The wrapper depth, merge and stop flags, fetches left and budget of a new parser.
    void ResetChainState();

    // The arena of a parser that was given none.
    ka::Arena mOwnArena;

    // Last nodes appended, one per kind of list being filled (record_lists.h).
    ka::ListTail<AdData> mAdTail;
    ka::ListTail<AdImpression> mImpressionTail;
    ka::ListTail<AdCreative> mCreativeTail;
    ka::ListTail<AdMediaFile> mMediaFileTail;
    ka::ListTail<AdTracking> mTrackingTail;
    ka::ListTail<AdClick> mClickThroughTail;
    ka::ListTail<AdClick> mClickTrackingTail;
    ka::ListTail<AdClick> mCustomClickTail;
    // The ad and creative whose extras are being read.
    ka::AdExtrasBuild mAdBuild;
    ka::CreativeExtrasBuild mCreativeBuild;
    char* mPendingAdType = nullptr;  // the Ad's adType, until its body is made
};
