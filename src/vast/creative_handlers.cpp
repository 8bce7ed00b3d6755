// Handlers of <Creatives> and <Creative>: one AdCreative per Creative element.

#include "ka/result_codes.h"
#include "vast/vast_parser.h"
#include "xml/text.h"

using ka::NameIs;

unsigned int CVASTParser::LoadCreative(void* node, void* target, char* name,
                                       unsigned int nameLength) {
    // The error keeps other children out of the InLine's creativeCount.
    if (node == nullptr || target == nullptr || name == nullptr) return KA_ERR_LOAD_FAILED;
    if (!NameIs(name, nameLength, "Creative")) return KA_ERR_LOAD_FAILED;
    AdCreative* creative = mArena->New<AdCreative>();
    mCreativeTail.Append(static_cast<AdCreative**>(target), creative);
    BeginCreativeExtras(creative);
    LoadCreativeAttributes(node, creative);
    LoadTag(node, creative, &CVASTParser::LoadCreativeTag);
    return KA_OK;
}

unsigned int CVASTParser::LoadCreativeAttributes(void* node, AdCreative* creative) {
    if (node == nullptr || creative == nullptr) return KA_OK;
    static constexpr auto kNames =
        ka::AttributeNames("id", "sequence", "adId", "apiFramework", "AdID");
    XMLAttributeValue values[5];
    ReadAttributes(node, kNames, values);
    CopyAttribute(values[0], creative->id);
    if (values[1].Present()) creative->sequence = ka::Atoi(values[1].value, values[1].length);
    CopyAttribute(values[2], creative->adId);
    LoadCreativeExtraAttributes(values[3], values[4]);
    return KA_OK;
}

unsigned int CVASTParser::LoadCreativeTag(void* node, void* target, char* name,
                                          unsigned int nameLength) {
    if (node == nullptr || target == nullptr || name == nullptr) return KA_OK;
    // Only linear content is kept in the records; the rest goes to the extras.
    if (!NameIs(name, nameLength, "Linear")) {
        if (mReadExtras) LoadCreativeExtra(node, name, nameLength);
        return KA_OK;
    }
    AdCreative* creative = static_cast<AdCreative*>(target);
    creative->kind = AD_CREATIVE_LINEAR;
    LoadTag(node, &creative->content, &CVASTParser::LoadLinearTag);
    // After the children, so that a percentage can use the duration.
    LoadSkipOffset(node, &creative->content);
    return KA_OK;
}

unsigned int CVASTParser::LoadIgnoredTag(void* /*node*/, void* /*target*/, char* /*name*/,
                                         unsigned int /*nameLength*/) {
    return KA_OK;
}
