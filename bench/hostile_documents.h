// Hostile documents of a chosen size, built in memory: one very long list in its proper VMAP or
// VAST place, nesting tens of thousands of levels deep, one huge attribute or text, and a
// playlist whose every break carries inline VAST. The benchmark times them at two sizes; the
// unit test reads small ones back and checks counts and order. Every list item carries its
// index, so order can be checked from the records.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace hostile {

struct Document {
    std::string text;
    uint32_t count = 0;  // list items, nesting levels or value bytes, by shape
};

// Appends items (built by item(i)) between head and tail until the document holds about bytes.
template <typename Item>
Document Fill(size_t bytes, const std::string& head, const std::string& tail, Item item) {
    Document document;
    document.text.reserve(bytes + 256);
    document.text = head;
    while (document.text.size() + tail.size() < bytes) document.text += item(document.count++);
    document.text += tail;
    return document;
}

inline std::string N(uint32_t i) { return std::to_string(i); }

// A value of about length bytes, each piece holding an "&amp;" for the decoder to work on.
inline std::string LongUrl(size_t length) {
    std::string url = "https://big.test/v?";
    for (uint32_t i = 0; url.size() < length; ++i) url += "k" + N(i % 1000) + "=v&amp;";
    return url;
}

// Fills a document to bytes with a comment that the XML module skips.
inline std::string Padding(size_t used, size_t bytes) {
    if (used + 7 >= bytes) return "";
    return "<!--" + std::string(bytes - used - 7, 'p') + "-->";
}

constexpr char kVmapHead[] =
    "<vmap:VMAP xmlns:vmap=\"http://www.iab.net/videosuite/vmap\" version=\"1.0\">";
constexpr char kVmapTail[] = "</vmap:VMAP>";
constexpr char kLinearHead[] =
    "<VAST version=\"3.0\"><Ad id=\"a\"><InLine><AdSystem>s</AdSystem><Creatives>"
    "<Creative id=\"c\"><Linear><Duration>00:00:15</Duration>";
constexpr char kLinearTail[] = "</Linear></Creative></Creatives></InLine></Ad></VAST>";

// vmap:AdBreak siblings, breakId "b<i>".
inline Document VmapBreaks(size_t bytes) {
    return Fill(bytes, kVmapHead, kVmapTail, [](uint32_t i) {
        return "<vmap:AdBreak timeOffset=\"start\" breakType=\"linear\" breakId=\"b" + N(i) +
               "\"></vmap:AdBreak>";
    });
}

// vmap:Tracking siblings of one break, url "https://t.test/b?n=<i>".
inline Document VmapTrackings(size_t bytes) {
    return Fill(bytes,
                std::string(kVmapHead) +
                    "<vmap:AdBreak timeOffset=\"start\" breakId=\"b\"><vmap:TrackingEvents>",
                "</vmap:TrackingEvents></vmap:AdBreak>" + std::string(kVmapTail), [](uint32_t i) {
                    return "<vmap:Tracking event=\"breakStart\">https://t.test/b?n=" + N(i) +
                           "&amp;x=1</vmap:Tracking>";
                });
}

// <Ad> siblings of one VAST document, id "a<i>", sequence i.
inline Document VastAds(size_t bytes) {
    return Fill(bytes, "<VAST version=\"3.0\">", "</VAST>", [](uint32_t i) {
        return "<Ad id=\"a" + N(i) + "\" sequence=\"" + N(i) +
               "\"><InLine><AdSystem>s</AdSystem></InLine></Ad>";
    });
}

// <Impression> siblings of one InLine, url "https://i.test/p?n=<i>&c=1".
inline Document VastImpressions(size_t bytes) {
    return Fill(bytes, "<VAST version=\"3.0\"><Ad id=\"a\"><InLine><AdSystem>s</AdSystem>",
                "</InLine></Ad></VAST>", [](uint32_t i) {
                    return "<Impression>https://i.test/p?n=" + N(i) +
                           "&amp;c=1&amp;pad=xxxxxxxx</Impression>";
                });
}

// <Creative> siblings of one InLine, id "c<i>", each a Linear of 1 s.
inline Document VastCreatives(size_t bytes) {
    return Fill(bytes, "<VAST version=\"3.0\"><Ad id=\"a\"><InLine><Creatives>",
                "</Creatives></InLine></Ad></VAST>", [](uint32_t i) {
                    return "<Creative id=\"c" + N(i) +
                           "\"><Linear><Duration>00:00:01</Duration></Linear></Creative>";
                });
}

// <MediaFile> siblings of one Linear, id i, url "https://m.test/<i>.mp4".
inline Document VastMediaFiles(size_t bytes) {
    return Fill(bytes, std::string(kLinearHead) + "<MediaFiles>",
                "</MediaFiles>" + std::string(kLinearTail), [](uint32_t i) {
                    return "<MediaFile id=\"" + N(i) +
                           "\" delivery=\"progressive\" type=\"video/mp4\">https://m.test/" + N(i) +
                           ".mp4</MediaFile>";
                });
}

// <Tracking> siblings of one Linear, url "https://t.test/e?n=<i>&c=1".
inline Document VastTrackings(size_t bytes) {
    return Fill(bytes, std::string(kLinearHead) + "<TrackingEvents>",
                "</TrackingEvents>" + std::string(kLinearTail), [](uint32_t i) {
                    return "<Tracking event=\"progress\">https://t.test/e?n=" + N(i) +
                           "&amp;c=1&amp;pad=x</Tracking>";
                });
}

// <ClickTracking> siblings of one VideoClicks, id "k<i>", url "https://c.test/k?n=<i>".
inline Document VastClickTrackings(size_t bytes) {
    return Fill(bytes, std::string(kLinearHead) + "<VideoClicks>",
                "</VideoClicks>" + std::string(kLinearTail), [](uint32_t i) {
                    return "<ClickTracking id=\"k" + N(i) + "\">https://c.test/k?n=" + N(i) +
                           "&amp;pad=xxxx</ClickTracking>";
                });
}

// Nesting: inline VAST in a break, then Ad > InLine > Creatives > Creative > Linear >
// TrackingEvents > Tracking > Ad > ... Each level has a name its parent's handler knows, so a
// walk that followed depth would follow it; count is the number of levels.
inline Document Deep(size_t bytes) {
    static const char* const kLevels[] = {"Ad",     "InLine",         "Creatives", "Creative",
                                          "Linear", "TrackingEvents", "Tracking"};
    const std::string head = std::string(kVmapHead) +
                             "<vmap:AdBreak breakId=\"deep\"><vmap:AdSource><vmap:VASTAdData>"
                             "<VAST version=\"3.0\">";
    const std::string tail =
        "</VAST></vmap:VASTAdData></vmap:AdSource></vmap:AdBreak>" + std::string(kVmapTail);
    // Each level costs its open and close tag plus a filler attribute that no handler reads.
    const std::string filler = " filler=\"" + std::string(48, 'f') + "\"";
    Document document;
    size_t closing = 0;
    document.text = head;
    while (document.text.size() + closing + tail.size() + 100 < bytes) {
        const char* name = kLevels[document.count++ % 7];
        document.text += std::string("<") + name + filler + ">";
        closing += std::string(name).size() + 3;
    }
    for (uint32_t level = document.count; level-- > 0;) {
        document.text += std::string("</") + kLevels[level % 7] + ">";
    }
    document.text += tail;
    return document;
}

// One attribute of half the document: the content URI; count is its length in the buffer.
inline Document LongAttribute(size_t bytes) {
    Document document;
    const std::string value = LongUrl(bytes / 2);
    document.count = static_cast<uint32_t>(value.size());
    document.text = std::string(kVmapHead) + "<vmap:Extensions><uo:unicornOnce contenturi=\"" +
                    value + "\"/></vmap:Extensions>";
    document.text += Padding(document.text.size() + sizeof(kVmapTail), bytes) + kVmapTail;
    return document;
}

// One element text of half the document: an Impression URL; count is its length in the buffer.
inline Document LongText(size_t bytes) {
    Document document;
    const std::string value = LongUrl(bytes / 2);
    document.count = static_cast<uint32_t>(value.size());
    document.text = "<VAST version=\"3.0\"><Ad id=\"a\"><InLine><Impression>" + value +
                    "</Impression></InLine></Ad>";
    document.text += Padding(document.text.size() + 7, bytes) + "</VAST>";
    return document;
}

// Breaks that each carry a VAST document: an InLine ad of 15 s with its lists, and a Wrapper ad
// that names no document (nothing is fetched). Break "b<i>" holds ad "in<i>".
inline Document InlineVastBreaks(size_t bytes) {
    return Fill(bytes, kVmapHead, kVmapTail, [](uint32_t i) {
        const std::string n = N(i);
        return "<vmap:AdBreak timeOffset=\"00:10:00.000\" breakType=\"linear\" breakId=\"b" + n +
               "\"><vmap:AdSource id=\"" + n +
               "\" allowMultipleAds=\"true\"><vmap:VASTAdData><VAST version=\"3.0\">"
               "<Ad id=\"in" +
               n +
               "\" sequence=\"1\"><InLine><AdSystem>s</AdSystem>"
               "<AdTitle>t</AdTitle><Impression>https://i.test/p?b=" +
               n + "</Impression><Creatives><Creative id=\"c" + n +
               "\"><Linear skipoffset=\"00:00:05\"><Duration>00:00:15</Duration>"
               "<TrackingEvents><Tracking event=\"start\">https://t.test/s?b=" +
               n + "</Tracking></TrackingEvents><VideoClicks><ClickThrough>https://l.test/" + n +
               "</ClickThrough><ClickTracking>https://c.test/k?b=" + n +
               "</ClickTracking></VideoClicks><MediaFiles><MediaFile delivery=\"progressive\" "
               "type=\"video/mp4\" width=\"640\" height=\"360\">https://m.test/" +
               n +
               ".mp4</MediaFile></MediaFiles></Linear></Creative></Creatives></InLine></Ad>"
               "<Ad id=\"wr" +
               n +
               "\" sequence=\"2\"><Wrapper><AdSystem>w</AdSystem>"
               "<Impression>https://w.test/p?b=" +
               n +
               "</Impression><Creatives><Creative><Linear><TrackingEvents><Tracking "
               "event=\"start\">https://w.test/s?b=" +
               n +
               "</Tracking></TrackingEvents></Linear></Creative></Creatives></Wrapper></Ad>"
               "</VAST></vmap:VASTAdData></vmap:AdSource></vmap:AdBreak>";
    });
}

// A Wrapper ad whose lists are long, merged into the InLine ad of wrappedUrl (a local file the
// source-IO module may read). Items go round-robin to its impressions, its Linear's tracking
// events and its click tracking: item i is "https://w.test/<kind>?n=<i>".
inline Document WrapperMerge(size_t bytes, const std::string& wrappedUrl) {
    Document document;
    std::string impressions, trackings, clicks;
    const size_t frame = 400 + wrappedUrl.size();
    while (frame + impressions.size() + trackings.size() + clicks.size() < bytes) {
        const std::string n = N(document.count);
        switch (document.count++ % 3) {
            case 0:
                impressions += "<Impression>https://w.test/i?n=" + n + "&amp;p=xx</Impression>";
                break;
            case 1:
                trackings += "<Tracking event=\"start\">https://w.test/t?n=" + n + "</Tracking>";
                break;
            default:
                clicks += "<ClickTracking>https://w.test/k?n=" + n + "</ClickTracking>";
                break;
        }
    }
    document.text =
        "<VAST version=\"3.0\"><Ad id=\"w\" sequence=\"1\"><Wrapper>"
        "<AdSystem>w</AdSystem><VASTAdTagURI>" +
        wrappedUrl + "</VASTAdTagURI>" + impressions +
        "<Creatives><Creative><Linear><TrackingEvents>" + trackings +
        "</TrackingEvents><VideoClicks>" + clicks +
        "</VideoClicks></Linear></Creative></Creatives></Wrapper></Ad></VAST>";
    return document;
}

enum class Mode { kVmap, kVastOnly };

struct Shape {
    const char* name;
    Mode mode;
    Document (*build)(size_t bytes);
};

#ifdef KA_EXAMPLES_DIR
// The wrapped document of WrapperMerge: two Linear creatives, each of which gets the copies.
inline std::string WrappedExampleUrl() {
    return std::string("file://") + KA_EXAMPLES_DIR + "vast-inline-linear.xml";
}
inline Document WrapperMergeOfExample(size_t bytes) {
    return WrapperMerge(bytes, WrappedExampleUrl());
}
#endif

// Every shape the benchmark runs.
inline const Shape* Shapes(size_t* count) {
    static const Shape kShapes[] = {
        {"vmap_breaks", Mode::kVmap, VmapBreaks},
        {"vmap_trackings", Mode::kVmap, VmapTrackings},
        {"vast_ads", Mode::kVastOnly, VastAds},
        {"vast_impressions", Mode::kVastOnly, VastImpressions},
        {"vast_creatives", Mode::kVastOnly, VastCreatives},
        {"vast_mediafiles", Mode::kVastOnly, VastMediaFiles},
        {"vast_trackings", Mode::kVastOnly, VastTrackings},
        {"vast_clicktrackings", Mode::kVastOnly, VastClickTrackings},
        {"deep", Mode::kVmap, Deep},
        {"long_attribute", Mode::kVmap, LongAttribute},
        {"long_text", Mode::kVastOnly, LongText},
        {"inline_vast_breaks", Mode::kVmap, InlineVastBreaks},
#ifdef KA_EXAMPLES_DIR
        {"wrapper_merge", Mode::kVastOnly, WrapperMergeOfExample},
#endif
    };
    *count = sizeof(kShapes) / sizeof(kShapes[0]);
    return kShapes;
}

}  // namespace hostile
