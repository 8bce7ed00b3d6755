// The module's view of a loaded document: one record per element with its name, its text and
// its attributes already measured, linked to its first child and next sibling element. The
// library asks for names, texts and attributes many times per element; answering from these
// records costs a pointer or two, where the pugixml accessors cost a call and a strlen each.
#pragma once

#include <cstddef>
#include <pugixml.hpp>
#include <vector>

namespace xmlmodule {

struct Attribute {
    const char* name;
    const char* value;
    int nameLength;
    int valueLength;
};

struct Element {
    const char* name;
    const char* text;  // the element text as GetTagValue hands it out; null when none
    Element* firstChild;
    Element* nextSibling;
    const Attribute* attributes;
    int nameLength;
    int textLength;
    int attributeCount;
};

// Bump allocation over a few blocks that later loads reuse: a handle that loads documents of
// similar size allocates nothing for its index after the first one.
class IndexMemory {
public:
    IndexMemory() = default;
    ~IndexMemory();
    IndexMemory(const IndexMemory&) = delete;
    IndexMemory& operator=(const IndexMemory&) = delete;

    // Aligned for the records above; null when memory is exhausted.
    void* Allocate(size_t bytes);
    // Gives an empty memory its first block of this size, so that an index about this large
    // needs one block.
    void Reserve(size_t bytes);
    // Forgets every allocation. The blocks become one block of their total size, kept up to a
    // limit, so the next load of a document like the last one fits without allocating.
    void Reset();

private:
    struct Block {
        char* data;
        size_t size;
    };
    bool AddBlock(size_t atLeast);

    std::vector<Block> mBlocks;
    size_t mUsed = 0;  // bytes used in the last block
};

// Builds the records of a parsed document in one pass of pugixml's own walk (no recursion), and
// puts every text and CDATA value into the form GetTagValue hands out. Build returns the root
// element, or null when the top level holds anything but one element (text, CDATA, a DOCTYPE,
// a second element) or memory ran out. sizeHint is the document's size, which the index
// roughly matches.
class ElementIndex : private pugi::xml_tree_walker {
public:
    Element* Build(pugi::xml_document& document, size_t sizeHint);
    void Reset() { mMemory.Reset(); }

private:
    struct Level {
        Element* parent;     // null for the document itself
        Element* lastChild;  // last element appended below parent
    };
    bool for_each(pugi::xml_node& node) override;
    bool AddElement(pugi::xml_node node, Level& level);
    // Trims a text node or wraps a CDATA one in place and gives the new value's length; false
    // when memory ran out.
    bool PrepareText(pugi::xml_node node, size_t* prepared);

    IndexMemory mMemory;
    Element* mRoot = nullptr;
    bool mRefused = false;
    // One entry per depth above the node being visited; entries below it are stale.
    std::vector<Level> mLevels;
    std::vector<Attribute> mAttributes;
    // Where trimmed texts and CDATA forms are assembled before they go back into the document.
    std::vector<char> mScratch;
};

}  // namespace xmlmodule
