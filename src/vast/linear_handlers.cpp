// Handlers of <Linear> and the lists below it: media files, video clicks, tracking events.
#include <cstdlib>
#include <cstring>

#include "ka/result_codes.h"
#include "vast/vast_parser.h"
#include "xml/text.h"

using ka::NameIs;

namespace {

// Percentages are written with a "%" anywhere in the value ("25%", "%25").
bool IsPercent(const char* value, int length) {
    return memchr(value, '%', static_cast<size_t>(length)) != nullptr;
}

// atoi of an attribute into field when the attribute is present.
void ReadNumber(CXMLDocument& doc, void* node, const char* name, int32_t& field) {
    char* value = nullptr;
    int length = 0;
    if (doc.ReadAttribute(node, name, &value, length)) field = atoi(value);
}

// A click element appended to one of the lists of an AdVideoClicks.
void AppendClick(CXMLDocument& doc, void* node, uint32_t& count, AdClick** list,
                 ka::ListTail<AdClick>& tail) {
    count++;
    AdClick* click = new AdClick();
    tail.Append(list, click);
    doc.CopyAttribute(node, "id", click->id);
    doc.GetElementText(node, click->url);
}

}  // namespace

unsigned int CVASTParser::LoadLinearTag(void* node, void* target, char* name,
                                        unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdLinear* linear = static_cast<AdLinear*>(target);
    if (NameIs(name, nameLength, "Duration")) {
        char* text = nullptr;
        int length = 0;
        GetTagValue(node, &text, length);
        if (text != nullptr) linear->duration = string2time(text, length);
    } else if (NameIs(name, nameLength, "MediaFiles")) {
        LoadTag(node, linear, &CVASTParser::LoadMediaFilesTag);
    } else if (NameIs(name, nameLength, "VideoClicks")) {
        if (linear->videoClicks != nullptr) return KA_OK;
        linear->videoClicksCount = 1;
        linear->videoClicks = new AdVideoClicks();
        LoadTag(node, linear->videoClicks, &CVASTParser::LoadVideoClicksTag);
    } else if (NameIs(name, nameLength, "AdParameters")) {
        // Only marked as present; the parameters are the ad unit's business.
        if (linear->adParameters != nullptr) return KA_OK;
        linear->adParametersCount = 1;
        linear->adParameters = new AdParameters();
        LoadTag(node, linear->adParameters, &CVASTParser::LoadIgnoredTag);
    } else if (NameIs(name, nameLength, "TrackingEvents")) {
        LoadTag(node, linear, &CVASTParser::LoadTrackingEventsTag);
    } else if (NameIs(name, nameLength, "Icons")) {
        LoadTag(node, linear, &CVASTParser::LoadIgnoredTag);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadSkipOffset(void* node, AdLinear* linear) {
    if (node == nullptr || linear == nullptr) return KA_OK;
    char* value = nullptr;
    int length = 0;
    if (!ReadAttribute(node, "skipoffset", &value, length)) {
        linear->skipOffset = -1;
        return KA_OK;
    }
    if (IsPercent(value, length)) {
        // Two characters at most: "100%" reads as 10, "7.5%" as 7.
        long long scanned = 0;
        const char* cursor = value;
        ka::ScanDecimal(&cursor, 2, &scanned);
        const int percent = static_cast<int>(scanned);
        uint64_t share = static_cast<uint64_t>(static_cast<uint32_t>(percent)) * linear->duration;
        linear->skipOffset = static_cast<int64_t>(share / 100);
    } else {
        linear->skipOffset = string2time(value, length);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadMediaFilesTag(void* node, void* target, char* name,
                                            unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    if (!NameIs(name, nameLength, "MediaFile")) return KA_OK;
    AdLinear* linear = static_cast<AdLinear*>(target);
    linear->mediaFileCount++;
    AdMediaFile* mediaFile = new AdMediaFile();
    mMediaFileTail.Append(&linear->mediaFiles, mediaFile);
    LoadMediaFileAttributes(node, mediaFile);
    GetElementText(node, mediaFile->url);
    return KA_OK;
}

unsigned int CVASTParser::LoadMediaFileAttributes(void* node, AdMediaFile* mediaFile) {
    if (node == nullptr || mediaFile == nullptr) return KA_OK;
    char* value = nullptr;
    int length = 0;
    if (ReadAttribute(node, "delivery", &value, length)) {
        unsigned int size = static_cast<unsigned int>(length);
        if (NameIs(value, size, "progressive")) {
            mediaFile->delivery = AD_DELIVERY_PROGRESSIVE;
        } else if (NameIs(value, size, "streaming")) {
            mediaFile->delivery = AD_DELIVERY_STREAMING;
        }
    }
    CopyAttribute(node, "type", mediaFile->type);
    ReadNumber(*this, node, "width", mediaFile->width);
    ReadNumber(*this, node, "height", mediaFile->height);
    CopyAttribute(node, "codec", mediaFile->codec);
    ReadNumber(*this, node, "id", mediaFile->id);
    ReadNumber(*this, node, "bitrate", mediaFile->bitrate);
    ReadNumber(*this, node, "minBitrate", mediaFile->minBitrate);
    ReadNumber(*this, node, "maxBitrate", mediaFile->maxBitrate);
    ReadNumber(*this, node, "scalable", mediaFile->scalable);
    ReadNumber(*this, node, "maintainAspectRatio", mediaFile->maintainAspectRatio);
    return KA_OK;
}

unsigned int CVASTParser::LoadVideoClicksTag(void* node, void* target, char* name,
                                             unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    AdVideoClicks* clicks = static_cast<AdVideoClicks*>(target);
    if (NameIs(name, nameLength, "ClickThrough")) {
        AppendClick(*this, node, clicks->clickThroughCount, &clicks->clickThroughs,
                    mClickThroughTail);
    } else if (NameIs(name, nameLength, "ClickTracking")) {
        AppendClick(*this, node, clicks->clickTrackingCount, &clicks->clickTrackings,
                    mClickTrackingTail);
    } else if (NameIs(name, nameLength, "CustomClick")) {
        AppendClick(*this, node, clicks->customClickCount, &clicks->customClicks, mCustomClickTail);
    }
    return KA_OK;
}

unsigned int CVASTParser::LoadTrackingEventsTag(void* node, void* target, char* name,
                                                unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    if (!NameIs(name, nameLength, "Tracking")) return KA_OK;
    AdLinear* linear = static_cast<AdLinear*>(target);
    linear->trackingCount++;
    AdTracking* tracking = new AdTracking();
    mTrackingTail.Append(&linear->trackingEvents, tracking);
    LoadTrackingAttributes(node, tracking);
    GetElementText(node, tracking->url);
    return KA_OK;
}

unsigned int CVASTParser::LoadTrackingAttributes(void* node, AdTracking* tracking) {
    if (node == nullptr || tracking == nullptr) return KA_OK;
    CopyAttribute(node, "event", tracking->event);
    char* value = nullptr;
    int length = 0;
    if (!ReadAttribute(node, "offset", &value, length)) return KA_OK;
    if (IsPercent(value, length)) {
        // A percentage of the duration, kept as the number written (two characters at most).
        long long percent = 0;
        const char* cursor = value;
        ka::ScanDecimal(&cursor, 2, &percent);
        tracking->offsetKind = AD_OFFSET_PERCENT;
        tracking->offset = percent;
    } else {
        tracking->offsetKind = AD_OFFSET_TIME;
        tracking->offset = string2time(value, length);
    }
    return KA_OK;
}
