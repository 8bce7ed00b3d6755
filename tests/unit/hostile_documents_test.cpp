// The benchmark's hostile documents, small (about 10,000 list items), through a handle over the
// real modules: every long list comes back whole and in document order, the deep document is
// read only as far as its handlers go, huge values are copied exactly, every break's inline VAST
// is its own, and a wrapper's long lists are merged after the wrapped ad's own.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "../../bench/hostile_documents.h"
#include "ka/download.h"
#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "net/source_io_api.h"
#include "vmap/vmap_parser.h"

namespace {

constexpr size_t kBytes = 800 * 1024;

std::string Str(const char* text) { return text == nullptr ? "<null>" : text; }

std::string Decoded(const std::string& text) {
    std::string decoded;
    size_t from = 0;
    for (size_t at = text.find("&amp;"); at != std::string::npos; at = text.find("&amp;", from)) {
        decoded.append(text, from, at + 1 - from);
        from = at + 5;
    }
    return decoded.append(text, from, std::string::npos);
}

// The wrapped document of the merge shape is a local file: the source-IO module instance the
// parser loads (the same file, so the same instance) is allowed to read it.
void AllowLocalFiles() {
    static bool done = [] {
        const std::string path = std::string(KA_MODULES_DIR) + "libkaSourceIO.so";
        void* module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (module == nullptr) return false;
        auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
        static SourceIOApi api = {};
        if (entry == nullptr || entry(&api) != 0 || api.SetParam == nullptr) return false;
        uint32_t on = 1;
        return api.SetParam(nullptr, ka::kSioAllowFiles, &on) == 0;
    }();
    ASSERT_TRUE(done);
}

struct Result {
    const hostile::Document& document;
    const AdInfo& info;
    const char* contentUri;
    const VastAdData* vast;  // the VAST-only container, or null
};

// The one ad of a VAST-only result, and its first creative's linear content.
AdInLine* FirstInLine(const Result& r) {
    if (r.vast == nullptr || r.vast->firstAd == nullptr) return nullptr;
    if (r.vast->firstAd->type != AD_TYPE_INLINE) return nullptr;
    return static_cast<AdInLine*>(r.vast->firstAd->body);
}

AdLinear* FirstLinear(const Result& r) {
    AdInLine* inLine = FirstInLine(r);
    if (inLine == nullptr || inLine->creatives == nullptr) return nullptr;
    return &inLine->creatives->content;
}

void CheckVmapBreaks(const Result& r) {
    ASSERT_EQ(r.info.adBreakCount, r.document.count);
    uint32_t i = 0;
    for (const AdBreak* b = r.info.adBreaks; b != nullptr; b = b->next, ++i) {
        ASSERT_EQ(Str(b->breakId), "b" + std::to_string(i));
        ASSERT_EQ(b->breakType, BREAK_TYPE_LINEAR);
        ASSERT_EQ(b->timeOffsetType, TIME_OFFSET_START_END);
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVmapTrackings(const Result& r) {
    ASSERT_EQ(r.info.adBreakCount, 1u);
    uint32_t i = 0;
    for (const AdBreakTracking* t = r.info.adBreaks->trackings; t != nullptr; t = t->next, ++i) {
        ASSERT_EQ(Str(t->url), "https://t.test/b?n=" + std::to_string(i) + "&x=1");
        ASSERT_EQ(Str(t->event), "breakStart");
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVastAds(const Result& r) {
    ASSERT_NE(r.vast, nullptr);
    ASSERT_EQ(r.vast->adCount, r.document.count);
    uint32_t i = 0;
    for (const AdData* ad = r.vast->firstAd; ad != nullptr; ad = ad->next, ++i) {
        ASSERT_EQ(Str(ad->id), "a" + std::to_string(i));
        ASSERT_EQ(ad->sequence, static_cast<int32_t>(i));
        ASSERT_EQ(ad->type, AD_TYPE_INLINE);
        ASSERT_EQ(Str(static_cast<AdInLine*>(ad->body)->adSystem), "s");
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVastImpressions(const Result& r) {
    AdInLine* inLine = FirstInLine(r);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(inLine->impressionCount, r.document.count);
    uint32_t i = 0;
    for (const AdImpression* m = inLine->impressions; m != nullptr; m = m->next, ++i) {
        ASSERT_EQ(Str(m->url), "https://i.test/p?n=" + std::to_string(i) + "&c=1&pad=xxxxxxxx");
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVastCreatives(const Result& r) {
    AdInLine* inLine = FirstInLine(r);
    ASSERT_NE(inLine, nullptr);
    EXPECT_EQ(inLine->creativeCount, r.document.count);
    uint32_t i = 0;
    for (const AdCreative* c = inLine->creatives; c != nullptr; c = c->next, ++i) {
        ASSERT_EQ(Str(c->id), "c" + std::to_string(i));
        ASSERT_EQ(c->kind, AD_CREATIVE_LINEAR);
        ASSERT_EQ(c->content.duration, 1000u);
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVastMediaFiles(const Result& r) {
    AdLinear* linear = FirstLinear(r);
    ASSERT_NE(linear, nullptr);
    EXPECT_EQ(linear->mediaFileCount, r.document.count);
    uint32_t i = 0;
    for (const AdMediaFile* m = linear->mediaFiles; m != nullptr; m = m->next, ++i) {
        ASSERT_EQ(m->id, static_cast<int32_t>(i));
        ASSERT_EQ(Str(m->url), "https://m.test/" + std::to_string(i) + ".mp4");
        ASSERT_EQ(Str(m->type), "video/mp4");
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVastTrackings(const Result& r) {
    AdLinear* linear = FirstLinear(r);
    ASSERT_NE(linear, nullptr);
    EXPECT_EQ(linear->trackingCount, r.document.count);
    uint32_t i = 0;
    for (const AdTracking* t = linear->trackingEvents; t != nullptr; t = t->next, ++i) {
        ASSERT_EQ(Str(t->url), "https://t.test/e?n=" + std::to_string(i) + "&c=1&pad=x");
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckVastClickTrackings(const Result& r) {
    AdLinear* linear = FirstLinear(r);
    ASSERT_NE(linear, nullptr);
    ASSERT_NE(linear->videoClicks, nullptr);
    EXPECT_EQ(linear->videoClicks->clickTrackingCount, r.document.count);
    uint32_t i = 0;
    for (const AdClick* k = linear->videoClicks->clickTrackings; k != nullptr; k = k->next, ++i) {
        ASSERT_EQ(Str(k->id), "k" + std::to_string(i));
        ASSERT_EQ(Str(k->url), "https://c.test/k?n=" + std::to_string(i) + "&pad=xxxx");
    }
    EXPECT_EQ(i, r.document.count);
}

void CheckDeep(const Result& r) {
    ASSERT_GT(r.document.count, 7000u);
    ASSERT_EQ(r.info.adBreakCount, 1u);
    ASSERT_NE(r.info.adBreaks->adSource, nullptr);
    const VastAdData* data = r.info.adBreaks->adSource->vastAdData;
    ASSERT_NE(data, nullptr);
    // One round of Ad > ... > Tracking is read; the Ad inside that Tracking is not.
    ASSERT_EQ(data->adCount, 1u);
    ASSERT_EQ(data->firstAd->next, nullptr);
    const AdInLine* inLine = static_cast<AdInLine*>(data->firstAd->body);
    ASSERT_NE(inLine, nullptr);
    ASSERT_EQ(inLine->creativeCount, 1u);
    const AdLinear& linear = inLine->creatives->content;
    ASSERT_EQ(linear.trackingCount, 1u);
    EXPECT_EQ(linear.trackingEvents->url, nullptr) << "its only child is an element";
}

void CheckLongAttribute(const Result& r) {
    const std::string value = hostile::LongUrl(kBytes / 2);
    ASSERT_EQ(value.size(), r.document.count);
    ASSERT_NE(r.contentUri, nullptr);
    EXPECT_TRUE(Decoded(value) == r.contentUri) << "content URI of " << strlen(r.contentUri);
}

void CheckLongText(const Result& r) {
    const std::string value = hostile::LongUrl(kBytes / 2);
    ASSERT_EQ(value.size(), r.document.count);
    AdInLine* inLine = FirstInLine(r);
    ASSERT_NE(inLine, nullptr);
    ASSERT_EQ(inLine->impressionCount, 1u);
    EXPECT_TRUE(Decoded(value) == Str(inLine->impressions->url));
}

void CheckInlineVastBreaks(const Result& r) {
    ASSERT_EQ(r.info.adBreakCount, r.document.count);
    uint32_t i = 0;
    for (const AdBreak* b = r.info.adBreaks; b != nullptr; b = b->next, ++i) {
        const std::string n = std::to_string(i);
        ASSERT_EQ(Str(b->breakId), "b" + n);
        ASSERT_EQ(b->linearDuration, 15000u) << "the break's own ad only";
        ASSERT_NE(b->adSource, nullptr);
        ASSERT_EQ(b->adSource->id, static_cast<int32_t>(i));
        const VastAdData* data = b->adSource->vastAdData;
        ASSERT_NE(data, nullptr);
        ASSERT_EQ(data->adCount, 2u);
        const AdData* inLineAd = data->firstAd;
        ASSERT_EQ(Str(inLineAd->id), "in" + n);
        ASSERT_EQ(inLineAd->type, AD_TYPE_INLINE);
        const AdInLine* inLine = static_cast<AdInLine*>(inLineAd->body);
        ASSERT_EQ(Str(inLine->impressions->url), "https://i.test/p?b=" + n);
        const AdLinear& linear = inLine->creatives->content;
        ASSERT_EQ(Str(linear.trackingEvents->url), "https://t.test/s?b=" + n);
        ASSERT_EQ(Str(linear.mediaFiles->url), "https://m.test/" + n + ".mp4");
        ASSERT_EQ(Str(linear.videoClicks->clickTrackings->url), "https://c.test/k?b=" + n);
        // A wrapper that names no document stays as read.
        const AdData* wrapperAd = inLineAd->next;
        ASSERT_NE(wrapperAd, nullptr);
        ASSERT_EQ(Str(wrapperAd->id), "wr" + n);
        ASSERT_EQ(wrapperAd->type, AD_TYPE_WRAPPER);
        const AdWrapper* wrapper = static_cast<AdWrapper*>(wrapperAd->body);
        ASSERT_EQ(Str(wrapper->impressions->url), "https://w.test/p?b=" + n);
        ASSERT_EQ(wrapper->nestedParser, nullptr);
    }
    EXPECT_EQ(i, r.document.count);
}

// Item indices of one kind of the merge shape, in order.
std::vector<std::string> MergedItems(uint32_t count, uint32_t kind, const char* prefix,
                                     const char* suffix) {
    std::vector<std::string> items;
    for (uint32_t i = kind; i < count; i += 3) items.push_back(prefix + std::to_string(i) + suffix);
    return items;
}

template <typename T>
std::vector<std::string> Tail(const T* list, size_t skip) {
    std::vector<std::string> urls;
    for (; list != nullptr; list = list->next) {
        if (skip > 0) {
            --skip;
            continue;
        }
        urls.push_back(Str(list->url));
    }
    return urls;
}

void CheckWrapperMerge(const Result& r) {
    ASSERT_NE(r.vast, nullptr);
    ASSERT_EQ(r.vast->adCount, 1u);
    AdInLine* inLine = FirstInLine(r);
    ASSERT_NE(inLine, nullptr) << "the wrapped InLine ad takes the wrapper's place";
    EXPECT_EQ(Str(r.vast->firstAd->id), "spring-sale");
    const auto impressions = MergedItems(r.document.count, 0, "https://w.test/i?n=", "&p=xx");
    const auto trackings = MergedItems(r.document.count, 1, "https://w.test/t?n=", "");
    const auto clicks = MergedItems(r.document.count, 2, "https://w.test/k?n=", "");
    EXPECT_EQ(inLine->impressionCount, 2u + impressions.size());
    EXPECT_TRUE(Tail(inLine->impressions, 2) == impressions);
    // Both Linear creatives of the wrapped ad get every copy, after their own.
    struct Own {
        size_t trackings;
        size_t clicks;
    };
    const Own kOwn[] = {{7, 2}, {3, 0}};
    const AdCreative* creative = inLine->creatives;
    for (const Own& own : kOwn) {
        ASSERT_NE(creative, nullptr);
        const AdLinear& linear = creative->content;
        EXPECT_EQ(linear.trackingCount, own.trackings + trackings.size());
        EXPECT_TRUE(Tail(linear.trackingEvents, own.trackings) == trackings);
        ASSERT_NE(linear.videoClicks, nullptr);
        EXPECT_EQ(linear.videoClicks->clickTrackingCount, own.clicks + clicks.size());
        EXPECT_TRUE(Tail(linear.videoClicks->clickTrackings, own.clicks) == clicks);
        creative = creative->next;
    }
}

const std::map<std::string, std::function<void(const Result&)>>& Checks() {
    static const std::map<std::string, std::function<void(const Result&)>> kChecks = {
        {"vmap_breaks", CheckVmapBreaks},
        {"vmap_trackings", CheckVmapTrackings},
        {"vast_ads", CheckVastAds},
        {"vast_impressions", CheckVastImpressions},
        {"vast_creatives", CheckVastCreatives},
        {"vast_mediafiles", CheckVastMediaFiles},
        {"vast_trackings", CheckVastTrackings},
        {"vast_clicktrackings", CheckVastClickTrackings},
        {"deep", CheckDeep},
        {"long_attribute", CheckLongAttribute},
        {"long_text", CheckLongText},
        {"inline_vast_breaks", CheckInlineVastBreaks},
        {"wrapper_merge", CheckWrapperMerge},
    };
    return kChecks;
}

class HostileDocument : public ::testing::TestWithParam<const hostile::Shape*> {};

TEST_P(HostileDocument, ReadsBackWholeAndInOrder) {
    const hostile::Shape& shape = *GetParam();
    AllowLocalFiles();
    const hostile::Document document = shape.build(kBytes);
    ASSERT_GT(document.text.size(), kBytes - 1024);
    ASSERT_LT(document.text.size(), kBytes + 1024);
    ASSERT_GT(document.count, 0u);

    std::string workPath = KA_MODULES_DIR;
    CVMAPParser parser;
    ASSERT_EQ(parser.Open(&workPath[0]), KA_OK);
    const bool vastOnly = shape.mode == hostile::Mode::kVastOnly;
    parser.SetParam(KA_PID_VMAP_VAST_ONLY, vastOnly ? &parser : nullptr);
    std::string buffer = document.text;
    ASSERT_EQ(parser.Process(&buffer[0], static_cast<unsigned int>(buffer.size())), KA_OK);
    buffer.assign(buffer.size(), 'x');  // nothing may point into the caller's buffer

    char* contentUri = nullptr;
    parser.GetParam(KA_PID_VMAP_CONTENT_URI, &contentUri);
    VastAdData* vast = nullptr;
    if (vastOnly) parser.GetVastAdData(&vast);
    auto check = Checks().find(shape.name);
    ASSERT_NE(check, Checks().end()) << "no check for " << shape.name;
    check->second(Result{document, parser.mAdInfo, contentUri, vast});
    EXPECT_EQ(parser.Close(), KA_OK);
}

std::vector<const hostile::Shape*> AllShapes() {
    size_t count = 0;
    const hostile::Shape* shapes = hostile::Shapes(&count);
    std::vector<const hostile::Shape*> all;
    for (size_t i = 0; i < count; ++i) all.push_back(&shapes[i]);
    return all;
}

INSTANTIATE_TEST_SUITE_P(Shapes, HostileDocument, ::testing::ValuesIn(AllShapes()),
                         [](const ::testing::TestParamInfo<const hostile::Shape*>& info) {
                             return std::string(info.param->name);
                         });

TEST(HostileDocuments, EveryShapeHasACheck) {
    EXPECT_EQ(AllShapes().size(), Checks().size());
}

}  // namespace
