#include "vmap/vmap_parser.h"

#include <climits>
#include <cstring>

#include "ka/result_codes.h"
#include "ka/vast_extras.h"
#include "ka/vmap_parser_api.h"
#include "platform/limits.h"
#include "vast/outcome_records.h"
#include "vast/vast_parser.h"
#include "vast/vast_release.h"
#include "vmap/vmap_values.h"
#include "xml/text.h"

namespace {

// The XML module's lookups take mutable names but never write to them.
char* Name(const char* name) { return const_cast<char*>(name); }

}  // namespace

CVMAPParser::CVMAPParser()
    : mContentUri(nullptr),
      mAdInfo(),
      mVastParser(nullptr),
      mVastOnly(0),
      mMergeWrappers(1),
      mStopFlag(nullptr),
      mFetchBytes(KA_VMAP_DEFAULT_FETCH_BYTES),
      mDeadlineMs(0),
      mBaseUrl(),
      mBudget(ka::ChainBudget::Start(KA_VMAP_DEFAULT_FETCH_BYTES, 0)),
      mInlineChain(ka::ChainContext::Start(1, nullptr, nullptr, &mBudget, nullptr)),
      mTrace(),
      mOutcomes(nullptr),
      mRecords(),
      mBreakTail(),
      mTrackingTail(),
      mBuiltVastOnly(0) {
    mArena = &mRecords;
}

CVMAPParser::~CVMAPParser() { CVMAPParser::Close(); }

unsigned int CVMAPParser::Open(char* workPath) {
    SetWorkPath(workPath);
    return InitXMLParser();
}

unsigned int CVMAPParser::Close() {
    ReleaseAll();
    FreeSpareVASTParser();
    UninitXMLParser();
    return KA_OK;
}

unsigned int CVMAPParser::Reset() {
    ReleaseAll();
    return KA_OK;
}

void CVMAPParser::ReleaseAll() {
    mContentUri = nullptr;
    ReleaseAdInfo();
    DestroyVASTParser();
    mOutcomes = nullptr;
    mTrace.Clear();
    // Nothing points into the arena any more.
    mRecords.Reset();
}

unsigned int CVMAPParser::Process(void* buffer, unsigned int size) {
    ReleaseAll();
    mBudget = ka::ChainBudget::Start(mFetchBytes, mDeadlineMs);
    const char* baseUrl = mBaseUrl.empty() ? nullptr : mBaseUrl.c_str();
    if (mVastOnly == 1) {
        mBuiltVastOnly = 1;
        CreateVASTParser();
        // Without a flag of the caller's the chain's downloads get one that stays false.
        ka::ChainContext chain = ka::ChainContext::Start(mMergeWrappers != 0 ? 1 : 0, mStopFlag,
                                                         mWorkPath, &mBudget, baseUrl);
        chain.trace = &mTrace;
        const unsigned int result = mVastParser->ProcessInChain(buffer, size, chain);
        PublishOutcomes();
        return result;
    }
    // The VAST elements of one document share the Process's budget. Their downloads get no stop
    // flag: the caller's is for VAST-only mode. The merge setting decides only what becomes of
    // the elements' own wrappers: nested parsers always merge.
    mInlineChain = ka::ChainContext::Start(1, nullptr, mWorkPath, &mBudget, baseUrl);
    mInlineChain.trace = &mTrace;
    mBudget.parsedBytes = size;
    if (buffer == nullptr || size == 0 || size > static_cast<unsigned int>(INT_MAX)) {
        return KA_ERR_LOAD_FAILED;
    }
    if (LoadXML(static_cast<char*>(buffer), static_cast<int>(size), ka::kXmlLoadMode) != 0) {
        return KA_ERR_LOAD_FAILED;
    }
    void* root = nullptr;
    GetFirstChild(nullptr, &root);
    if (root == nullptr) return KA_ERR_LOAD_FAILED;
    if (mLenient) FindVmapPrefixes(root);
    // Any root name is accepted: documents differ in how they spell it.
    LoadTag(root, &mAdInfo, &CVMAPParser::LoadVMAPTag);
    PublishOutcomes();
    return KA_OK;
}

void CVMAPParser::PublishOutcomes() {
    ka::BuildChainOutcomes(mTrace, mRecords, &mOutcomes);
    mTrace.Clear();
}

unsigned int CVMAPParser::GetChainOutcomes(KaChainOutcome** out) {
    if (out != nullptr) *out = mOutcomes;
    return KA_OK;
}

unsigned int CVMAPParser::GetAdInfo(AdInfo** out) {
    if (out != nullptr) *out = &mAdInfo;
    return KA_OK;
}

unsigned int CVMAPParser::GetVastAdData(VastAdData** out) {
    // Only a VAST parser has a container to lend; without one nothing is written.
    if (mVastParser != nullptr && out != nullptr) *out = &mVastParser->mVastAdData;
    return KA_OK;
}

unsigned int CVMAPParser::SetParam(unsigned int id, void* value) {
    switch (id) {
        case KA_PID_VMAP_VAST_ONLY:
            mVastOnly = value != nullptr ? 1 : 0;
            break;
        case KA_PID_VMAP_MERGE_WRAPPERS:
            mMergeWrappers = value != nullptr ? 1 : 0;
            break;
        case KA_PID_VMAP_STOP_FLAG:
            mStopFlag = static_cast<KA_BOOL*>(value);
            break;
        case KA_PID_VMAP_FETCH_BYTES: {
            const uintptr_t bytes = reinterpret_cast<uintptr_t>(value);
            mFetchBytes = bytes != 0 ? bytes : KA_VMAP_DEFAULT_FETCH_BYTES;
            break;
        }
        case KA_PID_VMAP_DEADLINE_MS: {
            const uintptr_t ms = reinterpret_cast<uintptr_t>(value);
            mDeadlineMs = ms > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(ms);
            break;
        }
        case KA_PID_VMAP_BASE_URL:
            mBaseUrl = value != nullptr ? static_cast<const char*>(value) : "";
            break;
        case KA_PID_VMAP_READ_EXTRAS:
            mReadExtras = value != nullptr;
            break;
        case KA_PID_VMAP_LENIENT:
            mLenient = value != nullptr;
            break;
        default:
            break;
    }
    return KA_OK;
}

unsigned int CVMAPParser::GetParam(unsigned int id, void* value) {
    if (value == nullptr) return KA_OK;
    switch (id) {
        case KA_PID_VMAP_CONTENT_URI:
            *static_cast<char**>(value) = mContentUri;
            break;
        case KA_PID_VMAP_VAST_ONLY:
            *static_cast<unsigned int*>(value) = mVastOnly == 1 ? 1 : 0;
            break;
        case KA_PID_VMAP_FETCH_BYTES:
            *static_cast<uint64_t*>(value) = mFetchBytes;
            break;
        case KA_PID_VMAP_DEADLINE_MS:
            *static_cast<uint32_t*>(value) = mDeadlineMs;
            break;
        case KA_PID_VMAP_BASE_URL:
            *static_cast<const char**>(value) = mBaseUrl.empty() ? nullptr : mBaseUrl.c_str();
            break;
        default:
            break;
    }
    return KA_OK;
}

unsigned int CVMAPParser::ReleaseAdInfo() {
    if (mVastParser != nullptr) {
        if (mBuiltVastOnly == 1) {
            mVastParser->ReleaseVastAdData(&mVastParser->mVastAdData);
        } else {
            // After a VMAP Process the container only repeats the records of the last ad
            // source with inline VAST; they are freed with that source below.
            mVastParser->ForgetVastAdData();
        }
    }
    mBuiltVastOnly = 0;

    // The breaks are released whatever the current mode: a VAST-only Process builds none, so
    // a list that exists belongs to an earlier VMAP Process and is freed exactly once here.
    AdBreak* adBreak = mAdInfo.adBreaks;
    for (uint32_t i = 0; i < mAdInfo.adBreakCount && adBreak != nullptr; ++i) {
        // The records and their strings are the arena's; only the VAST records below a source
        // may hold objects of the heap.
        if (AdSource* source = adBreak->adSource) {
            ReleaseVastBlock(source->vastAdData);
            source->vastAdData = nullptr;
            adBreak->adSource = nullptr;
        }
        adBreak->trackings = nullptr;
        adBreak->breakId = nullptr;
        adBreak = adBreak->next;
    }
    mAdInfo.adBreakCount = 0;
    mAdInfo.adBreaks = nullptr;
    mBreakTail.Reset();
    mTrackingTail.Reset();
    return KA_OK;
}

void CVMAPParser::ReleaseVastBlock(VastAdData* block) {
    if (block == nullptr) return;
    ka::ReleaseVastAdData(block);
}

void CVMAPParser::CreateVASTParser() {
    // Only ever called without a parser. The one the last Process destroyed is renewed when
    // there is one: a Process then costs no new and no delete of it.
    if (mSpareVastParser != nullptr) {
        mVastParser = mSpareVastParser;
        mSpareVastParser = nullptr;
        mVastParser->Renew();
    } else {
        mVastParser = new CVASTParser();
    }
    mVastParser->SetWorkPath(mWorkPath);
    mVastParser->UseArena(&mRecords);
    mVastParser->mReadExtras = mReadExtras;
    // The document it reads is this handle's or goes through this handle's module, which stays
    // loaded from Open to Close.
    mVastParser->BorrowXMLParser(*this);
}

void CVMAPParser::DestroyVASTParser() {
    if (mVastParser == nullptr) return;
    mVastParser->Close();
    // Out of reach of the player and of the release steps, kept for the next CreateVASTParser.
    FreeSpareVASTParser();
    mSpareVastParser = mVastParser;
    mVastParser = nullptr;
}

void CVMAPParser::FreeSpareVASTParser() {
    delete mSpareVastParser;
    mSpareVastParser = nullptr;
}

unsigned int CVMAPParser::LoadVASTAdData(void* node, VastAdData* block) {
    if (node == nullptr || block == nullptr) return KA_OK;
    if (mVastParser == nullptr) CreateVASTParser();
    void* vast = nullptr;
    GetChildByName(node, Name("VAST"), &vast);
    if (vast == nullptr) return KA_OK;
    // The container's previous content belongs to the ad source that copied it.
    mVastParser->ForgetVastAdData();
    // The document stays this handle's: the VAST parser walks the node without closing it.
    try {
        mVastParser->ParseVASTNodeInChain(vast, false, mMergeWrappers != 0, mInlineChain);
    } catch (...) {
        // What was read when an allocation failed goes to the block too, to be released with it.
        *block = mVastParser->mVastAdData;
        throw;
    }
    *block = mVastParser->mVastAdData;
    return KA_OK;
}

void CVMAPParser::SumLinearDuration(AdBreak* adBreak) {
    if (adBreak == nullptr || adBreak->adSource == nullptr) return;
    const VastAdData* data = adBreak->adSource->vastAdData;
    if (data == nullptr || data->firstAd == nullptr || data->adCount == 0) return;
    const AdData* ad = data->firstAd;
    for (uint32_t i = 0; i < data->adCount && ad != nullptr; ++i, ad = ad->next) {
        // Wrapper ads that were not merged carry no media of their own.
        if (ad->type != AD_TYPE_INLINE || ad->body == nullptr) continue;
        const AdInLine* inLine = static_cast<const AdInLine*>(ad->body);
        if (inLine->creatives == nullptr || inLine->creativeCount == 0) continue;
        const AdCreative* creative = inLine->creatives;
        for (uint32_t j = 0; j < inLine->creativeCount && creative != nullptr;
             ++j, creative = creative->next) {
            if (creative->kind == AD_CREATIVE_LINEAR) {
                adBreak->linearDuration += creative->content.duration;
            }
        }
    }
}

unsigned int CVMAPParser::LoadTag(void* node, void* target, TagHandler handler) {
    if (node == nullptr || target == nullptr || handler == nullptr) return KA_OK;
    ForEachChild(node, target, this, handler);
    return KA_OK;
}

void CVMAPParser::FindVmapPrefixes(void* root) {
    static const char kUri[] = "http://www.iab.net/videosuite/vmap";
    mPrefixCount = 0;
    void* current = nullptr;
    // Bounded by the root's attributes, which the module has already read.
    for (;;) {
        void* next = nullptr;
        char* name = nullptr;
        char* value = nullptr;
        int nameLength = 0;
        int valueLength = 0;
        if (GetNextAttribute(root, &next, current, &name, nameLength, &value, valueLength) !=
                KA_OK ||
            next == nullptr) {
            return;
        }
        current = next;
        if (name == nullptr || value == nullptr || nameLength <= 6 ||
            memcmp(name, "xmlns:", 6) != 0 || valueLength != static_cast<int>(sizeof(kUri) - 1) ||
            memcmp(value, kUri, sizeof(kUri) - 1) != 0) {
            continue;
        }
        if (mPrefixCount < kMaxVmapPrefixes) {
            mPrefixes[mPrefixCount] = {name + 6, static_cast<unsigned int>(nameLength - 6)};
            ++mPrefixCount;
        }
    }
}

bool CVMAPParser::IsVmap(const char* name, unsigned int length, const char* local) const {
    const unsigned int n = static_cast<unsigned int>(strlen(local));
    if (length == n + 5 && memcmp(name, "vmap:", 5) == 0 && memcmp(name + 5, local, n) == 0) {
        return true;
    }
    if (!mLenient || length < n || memcmp(name + length - n, local, n) != 0) return false;
    if (length == n) return true;
    const unsigned int prefix = length - n - 1;
    if (name[prefix] != ':') return false;
    for (unsigned int i = 0; i < mPrefixCount; ++i) {
        if (mPrefixes[i].length == prefix && memcmp(mPrefixes[i].name, name, prefix) == 0) {
            return true;
        }
    }
    return false;
}

unsigned int CVMAPParser::LoadVMAPTag(void* node, void* target, char* name, unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdInfo* info = static_cast<AdInfo*>(target);
    if (IsVmap(name, length, "Extensions")) {
        ReadContentUri(node);
    } else if (IsVmap(name, length, "AdBreak")) {
        ++info->adBreakCount;
        AdBreak* adBreak = mRecords.New<AdBreak>();
        mBreakTail.Append(&mAdInfo.adBreaks, adBreak);
        ParseAdBreakAttributes(node, adBreak);
        LoadTag(node, adBreak, &CVMAPParser::LoadAdBreakTag);
    }
    return KA_OK;
}

void CVMAPParser::ReadContentUri(void* extensions) {
    void* extension = nullptr;
    GetChildByName(extensions, Name("uo:unicornOnce"), &extension);
    if (extension == nullptr) return;
    if (CopyAttribute(extension, "contenturi", mContentUri)) unescape_amp(mContentUri);
}

unsigned int CVMAPParser::ParseAdBreakAttributes(void* node, AdBreak* adBreak) {
    if (node == nullptr || adBreak == nullptr) return KA_OK;
    static constexpr auto kNames =
        ka::AttributeNames("breakType", "breakId", "timeOffset", "repeatAfter");
    XMLAttributeValue values[4];
    ReadAttributes(node, kNames, values);
    if (values[0].Present()) {
        adBreak->breakType |= ka::ParseBreakType(values[0].value, values[0].length);
    }
    CopyAttribute(values[1], adBreak->breakId);
    if (values[2].Present()) {
        ka::ParseTimeOffset(values[2].value, values[2].length, &adBreak->timeOffsetType,
                            &adBreak->timeOffset);
    }
    if (values[3].Present()) {
        adBreak->repeatAfter = ka::ParseRepeatAfter(values[3].value, values[3].length);
    }
    return KA_OK;
}

unsigned int CVMAPParser::LoadAdBreakTag(void* node, void* target, char* name,
                                         unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdBreak* adBreak = static_cast<AdBreak*>(target);
    if (IsVmap(name, length, "AdSource")) {
        // The first source wins; a later one is skipped whole.
        if (adBreak->adSource != nullptr) return KA_OK;
        adBreak->adSource = mRecords.New<AdSource>();
        ParseAdSourceAttributes(node, adBreak->adSource);
        LoadTag(node, adBreak->adSource, &CVMAPParser::LoadAdSourceTag);
        SumLinearDuration(adBreak);
    } else if (IsVmap(name, length, "TrackingEvents")) {
        LoadTag(node, adBreak, &CVMAPParser::LoadTrackingTag);
    }
    return KA_OK;
}

unsigned int CVMAPParser::ParseAdSourceAttributes(void* node, AdSource* source) {
    if (node == nullptr || source == nullptr) return KA_OK;
    static constexpr auto kNames = ka::AttributeNames("id", "allowMultipleAds", "followRedirects");
    XMLAttributeValue values[3];
    ReadAttributes(node, kNames, values);
    if (values[0].Present()) source->id = ka::ParseDecimal(values[0].value);
    if (values[1].Present()) source->allowMultipleAds = strcmp(values[1].value, "true") == 0;
    if (values[2].Present()) source->followRedirects = strcmp(values[2].value, "true") == 0;
    return KA_OK;
}

unsigned int CVMAPParser::LoadAdSourceTag(void* node, void* target, char* name,
                                          unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdSource* source = static_cast<AdSource*>(target);
    if (IsVmap(name, length, "AdTagURI")) {
        // Stored as text only; the player decides whether to fetch it.
        GetElementText(node, source->adTagUri);
    } else if (IsVmap(name, length, "VASTAdData") || IsVmap(name, length, "VASTData")) {
        // Only the first of either is read.
        if (source->vastAdData != nullptr) return KA_OK;
        source->vastAdData = mRecords.New<VastAdData>();
        LoadVASTAdData(node, source->vastAdData);
    }
    return KA_OK;
}

unsigned int CVMAPParser::LoadTrackingTag(void* node, void* target, char* name,
                                          unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    if (!IsVmap(name, length, "Tracking")) return KA_OK;
    AdBreak* adBreak = static_cast<AdBreak*>(target);
    AdBreakTracking* tracking = mRecords.New<AdBreakTracking>();
    mTrackingTail.Append(&adBreak->trackings, tracking);
    ParseTrackingEvent(node, tracking);
    GetElementText(node, tracking->url);
    return KA_OK;
}

unsigned int CVMAPParser::ParseTrackingEvent(void* node, AdBreakTracking* tracking) {
    if (node == nullptr || tracking == nullptr) return KA_OK;
    CopyAttribute(node, "event", tracking->event);
    return KA_OK;
}
