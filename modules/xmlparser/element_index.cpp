#include "element_index.h"

#include <cstdlib>
#include <cstring>
#include <new>

#include "xml_parser_api.h"

namespace xmlmodule {

namespace {

constexpr size_t kAlignment = alignof(Element) > alignof(Attribute) ? alignof(Element)
                                                                    : alignof(Attribute);
// The smallest block worth a call to malloc.
constexpr size_t kMinBlockSize = 1024;
// What an idle handle may keep between loads; an index larger than this is rebuilt in fresh
// blocks each time.
constexpr size_t kKeptLimit = 4 * 1024 * 1024;

// The end of an attribute list, told without a call into pugixml: a handle is one pointer.
bool IsEnd(const pugi::xml_attribute& attribute) {
    static_assert(sizeof(pugi::xml_attribute) == sizeof(void*), "a handle is one pointer");
    void* raw = nullptr;
    memcpy(&raw, &attribute, sizeof(raw));
    return raw == nullptr;
}

}  // namespace

IndexMemory::~IndexMemory() {
    for (const Block& block : mBlocks) free(block.data);
}

void* IndexMemory::Allocate(size_t bytes) {
    bytes = (bytes + kAlignment - 1) & ~(kAlignment - 1);
    if (mBlocks.empty() || mBlocks.back().size - mUsed < bytes) {
        if (!AddBlock(bytes)) return nullptr;
    }
    void* result = mBlocks.back().data + mUsed;
    mUsed += bytes;
    return result;
}

void IndexMemory::Reserve(size_t bytes) {
    if (mBlocks.empty()) AddBlock(bytes);
}

bool IndexMemory::AddBlock(size_t atLeast) {
    // Each block at least doubles what there is, so a document takes few blocks.
    size_t total = 0;
    for (const Block& block : mBlocks) total += block.size;
    size_t size = total > kMinBlockSize ? total : kMinBlockSize;
    if (size < atLeast) size = atLeast;
    char* data = static_cast<char*>(malloc(size));
    if (data == nullptr) return false;
    try {
        mBlocks.push_back({data, size});
    } catch (const std::bad_alloc&) {
        free(data);
        return false;
    }
    mUsed = 0;
    return true;
}

void IndexMemory::Reset() {
    mUsed = 0;
    if (mBlocks.size() == 1 && mBlocks.front().size <= kKeptLimit) return;
    size_t total = 0;
    for (const Block& block : mBlocks) {
        total += block.size;
        free(block.data);
    }
    mBlocks.clear();
    if (total > 0 && total <= kKeptLimit) AddBlock(total);
}

Element* ElementIndex::Build(pugi::xml_document& document, size_t sizeHint) {
    mMemory.Reset();
    mMemory.Reserve(sizeHint);
    mRoot = nullptr;
    mRefused = false;
    try {
        mLevels.assign(1, Level{nullptr, nullptr});
        // traverse visits every node below the document in document order with its depth,
        // climbing by parent links inside pugixml: one call per node instead of several.
        if (!document.traverse(*this) || mRefused) return nullptr;
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
    return mRoot;
}

bool ElementIndex::for_each(pugi::xml_node& node) {
    const size_t at = static_cast<size_t>(depth());
    // Levels below this node's belong to subtrees already finished.
    if (mLevels.size() > at + 1) mLevels.resize(at + 1);
    Level& level = mLevels[at];
    switch (node.type()) {
        case pugi::node_element: {
            if (!AddElement(node, level)) return !(mRefused = true);
            const Level below = {level.lastChild, nullptr};
            mLevels.push_back(below);
            return true;
        }
        case pugi::node_pcdata:
        case pugi::node_cdata: {
            Element* parent = level.parent;
            // Text at the top level is refused.
            size_t length = 0;
            if (parent == nullptr || !PrepareText(node, &length)) return !(mRefused = true);
            if (parent->text == nullptr && length > 0) {
                parent->text = node.value();
                parent->textLength = static_cast<int>(length);
            }
            return true;
        }
        case pugi::node_doctype:
            return !(mRefused = true);
        default:
            // Comments, processing instructions and the declaration are dropped.
            return true;
    }
}

bool ElementIndex::AddElement(pugi::xml_node node, Level& level) {
    Element* element = static_cast<Element*>(mMemory.Allocate(sizeof(Element)));
    if (element == nullptr) return false;
    *element = Element();
    element->name = node.name();
    element->nameLength = static_cast<int>(strlen(element->name));
    if (level.parent == nullptr) {
        if (mRoot != nullptr) return false;  // a second element at the top level
        mRoot = element;
    } else if (level.lastChild != nullptr) {
        level.lastChild->nextSibling = element;
    } else {
        level.parent->firstChild = element;
    }
    level.lastChild = element;

    mAttributes.clear();
    for (pugi::xml_attribute a = node.first_attribute(); !IsEnd(a); a = a.next_attribute()) {
        const char* name = a.name();
        const char* value = a.value();
        mAttributes.push_back(Attribute{name, value, static_cast<int>(strlen(name)),
                                        static_cast<int>(strlen(value))});
    }
    if (mAttributes.empty()) return true;
    const size_t bytes = sizeof(Attribute) * mAttributes.size();
    Attribute* attributes = static_cast<Attribute*>(mMemory.Allocate(bytes));
    if (attributes == nullptr) return false;
    memcpy(attributes, mAttributes.data(), bytes);
    element->attributes = attributes;
    element->attributeCount = static_cast<int>(mAttributes.size());
    return true;
}

bool ElementIndex::PrepareText(pugi::xml_node node, size_t* prepared) {
    const char* value = node.value();
    const size_t length = strlen(value);
    *prepared = length;
    if (node.type() == pugi::node_pcdata) {
        // A text keeps its trimmed value. pugixml may write the new value over the old one,
        // so it goes through the scratch buffer rather than straight from the value itself.
        size_t begin = 0;
        while (begin < length && ka::IsXmlSpace(value[begin])) ++begin;
        size_t end = length;
        while (end > begin && ka::IsXmlSpace(value[end - 1])) --end;
        if (begin == 0 && end == length) return true;
        *prepared = end - begin;
        if (begin == end) return node.set_value("", 0);
        mScratch.assign(value + begin, value + end);
        return node.set_value(mScratch.data(), mScratch.size());
    }
    // A CDATA section reads as the library expects it: "![CDATA[" content "]]".
    mScratch.clear();
    mScratch.insert(mScratch.end(), ka::kXmlCDataOpen, ka::kXmlCDataOpen + ka::kXmlCDataOpenLength);
    mScratch.insert(mScratch.end(), value, value + length);
    mScratch.insert(mScratch.end(), ka::kXmlCDataClose,
                    ka::kXmlCDataClose + ka::kXmlCDataCloseLength);
    *prepared = mScratch.size();
    return node.set_value(mScratch.data(), mScratch.size());
}

}  // namespace xmlmodule
