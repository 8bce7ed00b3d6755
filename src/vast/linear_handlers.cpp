// Handlers of <Linear> and the lists below it: media files, video clicks, tracking events.
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
void ReadNumber(const XMLAttributeValue& attribute, int32_t& field) {
    if (attribute.Present()) field = ka::Atoi(attribute.value, attribute.length);
}

// A click element appended to one of the lists of an AdVideoClicks.
void AppendClick(CXMLDocument& doc, void* node, uint32_t& count, AdClick** list,
                 ka::ListTail<AdClick>& tail) {
    count++;
    AdClick* click = doc.mArena->New<AdClick>();
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
        linear->videoClicks = mArena->New<AdVideoClicks>();
        LoadTag(node, linear->videoClicks, &CVASTParser::LoadVideoClicksTag);
    } else if (NameIs(name, nameLength, "AdParameters")) {
        // Only marked as present; the parameters are the ad unit's business.
        if (linear->adParameters != nullptr) return KA_OK;
        linear->adParametersCount = 1;
        linear->adParameters = mArena->New<AdParameters>();
        LoadTag(node, linear->adParameters, &CVASTParser::LoadIgnoredTag);
    } else if (NameIs(name, nameLength, "TrackingEvents")) {
        LoadTag(node, linear, &CVASTParser::LoadTrackingEventsTag);
    } else if (NameIs(name, nameLength, "Icons")) {
        LoadTag(node, linear,
                mReadExtras ? &CVASTParser::LoadIconsTag : &CVASTParser::LoadIgnoredTag);
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
    if (!NameIs(name, nameLength, "MediaFile")) {
        if (mReadExtras) LoadMediaExtra(node, name, nameLength);
        return KA_OK;
    }
    AdLinear* linear = static_cast<AdLinear*>(target);
    linear->mediaFileCount++;
    AdMediaFile* mediaFile = mArena->New<AdMediaFile>();
    mMediaFileTail.Append(&linear->mediaFiles, mediaFile);
    LoadMediaFileAttributes(node, mediaFile);
    GetElementText(node, mediaFile->url);
    return KA_OK;
}

unsigned int CVASTParser::LoadMediaFileAttributes(void* node, AdMediaFile* mediaFile) {
    if (node == nullptr || mediaFile == nullptr) return KA_OK;
    // Media files carry most of their attributes: all are read in one pass, in this order.
    static constexpr auto kNames = ka::AttributeNames(
        "delivery", "type", "width", "height", "codec", "id", "bitrate", "minBitrate", "maxBitrate",
        "scalable", "maintainAspectRatio", "fileSize", "mediaType", "apiFramework");
    XMLAttributeValue values[14];
    ReadAttributes(node, kNames, values);
    if (values[0].Present()) {
        const unsigned int size = static_cast<unsigned int>(values[0].length);
        if (NameIs(values[0].value, size, "progressive")) {
            mediaFile->delivery = AD_DELIVERY_PROGRESSIVE;
        } else if (NameIs(values[0].value, size, "streaming")) {
            mediaFile->delivery = AD_DELIVERY_STREAMING;
        }
    }
    CopyAttribute(values[1], mediaFile->type);
    CopyAttribute(values[4], mediaFile->codec);
    // The numbers in one loop over a table instead of one inlined reading each: a media file
    // runs this once per rendition, and a smaller walk leaves more of the cache to the load.
    static constexpr struct {
        uint8_t index;
        int32_t AdMediaFile::*field;
    } kNumbers[] = {{2, &AdMediaFile::width},      {3, &AdMediaFile::height},
                    {5, &AdMediaFile::id},         {6, &AdMediaFile::bitrate},
                    {7, &AdMediaFile::minBitrate}, {8, &AdMediaFile::maxBitrate},
                    {9, &AdMediaFile::scalable},   {10, &AdMediaFile::maintainAspectRatio}};
    for (const auto& number : kNumbers) ReadNumber(values[number.index], mediaFile->*number.field);
    LoadMediaFileExtras(mediaFile, values + 11);
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
    AdTracking* tracking = mArena->New<AdTracking>();
    mTrackingTail.Append(&linear->trackingEvents, tracking);
    LoadTrackingAttributes(node, tracking);
    GetElementText(node, tracking->url);
    return KA_OK;
}

unsigned int CVASTParser::LoadTrackingAttributes(void* node, AdTracking* tracking) {
    if (node == nullptr || tracking == nullptr) return KA_OK;
    static constexpr auto kNames = ka::AttributeNames("event", "offset");
    XMLAttributeValue values[2];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], tracking->event);
    if (!values[1].Present()) return KA_OK;
    const char* value = values[1].value;
    const int length = values[1].length;
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
