// The benchmark's hostile documents, small (about 10,000 list items), through a handle over the
// real modules: every long list comes back whole and in document order, the deep document is
// read only as far as its handlers go, huge values are copied exactly, every break's inline VAST
// is its own, and a wrapper's long lists are merged after the wrapped ad's own.
#include "../../bench/hostile_documents.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "source_io_api.h"
#include "vmap/vmap_parser.h"

namespace {

using hostile::N;
using Strings = std::vector<std::string>;
constexpr size_t kBytes = 800 * 1024;

std::string Str(const char* text) { return text == nullptr ? "<null>" : text; }
std::string Num(int64_t value) { return "|" + std::to_string(value); }

std::string Decoded(std::string text) {
    for (size_t at = text.find("&amp;"); at != std::string::npos; at = text.find("&amp;", at + 1)) {
        text.erase(at + 1, 4);
    }
    return text;
}

// One line per node of the lists the shapes fill.
struct Describe {
    std::string operator()(const AdBreak& b) const {
        return Str(b.breakId) + Num(b.breakType) + Num(b.timeOffsetType);
    }
    std::string operator()(const AdBreakTracking& t) const { return Str(t.event) + Str(t.url); }
    std::string operator()(const AdData& ad) const {
        const bool inLine = ad.type == AD_TYPE_INLINE;
        return Str(ad.id) + Num(ad.sequence) + Num(ad.type) +
               (inLine ? Str(static_cast<AdInLine*>(ad.body)->adSystem) : "");
    }
    std::string operator()(const AdCreative& c) const {
        return Str(c.id) + Num(c.kind) + Num(c.content.duration);
    }
    std::string operator()(const AdMediaFile& m) const {
        return Num(m.id) + Str(m.url) + Str(m.type);
    }
    std::string operator()(const AdClick& k) const { return Str(k.id) + Str(k.url); }
    template <typename T>
    std::string operator()(const T& node) const {
        return Str(node.url);
    }
};

// A break of inline VAST: its own InLine ad, then a wrapper that names no document, as read.
std::string InlineBreak(const AdBreak& b) {
    const VastAdData* data = b.adSource == nullptr ? nullptr : b.adSource->vastAdData;
    const AdData* in = data == nullptr ? nullptr : data->firstAd;
    const AdData* wr = in == nullptr ? nullptr : in->next;
    if (wr == nullptr || in->type != AD_TYPE_INLINE || wr->type != AD_TYPE_WRAPPER) {
        return Str(b.breakId) + " without its two ads";
    }
    const AdInLine* inLine = static_cast<AdInLine*>(in->body);
    const AdLinear& l = inLine->creatives->content;
    const AdWrapper* wrapper = static_cast<AdWrapper*>(wr->body);
    return Str(b.breakId) + Num(b.linearDuration) + Num(b.adSource->id) + Num(data->adCount) +
           Str(in->id) + Str(inLine->impressions->url) + Str(l.trackingEvents->url) +
           Str(l.mediaFiles->url) + Str(l.videoClicks->clickTrackings->url) + Str(wr->id) +
           Str(wrapper->impressions->url) + Num(wrapper->nestedParser != nullptr);
}

// A list of n nodes (count says so too) whose node i reads as pattern with "#" replaced by i.
template <typename T, typename D = Describe>
void ExpectList(const T* list, uint32_t count, uint32_t n, const std::string& pattern,
                D describe = D()) {
    EXPECT_EQ(n, count);
    uint32_t i = 0;
    for (; list != nullptr; list = list->next, ++i) {
        std::string want = pattern;
        for (size_t at = want.find('#'); at != std::string::npos; at = want.find('#', at)) {
            want.replace(at, 1, N(i));
        }
        if (describe(*list) != want) {
            ADD_FAILURE() << "node " << i << ": " << describe(*list) << ", not " << want;
            return;
        }
    }
    EXPECT_EQ(n, i);
}

// The urls of a list after its first skip nodes.
template <typename T>
Strings Tail(const T* list, size_t skip) {
    Strings urls;
    for (; list != nullptr; list = list->next) {
        if (skip == 0) urls.push_back(Str(list->url));
        skip -= skip > 0;
    }
    return urls;
}

// The merge shape's items of one kind (0, 1 or 2), in order.
Strings MergedItems(uint32_t count, uint32_t kind, const std::string& prefix,
                    const std::string& suffix = "") {
    Strings items;
    for (uint32_t i = kind; i < count; i += 3) items.push_back(prefix + N(i) + suffix);
    return items;
}

// n: the document's count; vast: the VAST-only container, or null.
void CheckShape(const std::string& shape, uint32_t n, const AdInfo& info, const char* contentUri,
                const VastAdData* vast) {
    if (shape == "vmap_breaks") {
        const std::string breakN = "b#" + Num(BREAK_TYPE_LINEAR) + Num(TIME_OFFSET_START_END);
        return ExpectList(info.adBreaks, info.adBreakCount, n, breakN);
    }
    if (shape == "vmap_trackings") {
        ASSERT_EQ(1u, info.adBreakCount);
        return ExpectList(info.adBreaks->trackings, n, n, "breakStarthttps://t.test/b?n=#&x=1");
    }
    if (shape == "inline_vast_breaks") {
        return ExpectList(info.adBreaks, info.adBreakCount, n,
                          "b#|15000|#|2in#https://i.test/p?b=#https://t.test/s?b=#"
                          "https://m.test/#.mp4https://c.test/k?b=#wr#https://w.test/p?b=#|0",
                          InlineBreak);
    }
    if (shape == "deep") {
        // One round of Ad > ... > Tracking is read; the Ad inside that Tracking is not.
        ASSERT_GT(n, 7000u);
        ASSERT_EQ(1u, info.adBreakCount);
        ASSERT_NE(nullptr, info.adBreaks->adSource);
        const VastAdData* data = info.adBreaks->adSource->vastAdData;
        ASSERT_NE(nullptr, data);
        ASSERT_EQ(1u, data->adCount);
        ASSERT_EQ(nullptr, data->firstAd->next);
        const AdInLine* inLine = static_cast<AdInLine*>(data->firstAd->body);
        ASSERT_NE(nullptr, inLine);
        ASSERT_EQ(1u, inLine->creativeCount);
        ASSERT_EQ(1u, inLine->creatives->content.trackingCount);
        EXPECT_EQ(nullptr, inLine->creatives->content.trackingEvents->url) << "a child element";
        return;
    }
    if (shape == "long_attribute") {
        ASSERT_EQ(hostile::LongUrl(kBytes / 2).size(), n);
        EXPECT_TRUE(Decoded(hostile::LongUrl(kBytes / 2)) == Str(contentUri));
        return;
    }
    // VAST-only shapes: the lists of the first ad, its first creative and that one's Linear.
    ASSERT_NE(nullptr, vast);
    const AdData* ad = vast->firstAd;
    if (shape == "vast_ads") {
        return ExpectList(ad, vast->adCount, n, "a#|#" + Num(AD_TYPE_INLINE) + "s");
    }
    ASSERT_TRUE(ad != nullptr && ad->type == AD_TYPE_INLINE);
    const AdInLine* in = static_cast<AdInLine*>(ad->body);
    const AdLinear* l = in->creatives == nullptr ? nullptr : &in->creatives->content;
    if (shape == "long_text") {
        ASSERT_EQ(hostile::LongUrl(kBytes / 2).size(), n);
        ASSERT_EQ(1u, in->impressionCount);
        EXPECT_TRUE(Decoded(hostile::LongUrl(kBytes / 2)) == Str(in->impressions->url));
    } else if (shape == "vast_impressions") {
        ExpectList(in->impressions, in->impressionCount, n,
                   "https://i.test/p?n=#&c=1&pad=xxxxxxxx");
    } else if (shape == "vast_creatives") {
        ExpectList(in->creatives, in->creativeCount, n, "c#" + Num(AD_CREATIVE_LINEAR) + "|1000");
    } else if (shape == "vast_mediafiles") {
        ASSERT_NE(nullptr, l);
        ExpectList(l->mediaFiles, l->mediaFileCount, n, "|#https://m.test/#.mp4video/mp4");
    } else if (shape == "vast_trackings") {
        ASSERT_NE(nullptr, l);
        ExpectList(l->trackingEvents, l->trackingCount, n, "https://t.test/e?n=#&c=1&pad=x");
    } else if (shape == "vast_clicktrackings") {
        ASSERT_TRUE(l != nullptr && l->videoClicks != nullptr);
        ExpectList(l->videoClicks->clickTrackings, l->videoClicks->clickTrackingCount, n,
                   "k#https://c.test/k?n=#&pad=xxxx");
    } else if (shape == "wrapper_merge") {
        ASSERT_EQ(1u, vast->adCount);
        EXPECT_EQ("spring-sale", Str(ad->id));  // the wrapped InLine ad takes the wrapper's place
        const Strings impressions = MergedItems(n, 0, "https://w.test/i?n=", "&p=xx");
        const Strings trackings = MergedItems(n, 1, "https://w.test/t?n=");
        const Strings clicks = MergedItems(n, 2, "https://w.test/k?n=");
        EXPECT_EQ(2u + impressions.size(), in->impressionCount);
        EXPECT_TRUE(Tail(in->impressions, 2) == impressions);
        // Both Linear creatives of the wrapped ad get every copy, after their own.
        const size_t kOwn[][2] = {{7, 2}, {3, 0}};  // tracking events, click trackings
        const AdCreative* creative = in->creatives;
        for (const auto& own : kOwn) {
            ASSERT_NE(nullptr, creative);
            const AdLinear& linear = creative->content;
            EXPECT_EQ(own[0] + trackings.size(), linear.trackingCount);
            EXPECT_TRUE(Tail(linear.trackingEvents, own[0]) == trackings);
            ASSERT_NE(nullptr, linear.videoClicks);
            EXPECT_EQ(own[1] + clicks.size(), linear.videoClicks->clickTrackingCount);
            EXPECT_TRUE(Tail(linear.videoClicks->clickTrackings, own[1]) == clicks);
            creative = creative->next;
        }
    } else {
        ADD_FAILURE() << "no check for " << shape;
    }
}

// The wrapped document of the merge shape is a local file: the source-IO module instance the
// parser loads (the same file, so the same instance) is allowed to read it.
bool AllowLocalFiles() {
    void* module = dlopen(KA_MODULES_DIR "libkaSourceIO.so", RTLD_NOW | RTLD_LOCAL);
    auto entry = module == nullptr
                     ? nullptr
                     : reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
    SourceIOApi api = {};
    uint32_t on = 1;
    return entry != nullptr && entry(&api) == 0 && api.SetParam != nullptr &&
           api.SetParam(nullptr, ka::kSioAllowFiles, &on) == 0;
}

void ReadBack(const hostile::Shape& shape) {
    const hostile::Document document = shape.build(kBytes);
    ASSERT_GT(document.text.size(), kBytes - 1024);
    ASSERT_LT(document.text.size(), kBytes + 1024);
    ASSERT_GT(document.count, 0u);
    std::string workPath = KA_MODULES_DIR;
    CVMAPParser parser;
    ASSERT_EQ(KA_OK, parser.Open(&workPath[0]));
    const bool vastOnly = shape.mode == hostile::Mode::kVastOnly;
    parser.SetParam(KA_PID_VMAP_VAST_ONLY, vastOnly ? &parser : nullptr);
    std::string buffer = document.text;
    ASSERT_EQ(KA_OK, parser.Process(&buffer[0], static_cast<unsigned int>(buffer.size())));
    buffer.assign(buffer.size(), 'x');  // nothing may point into the caller's buffer
    char* contentUri = nullptr;
    parser.GetParam(KA_PID_VMAP_CONTENT_URI, &contentUri);
    VastAdData* vast = nullptr;
    if (vastOnly) parser.GetVastAdData(&vast);
    CheckShape(shape.name, document.count, parser.mAdInfo, contentUri, vast);
    EXPECT_EQ(KA_OK, parser.Close());
}

TEST(HostileDocuments, ReadBackWholeAndInOrder) {
    ASSERT_TRUE(AllowLocalFiles());
    size_t count = 0;
    const hostile::Shape* shapes = hostile::Shapes(&count);
    for (size_t i = 0; i < count; ++i) {
        SCOPED_TRACE(shapes[i].name);
        ReadBack(shapes[i]);
    }
}

}  // namespace
