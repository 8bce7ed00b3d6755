#include "vmap/vmap_parser.h"

#include <climits>
#include <cstring>

#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "platform/limits.h"
#include "vmap/vmap_values.h"
#include "xml/text_helpers.h"

namespace {

// The XML module's lookups take mutable names but never write to them.
char* Name(const char* name) { return const_cast<char*>(name); }

bool IsTag(const char* name, unsigned int length, const char* tag) {
    return length == strlen(tag) && memcmp(name, tag, length) == 0;
}

// A copy of exactly length characters of text, terminated.
char* CopyText(const char* text, int length) {
    char* copy = new char[length + 1];
    memcpy(copy, text, length);
    copy[length] = '\0';
    return copy;
}

}  // namespace

CVMAPParser::CVMAPParser()
    : mContentUri(nullptr),
      mAdInfo(),
      mVastParser(nullptr),
      mVastOnly(0),
      mMergeWrappers(1),
      mStopFlag(nullptr),
      mLastBreak(nullptr),
      mTrackingOwner(nullptr),
      mLastTracking(nullptr) {}

CVMAPParser::~CVMAPParser() {
    ReleaseAll();
    UninitXMLParser();
}

unsigned int CVMAPParser::Open(char* workPath) {
    SetWorkPath(workPath);
    return InitXMLParser();
}

unsigned int CVMAPParser::Close() {
    ReleaseAll();
    UninitXMLParser();
    return KA_OK;
}

unsigned int CVMAPParser::Reset() {
    ReleaseAll();
    return KA_OK;
}

void CVMAPParser::ReleaseAll() {
    delete[] mContentUri;
    mContentUri = nullptr;
    ReleaseAdInfo();
    // The VAST parser, once the handle owns one, is destroyed here as well.
}

unsigned int CVMAPParser::Process(void* buffer, unsigned int size) {
    ReleaseAll();
    if (mVastOnly == 1) {
        // Bare VAST documents are read by a VAST parser, which this handle does not carry:
        // nothing can be built from the buffer.
        return KA_ERR_LOAD_FAILED;
    }
    if (buffer == nullptr || size == 0 || size > static_cast<unsigned int>(INT_MAX)) {
        return KA_ERR_LOAD_FAILED;
    }
    if (LoadXML(static_cast<char*>(buffer), static_cast<int>(size), ka::kXmlLoadMode) != 0) {
        return KA_ERR_LOAD_FAILED;
    }
    void* root = nullptr;
    GetFirstChild(nullptr, &root);
    if (root == nullptr) return KA_ERR_LOAD_FAILED;
    // Any root name is accepted: documents differ in how they spell it.
    LoadTag(root, &mAdInfo, &CVMAPParser::LoadVMAPTag);
    return KA_OK;
}

unsigned int CVMAPParser::GetAdInfo(AdInfo** out) {
    if (out != nullptr) *out = &mAdInfo;
    return KA_OK;
}

unsigned int CVMAPParser::GetVastAdData(VastAdData** /*out*/) {
    // Only a VAST parser has a container to lend; without one nothing is written.
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
        default:
            break;
    }
    return KA_OK;
}

unsigned int CVMAPParser::ReleaseAdInfo() {
    // The breaks are released whatever the current mode: a VAST-only Process builds none, so
    // a list that exists belongs to an earlier VMAP Process and is freed exactly once here.
    AdBreak* adBreak = mAdInfo.adBreaks;
    for (uint32_t i = 0; i < mAdInfo.adBreakCount && adBreak != nullptr; ++i) {
        if (AdSource* source = adBreak->adSource) {
            // Blocks are only created by the VAST hand-off, which owns the records inside.
            delete source->vastAdData;
            delete[] source->adTagUri;
            delete[] source->reservedText;
            delete source;
        }
        AdBreakTracking* tracking = adBreak->trackings;
        while (tracking != nullptr) {
            AdBreakTracking* next = tracking->next;
            delete[] tracking->event;
            delete[] tracking->url;
            delete tracking;
            tracking = next;
        }
        delete[] adBreak->breakId;
        AdBreak* next = adBreak->next;
        delete adBreak;
        adBreak = next;
    }
    mAdInfo.adBreakCount = 0;
    mAdInfo.adBreaks = nullptr;
    mLastBreak = nullptr;
    mTrackingOwner = nullptr;
    mLastTracking = nullptr;
    return KA_OK;
}

unsigned int CVMAPParser::LoadTag(void* node, void* target, TagHandler handler) {
    if (node == nullptr || target == nullptr) return KA_OK;
    void* child = nullptr;
    GetFirstChild(node, &child);
    while (child != nullptr) {
        char* name = nullptr;
        int length = 0;
        GetTagName(child, &name, length);
        if (name != nullptr && length >= 1) {
            (this->*handler)(child, target, name, static_cast<unsigned int>(length));
        }
        void* next = nullptr;
        GetNextSibling(child, &next);
        child = next;
    }
    return KA_OK;
}

unsigned int CVMAPParser::LoadVMAPTag(void* node, void* target, char* name, unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdInfo* info = static_cast<AdInfo*>(target);
    if (IsTag(name, length, "vmap:Extensions")) {
        ReadContentUri(node);
    } else if (IsTag(name, length, "vmap:AdBreak")) {
        ++info->adBreakCount;
        AdBreak* adBreak = new AdBreak();
        AppendBreak(adBreak);
        ParseAdBreakAttributes(node, adBreak);
        LoadTag(node, adBreak, &CVMAPParser::LoadAdBreakTag);
    }
    return KA_OK;
}

void CVMAPParser::ReadContentUri(void* extensions) {
    void* extension = nullptr;
    GetChildByName(extensions, Name("uo:unicornOnce"), &extension);
    if (extension == nullptr) return;
    char* value = nullptr;
    int length = 0;
    GetAttributeValue(extension, Name("contenturi"), &value, length);
    if (value == nullptr || length < 1) return;
    delete[] mContentUri;
    mContentUri = CopyText(value, length);
    unescape_amp(mContentUri);
}

void CVMAPParser::AppendBreak(AdBreak* adBreak) {
    AdBreak** slot = &mAdInfo.adBreaks;
    if (mLastBreak != nullptr && mAdInfo.adBreaks != nullptr) {
        slot = &mLastBreak->next;
    } else {
        while (*slot != nullptr) slot = &(*slot)->next;
    }
    *slot = adBreak;
    mLastBreak = adBreak;
}

void CVMAPParser::AppendTracking(AdBreak* adBreak, AdBreakTracking* tracking) {
    AdBreakTracking** slot = &adBreak->trackings;
    if (mTrackingOwner == adBreak && mLastTracking != nullptr) {
        slot = &mLastTracking->next;
    } else {
        while (*slot != nullptr) slot = &(*slot)->next;
    }
    *slot = tracking;
    mTrackingOwner = adBreak;
    mLastTracking = tracking;
}

unsigned int CVMAPParser::ParseAdBreakAttributes(void* node, AdBreak* adBreak) {
    if (node == nullptr || adBreak == nullptr) return KA_OK;
    char* value = nullptr;
    int length = 0;

    GetAttributeValue(node, Name("breakType"), &value, length);
    if (value != nullptr && length >= 1) adBreak->breakType |= ka::ParseBreakType(value, length);

    value = nullptr;
    length = 0;
    GetAttributeValue(node, Name("breakId"), &value, length);
    if (value != nullptr && length >= 1) {
        delete[] adBreak->breakId;
        adBreak->breakId = CopyText(value, length);
    }

    value = nullptr;
    length = 0;
    GetAttributeValue(node, Name("timeOffset"), &value, length);
    if (value != nullptr && length >= 1) {
        ka::ParseTimeOffset(value, length, &adBreak->timeOffsetType, &adBreak->timeOffset);
    }

    value = nullptr;
    length = 0;
    GetAttributeValue(node, Name("repeatAfter"), &value, length);
    if (value != nullptr && length >= 1) adBreak->repeatAfter = ka::ParseRepeatAfter(value, length);
    return KA_OK;
}

unsigned int CVMAPParser::LoadAdBreakTag(void* node, void* target, char* name,
                                         unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdBreak* adBreak = static_cast<AdBreak*>(target);
    if (IsTag(name, length, "vmap:AdSource")) {
        // The first source wins; a later one is skipped whole.
        if (adBreak->adSource != nullptr) return KA_OK;
        adBreak->adSource = new AdSource();
        ParseAdSourceAttributes(node, adBreak->adSource);
        LoadTag(node, adBreak->adSource, &CVMAPParser::LoadAdSourceTag);
        // linearDuration comes from inline VAST ads, which the VAST hand-off reads.
    } else if (IsTag(name, length, "vmap:TrackingEvents")) {
        LoadTag(node, adBreak, &CVMAPParser::LoadTrackingTag);
    }
    return KA_OK;
}

unsigned int CVMAPParser::ParseAdSourceAttributes(void* node, AdSource* source) {
    if (node == nullptr || source == nullptr) return KA_OK;
    char* value = nullptr;
    int length = 0;

    GetAttributeValue(node, Name("id"), &value, length);
    if (value != nullptr && length >= 1) source->id = ka::ParseDecimal(value);

    value = nullptr;
    length = 0;
    GetAttributeValue(node, Name("allowMultipleAds"), &value, length);
    if (value != nullptr && length >= 1) source->allowMultipleAds = strcmp(value, "true") == 0;

    value = nullptr;
    length = 0;
    GetAttributeValue(node, Name("followRedirects"), &value, length);
    if (value != nullptr && length >= 1) source->followRedirects = strcmp(value, "true") == 0;
    return KA_OK;
}

unsigned int CVMAPParser::LoadAdSourceTag(void* node, void* target, char* name,
                                          unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdSource* source = static_cast<AdSource*>(target);
    if (IsTag(name, length, "vmap:AdTagURI")) {
        // Stored as text only; the player decides whether to fetch it.
        GetElementText(node, source->adTagUri);
    }
    // vmap:VASTAdData and vmap:VASTData are read by the VAST hand-off; until then they are
    // skipped like any other element.
    return KA_OK;
}

unsigned int CVMAPParser::LoadTrackingTag(void* node, void* target, char* name,
                                          unsigned int length) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    if (!IsTag(name, length, "vmap:Tracking")) return KA_OK;
    AdBreak* adBreak = static_cast<AdBreak*>(target);
    AdBreakTracking* tracking = new AdBreakTracking();
    AppendTracking(adBreak, tracking);
    ParseTrackingEvent(node, tracking);
    GetElementText(node, tracking->url);
    return KA_OK;
}

unsigned int CVMAPParser::ParseTrackingEvent(void* node, AdBreakTracking* tracking) {
    if (node == nullptr || tracking == nullptr) return KA_OK;
    char* value = nullptr;
    int length = 0;
    GetAttributeValue(node, Name("event"), &value, length);
    if (value != nullptr && length >= 1) {
        delete[] tracking->event;
        tracking->event = CopyText(value, length);
    }
    return KA_OK;
}
