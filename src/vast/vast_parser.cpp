#include "vast/vast_parser.h"

#include <climits>

#include "ka/result_codes.h"
#include "ka/vast_extension.h"
#include "ka/vmap_parser_ext.h"
#include "platform/limits.h"
#include "vast/chain_trace.h"

CVASTParser::CVASTParser() : mVastAdData(), mExtensionParser(nullptr) {
    mArena = &mOwnArena;
    ResetChainState();
}

CVASTParser::~CVASTParser() { CVASTParser::Close(); }

void CVASTParser::Renew() {
    Close();
    ForgetVastAdData();
    ResetChainState();
    ResetTails();
}

void CVASTParser::ResetChainState() {
    mMaxDepth = ka::kMaxWrapperDepth;
    mMergeWrappers = 1;
    mStopFlag = nullptr;
    mFetchesLeft = KA_VMAP_FETCHES_PER_AD;
    mBudget = nullptr;
}

unsigned int CVASTParser::Open(char* workingPath) {
    SetWorkPath(workingPath);
    return InitXMLParser();
}

unsigned int CVASTParser::Close() {
    unsigned int result = UninitXMLParser();
    if (result == 0 && mExtensionParser != nullptr) {
        delete mExtensionParser;
        mExtensionParser = nullptr;
    }
    return result;
}

unsigned int CVASTParser::Process(void* buffer, unsigned int size, KA_BOOL mergeWrappers,
                                  KA_BOOL* stopFlag) {
    // The caller's own document starts a new chain, with the default budget.
    ka::ChainBudget budget = ka::ChainBudget::Start(KA_VMAP_DEFAULT_FETCH_BYTES, 0);
    ka::ChainContext chain =
        ka::ChainContext::Start(mergeWrappers, stopFlag, mWorkPath, &budget, nullptr);
    const unsigned int result = ProcessInChain(buffer, size, chain);
    mFetchesLeft = chain.fetchesLeft;
    mBudget = nullptr;
    return result;
}

unsigned int CVASTParser::ProcessInChain(void* buffer, unsigned int size, ka::ChainContext& chain) {
    mMergeWrappers = chain.mergeWrappers;
    mStopFlag = chain.stopFlag;
    chain.budget->parsedBytes += size;
    // The module takes the size as an int: a larger buffer cannot be loaded.
    if (buffer == nullptr || size > static_cast<unsigned int>(INT_MAX)) return KA_ERR_LOAD_FAILED;
    if (LoadXML(static_cast<char*>(buffer), static_cast<int>(size), ka::kXmlLoadMode) != 0) {
        return KA_ERR_LOAD_FAILED;
    }
    void* root = nullptr;
    GetFirstChild(nullptr, &root);
    if (root == nullptr) return KA_ERR_LOAD_FAILED;
    // Whatever the root is called, its children are read as those of <VAST>.
    ParseVASTNodeInChain(root, true, chain.mergeWrappers != 0, chain);
    return KA_OK;
}

unsigned int CVASTParser::SetParam(unsigned int id, void* value) {
    if (id == KA_PID_VAST_EXTENSION_PARSER) {
        mExtensionParser = static_cast<CExtensionParser*>(value);
    }
    return KA_OK;
}

unsigned int CVASTParser::GetParam(unsigned int /*id*/, void* /*value*/) { return KA_OK; }

unsigned int CVASTParser::ParseVASTNode(void* node, bool ownsDocument, bool mergeWrappers) {
    ka::ChainBudget budget = ka::ChainBudget::Start(KA_VMAP_DEFAULT_FETCH_BYTES, 0);
    ka::ChainContext chain =
        ka::ChainContext::Start(mMergeWrappers, mStopFlag, mWorkPath, &budget, nullptr);
    chain.fetchesLeft = mFetchesLeft;
    ParseVASTNodeInChain(node, ownsDocument, mergeWrappers, chain);
    mFetchesLeft = chain.fetchesLeft;
    mBudget = nullptr;
    return KA_OK;
}

unsigned int CVASTParser::ParseVASTNodeInChain(void* node, bool ownsDocument, bool mergeWrappers,
                                               ka::ChainContext& chain) {
    mBudget = chain.budget;
    ResetTails();
    LoadTag(node, &mVastAdData, &CVASTParser::LoadVASTTag);
    ResetTails();
    // Taken before the walk: the merges rewrite the ads and move the root <Error>.
    if (chain.trace != nullptr) {
        if (mVastAdData.depth == 0) {
            chain.trace->BeginDocument(mVastAdData.errorUrl);
        } else if (chain.onPath) {
            chain.trace->PathDocument(mVastAdData.errorUrl, mVastAdData.firstAd,
                                      ReadsVersion(node));
        }
    }
    // The document and the module go before any wrapper is fetched: along a chain of wrappers
    // only one fetched document is loaded at a time.
    if (ownsDocument) Close();
    WalkWrappers(mergeWrappers, chain);
    return KA_OK;
}

void CVASTParser::ForgetVastAdData() { mVastAdData = VastAdData(); }

void CVASTParser::WalkWrappers(bool mergeWrappers, ka::ChainContext& chain) {
    const bool top = mVastAdData.depth == 0;
    for (AdData* ad = mVastAdData.firstAd; ad != nullptr;) {
        // The wrapper chain rewrites the node in place, so the next one is taken first.
        AdData* next = ad->next;
        if (top && chain.trace != nullptr) chain.trace->BeginAd(ad, chain.budget->mergeRefusals);
        if (ad->type == AD_TYPE_WRAPPER && ad->body != nullptr) {
            ka::ChainTrace* trace = OnPath(chain, ad) ? chain.trace : nullptr;
            if (mVastAdData.depth >= mMaxDepth) {
                if (trace != nullptr) trace->End(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_DEPTH);
                break;
            }
            // Each ad of the caller's document has a fetch budget of its own: an ad that loops
            // or fans out spends only its own.
            if (top) chain.fetchesLeft = KA_VMAP_FETCHES_PER_AD;
            // A failed fetch leaves no nested parser, and the merge then leaves the ad as read.
            if (static_cast<AdWrapper*>(ad->body)->vastAdTagUri != nullptr) {
                FetchWrapper(ad, chain);
            } else if (trace != nullptr) {
                trace->End(KA_CHAIN_WRAPPER, KA_CHAIN_REASON_NO_URI);
            }
            if (mergeWrappers) MergeWrapper(ad);
        }
        if (top && chain.trace != nullptr) chain.trace->EndAd(chain.budget->mergeRefusals);
        ad = next;
    }
}

bool CVASTParser::OnPath(const ka::ChainContext& chain, const AdData* ad) const {
    return chain.trace != nullptr &&
           (mVastAdData.depth == 0 || (chain.onPath && ad == mVastAdData.firstAd));
}

bool CVASTParser::ReadsVersion(void* root) {
    char* value = nullptr;
    int length = 0;
    if (!ReadAttribute(root, "version", &value, length)) return true;
    // "2.0" to "4.3": what matters is the major version.
    return length >= 1 && value[0] >= '2' && value[0] <= '4' && (length == 1 || value[1] == '.');
}

unsigned int CVASTParser::LoadTag(void* node, void* target, TagHandler handler) {
    if (node == nullptr || target == nullptr || handler == nullptr) return KA_OK;
    ForEachChild(node, target, this, handler);
    return KA_OK;
}

void CVASTParser::ResetTails() {
    mAdTail.Reset();
    mImpressionTail.Reset();
    mCreativeTail.Reset();
    mMediaFileTail.Reset();
    mTrackingTail.Reset();
    mClickThroughTail.Reset();
    mClickTrackingTail.Reset();
    mCustomClickTail.Reset();
    mAdBuild = ka::AdExtrasBuild();
    mCreativeBuild = ka::CreativeExtrasBuild();
    mPendingAdType = nullptr;
}
