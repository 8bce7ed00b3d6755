// The XML parser module's table of operations, as its entry "kaXMLGetParserAPI" fills it, and
// the form of the texts it hands out. Shared by the library and the stand-in module. Every
// operation returns 0 on success; nodes are opaque; strings point into memory the module owns
// until the next load or Uninit.
#pragma once

#include <cstddef>

struct XMLInitData {
    void* reserved0;  // always null
    void* reserved1;  // always null
    void* owner;      // the CXMLDocument that opens the handle
};

struct XMLParserAPI {
    // Opens a parser handle into *handle.
    unsigned int (*Init)(void** handle, XMLInitData* init);
    // Closes the handle and every document it holds.
    unsigned int (*Uninit)(void* handle);
    // Parses size bytes of buffer, replacing the handle's document; non-zero when not well-formed.
    unsigned int (*LoadXML)(void* handle, char* buffer, int size, int mode);
    // First child element of node; with a null node, the document's root element. Null if none.
    unsigned int (*GetFirstChild)(void* handle, void* node, void** child);
    // Next sibling element, or null; the child walk ends on null.
    unsigned int (*GetNextSibling)(void* handle, void* node, void** sibling);
    // First direct child element whose qualified name equals name exactly, or null.
    unsigned int (*GetChildByName)(void* handle, void* node, char* name, void** child);
    // Raw attribute value (entities not decoded) and its length; null and 0 when absent.
    unsigned int (*GetAttributeValue)(void* handle, void* node, char* name, char** value,
                                      int* length);
    // Attribute iteration: a null current gives the first attribute, one this operation gave
    // the next; next is null past the last. The library reads attributes in one pass with it.
    unsigned int (*GetNextAttribute)(void* handle, void* node, void** next, void* current,
                                     char** name, int* nameLength, char** value, int* valueLength);
    // Element text: the first text or CDATA child, trimmed; CDATA reads "![CDATA[...]]".
    unsigned int (*GetTagValue)(void* handle, void* node, char** text, int* length);
    // Qualified name as written, prefix included.
    unsigned int (*GetTagName)(void* handle, void* node, char** name, int* length);
    // Module parameters; the library never calls them.
    unsigned int (*SetParam)(void* handle, unsigned int id, void* value);
    unsigned int (*GetParam)(void* handle, unsigned int id, void* value);
    // Unnamed operation; the library never calls it but keeps its slot.
    unsigned int (*Reserved12)(void* handle, char* text, void* node, int* a, int* b);
};

typedef int (*KaXMLGetParserAPIFn)(XMLParserAPI* api);

namespace ka {

// An element whose text is a CDATA section reads as kXmlCDataOpen + content + kXmlCDataClose.
constexpr char kXmlCDataOpen[] = "![CDATA[";
constexpr size_t kXmlCDataOpenLength = sizeof(kXmlCDataOpen) - 1;
constexpr char kXmlCDataClose[] = "]]";
constexpr size_t kXmlCDataCloseLength = sizeof(kXmlCDataClose) - 1;

// The white space the module trims from element texts and the library from CDATA content: the
// six characters of C's "C" locale. Bytes at or above 0x80 are never white space.
inline bool IsXmlSpace(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

}  // namespace ka
