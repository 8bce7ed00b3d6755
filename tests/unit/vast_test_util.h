// Shared by the VAST parser tests: a fixture that runs documents through a real CVASTParser
// over the stand-in XML module, and helpers that walk the records it builds.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "ka/result_codes.h"
#include "ka/vast_records.h"
#include "platform/sdk_object.h"
#include "vast/vast_parser.h"

namespace vasttest {

// Open keeps the working path by pointer: a buffer that lives for the whole run.
inline char* ModulesDir() {
    static char dir[1024];
    if (dir[0] == '\0') std::strncpy(dir, KA_MODULES_DIR, sizeof(dir) - 1);
    return dir;
}

inline std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream out;
    out << in.rdbuf();
    return out.str();
}

template <typename T>
uint32_t Length(const T* list) {
    uint32_t n = 0;
    for (; list != nullptr; list = list->next) ++n;
    return n;
}

template <typename T>
T* Nth(T* list, uint32_t index) {
    for (uint32_t i = 0; i < index && list != nullptr; ++i) list = list->next;
    return list;
}

inline std::string Str(const char* text) { return text == nullptr ? "<null>" : text; }

// The url of every node of an impression, click or tracking list, in list order.
template <typename T>
std::vector<std::string> Urls(const T* list) {
    std::vector<std::string> urls;
    for (; list != nullptr; list = list->next) urls.push_back(Str(list->url));
    return urls;
}

// Every count of the records equals the length of its list.
inline void ExpectCountsMatch(const VastAdData& data) {
    EXPECT_EQ(data.adCount, Length(data.firstAd));
    for (const AdData* ad = data.firstAd; ad != nullptr; ad = ad->next) {
        const AdCreative* creatives = nullptr;
        if (ad->type == AD_TYPE_INLINE && ad->body != nullptr) {
            const AdInLine* inLine = static_cast<const AdInLine*>(ad->body);
            EXPECT_GE(inLine->impressionCount, Length(inLine->impressions));
            EXPECT_EQ(inLine->creativeCount, Length(inLine->creatives));
            creatives = inLine->creatives;
        } else if (ad->type == AD_TYPE_WRAPPER && ad->body != nullptr) {
            creatives = static_cast<const AdWrapper*>(ad->body)->creatives;
        }
        for (const AdCreative* c = creatives; c != nullptr; c = c->next) {
            const AdLinear& l = c->content;
            EXPECT_EQ(l.mediaFileCount, Length(l.mediaFiles));
            EXPECT_EQ(l.trackingCount, Length(l.trackingEvents));
            EXPECT_EQ(l.videoClicksCount, Length(l.videoClicks));
            EXPECT_EQ(l.adParametersCount, Length(l.adParameters));
            EXPECT_EQ(l.iconCount, Length(l.icons));
            if (const AdVideoClicks* v = l.videoClicks) {
                EXPECT_EQ(v->clickThroughCount, Length(v->clickThroughs));
                EXPECT_EQ(v->clickTrackingCount, Length(v->clickTrackings));
                EXPECT_EQ(v->customClickCount, Length(v->customClicks));
            }
        }
    }
}

class VastParserTest : public ::testing::Test {
protected:
    void SetUp() override {
        mObjectsBefore = CSDKObject::g_kaSDKObjectNum;
        mParser = new CVASTParser();
        // At its depth limit a parser follows no wrapper: the made-up URIs are never fetched.
        mParser->mMaxDepth = 0;
        ASSERT_EQ(mParser->Open(ModulesDir()), 0u) << "XML module not found in " << ModulesDir();
    }

    void TearDown() override {
        mParser->ReleaseVastAdData(&mParser->mVastAdData);
        EXPECT_EQ(mParser->mVastAdData.firstAd, nullptr);
        EXPECT_EQ(mParser->mVastAdData.errorUrl, nullptr);
        delete mParser;
        // Nested parsers and every other library object are gone with the records.
        EXPECT_EQ(CSDKObject::g_kaSDKObjectNum, mObjectsBefore);
    }

    // Runs a whole document through Process (which closes the parser); counts checked each time.
    unsigned int Parse(const std::string& document) {
        std::string buffer = document;
        unsigned int result =
            mParser->Process(&buffer[0], static_cast<unsigned int>(buffer.size()), 1, nullptr);
        ExpectCountsMatch(mParser->mVastAdData);
        return result;
    }
    // Opens again and parses after what is already held.
    unsigned int Reparse(const std::string& document) {
        EXPECT_EQ(mParser->Open(ModulesDir()), 0u);
        return Parse(document);
    }
    // Drops what is held, opens again and parses: one case of a table.
    unsigned int Fresh(const std::string& document) {
        mParser->ReleaseVastAdData(&mParser->mVastAdData);
        return Reparse(document);
    }

    VastAdData& Data() { return mParser->mVastAdData; }
    AdData* Ad(uint32_t index) { return Nth(Data().firstAd, index); }
    template <typename Body>
    Body* BodyOf(uint32_t index, uint32_t type) {
        AdData* ad = Ad(index);
        return ad == nullptr || ad->type != type ? nullptr : static_cast<Body*>(ad->body);
    }
    AdInLine* InLine(uint32_t index) { return BodyOf<AdInLine>(index, AD_TYPE_INLINE); }
    AdWrapper* Wrapper(uint32_t index) { return BodyOf<AdWrapper>(index, AD_TYPE_WRAPPER); }
    // The first creative of the first InLine ad of a document.
    AdCreative* FirstCreative() { return InLine(0) == nullptr ? nullptr : InLine(0)->creatives; }

    CVASTParser* mParser = nullptr;
    int mObjectsBefore = 0;
};

// A VAST document with one InLine ad holding the given content.
inline std::string InLineDocument(const std::string& content) {
    return "<VAST version=\"3.0\"><Ad id=\"a\"><InLine>" + content + "</InLine></Ad></VAST>";
}

// One InLine ad with one Creative whose Linear has the given attributes and content.
inline std::string LinearDocument(const std::string& attributes, const std::string& content) {
    return InLineDocument("<Creatives><Creative><Linear " + attributes + ">" + content +
                          "</Linear></Creative></Creatives>");
}

}  // namespace vasttest
