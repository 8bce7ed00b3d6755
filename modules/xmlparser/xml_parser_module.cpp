// Stand-in for the platform's XML parser module: the thirteen-slot table of
// "xml_parser_api.h" over pugixml.
//
// What the module promises, and how:
// - A node is the module's record of an element (element_index.h), so a node from one handle's
//   document works with the operations of any other handle of this module; node queries never
//   look at the handle's own document. Names, texts and attributes are measured once, at load.
// - Children are elements only: the walks skip every other kind of node.
// - Names, attribute values and texts are raw, exactly as written in the buffer: no entity or
//   character reference is decoded, no line ending or attribute white space is normalised.
// - An element's text is its first text or CDATA child, trimmed of the six white-space bytes
//   (space, \t, \n, \v, \f, \r), texts of white space only not counting; a CDATA section reads
//   "![CDATA[" + content + "]]". Both are written into the document itself right after the
//   load, so they live exactly as long as the document, whichever handle asks for them.
// - The load mode (the library always passes 160) is accepted and not interpreted: every load
//   parses the whole buffer the same way.
// - Every string stays valid until the handle's next load or Uninit; every lookup writes null
//   and 0 when there is nothing, and still returns 0. Only bad arguments give a non-zero result.
// - The whole buffer must be one well-formed element (comments, processing instructions and the
//   XML declaration around it are allowed and dropped); anything else fails the load. There is
//   no DTD support: a document with a DOCTYPE is refused, so no entity is ever defined,
//   expanded or fetched, and nothing outside the buffer is read.
// - Parsing is linear in the buffer's size and never recurses by document depth, and neither
//   does the pass over the loaded tree.
// - GetNextAttribute walks an element's attributes; an attribute that is not the node's own
//   ends the walk. SetParam, GetParam and slot 12 do nothing and answer kErrUnsupported.
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>
#include <pugixml.hpp>

#include "element_index.h"
#include "ka/result_codes.h"
#include "xml_parser_api.h"

namespace {

using xmlmodule::Attribute;
using xmlmodule::Element;

// Module-private: SetParam, GetParam and slot 12 know no identifiers or requests.
constexpr unsigned int kErrUnsupported = 0x91001001u;

// pugixml flags of every load: CDATA sections and a DOCTYPE become nodes (so that the one can be
// read and the other refused); no escapes, no end-of-line or attribute normalisation, so texts
// stay raw; fragment mode keeps text at the top level visible, so that it can be refused too.
constexpr unsigned int kParseFlags = pugi::parse_cdata | pugi::parse_doctype | pugi::parse_fragment;

struct ParserHandle {
    pugi::xml_document document;
    xmlmodule::ElementIndex index;
    Element* root = nullptr;  // null while no document is loaded
};

ParserHandle* AsHandle(void* handle) { return static_cast<ParserHandle*>(handle); }

const Element* AsElement(void* node) { return static_cast<const Element*>(node); }

void* AsNode(const Element* element) { return const_cast<Element*>(element); }

void ClearNode(void** out) {
    if (out != nullptr) *out = nullptr;
}

void ClearString(char** text, int* length) {
    if (text != nullptr) *text = nullptr;
    if (length != nullptr) *length = 0;
}

void SetString(const char* value, int valueLength, char** text, int* length) {
    *text = const_cast<char*>(value);
    *length = valueLength;
}

// Whether a name the index measured is the terminated string wanted, compared in place: names
// mostly differ in their first bytes, so a lookup needs no strlen of what it looks for. A name
// holds no NUL, so the comparison stops at wanted's terminator at the latest.
bool IsNamed(const char* name, int nameLength, const char* wanted) {
    for (int i = 0; i < nameLength; ++i) {
        if (name[i] != wanted[i]) return false;
    }
    return wanted[nameLength] == '\0';
}

unsigned int Init(void** handle, XMLInitData* /*init*/) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    *handle = new (std::nothrow) ParserHandle();
    return *handle != nullptr ? KA_OK : KA_ERR_NULL_ARGUMENT;
}

unsigned int Uninit(void* handle) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    delete AsHandle(handle);
    return KA_OK;
}

// The load mode is accepted and not interpreted: every load parses the whole buffer the same
// way (the library only ever passes 160). A failed load leaves the handle without a document.
unsigned int LoadXML(void* handle, char* buffer, int size, int /*mode*/) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    ParserHandle* parser = AsHandle(handle);
    parser->root = nullptr;
    parser->document.reset();
    if (buffer == nullptr || size <= 0) return KA_ERR_LOAD_FAILED;

    // A terminator that the caller counted in the size is tolerated; a NUL byte anywhere
    // inside the document is not XML, and pugixml would stop reading there silently.
    size_t length = static_cast<size_t>(size);
    while (length > 0 && buffer[length - 1] == '\0') --length;
    if (length == 0 || memchr(buffer, '\0', length) != nullptr) return KA_ERR_LOAD_FAILED;

    pugi::xml_parse_result result =
        parser->document.load_buffer(buffer, length, kParseFlags, pugi::encoding_utf8);
    if (result) parser->root = parser->index.Build(parser->document, length);
    if (parser->root == nullptr) {
        parser->document.reset();
        return KA_ERR_LOAD_FAILED;
    }
    return KA_OK;
}

unsigned int GetFirstChild(void* handle, void* node, void** child) {
    if (handle == nullptr || child == nullptr) {
        ClearNode(child);
        return KA_ERR_NULL_ARGUMENT;
    }
    *child = AsNode(node == nullptr ? AsHandle(handle)->root : AsElement(node)->firstChild);
    return KA_OK;
}

unsigned int GetNextSibling(void* handle, void* node, void** sibling) {
    if (handle == nullptr || node == nullptr || sibling == nullptr) {
        ClearNode(sibling);
        return KA_ERR_NULL_ARGUMENT;
    }
    *sibling = AsNode(AsElement(node)->nextSibling);
    return KA_OK;
}

unsigned int GetChildByName(void* handle, void* node, char* name, void** child) {
    ClearNode(child);
    if (handle == nullptr || node == nullptr || name == nullptr || child == nullptr) {
        return KA_ERR_NULL_ARGUMENT;
    }
    for (const Element* it = AsElement(node)->firstChild; it != nullptr; it = it->nextSibling) {
        if (IsNamed(it->name, it->nameLength, name)) {
            *child = AsNode(it);
            break;
        }
    }
    return KA_OK;
}

unsigned int GetAttributeValue(void* handle, void* node, char* name, char** value, int* length) {
    if (handle == nullptr || node == nullptr || name == nullptr || value == nullptr ||
        length == nullptr) {
        ClearString(value, length);
        return KA_ERR_NULL_ARGUMENT;
    }
    // Duplicate attributes are not refused; the first one is the one read.
    const Element* element = AsElement(node);
    for (int i = 0; i < element->attributeCount; ++i) {
        const Attribute& attribute = element->attributes[i];
        if (IsNamed(attribute.name, attribute.nameLength, name)) {
            SetString(attribute.value, attribute.valueLength, value, length);
            return KA_OK;
        }
    }
    ClearString(value, length);
    return KA_OK;
}

// The attribute after current among element's own, the first one for a null current; null when
// there is none or current is not one of them. Compared as addresses, so that a stranger's
// pointer is recognised without arithmetic on it: one below the first wraps to a large offset.
const Attribute* AttributeAfter(const Element* element, const void* current) {
    const size_t count = static_cast<size_t>(element->attributeCount);
    if (count == 0) return nullptr;
    if (current == nullptr) return element->attributes;
    const uintptr_t offset =
        reinterpret_cast<uintptr_t>(current) - reinterpret_cast<uintptr_t>(element->attributes);
    // One of the attributes before the last, at its start: the next one follows it. The answer
    // is current's neighbour, so the library's next step waits on no division; only the check
    // does.
    if (offset >= (count - 1) * sizeof(Attribute) || offset % sizeof(Attribute) != 0) {
        return nullptr;
    }
    return static_cast<const Attribute*>(current) + 1;
}

// Walks an element's attributes in document order: a null current gives the first one, an
// attribute this operation returned for the same node gives the one after it. The library reads
// every attribute of an element this way, so the answer costs a few stores.
unsigned int GetNextAttribute(void* handle, void* node, void** next, void* current, char** name,
                              int* nameLength, char** value, int* valueLength) {
    if (handle == nullptr || node == nullptr || next == nullptr || name == nullptr ||
        nameLength == nullptr || value == nullptr || valueLength == nullptr) {
        ClearNode(next);
        ClearString(name, nameLength);
        ClearString(value, valueLength);
        return KA_ERR_NULL_ARGUMENT;
    }
    const Attribute* attribute = AttributeAfter(AsElement(node), current);
    if (attribute == nullptr) {
        *next = nullptr;
        ClearString(name, nameLength);
        ClearString(value, valueLength);
        return KA_OK;
    }
    *next = const_cast<Attribute*>(attribute);
    SetString(attribute->name, attribute->nameLength, name, nameLength);
    SetString(attribute->value, attribute->valueLength, value, valueLength);
    return KA_OK;
}

unsigned int GetTagValue(void* handle, void* node, char** text, int* length) {
    if (handle == nullptr || node == nullptr || text == nullptr || length == nullptr) {
        ClearString(text, length);
        return KA_ERR_NULL_ARGUMENT;
    }
    const Element* element = AsElement(node);
    SetString(element->text, element->text != nullptr ? element->textLength : 0, text, length);
    return KA_OK;
}

unsigned int GetTagName(void* handle, void* node, char** name, int* length) {
    if (handle == nullptr || node == nullptr || name == nullptr || length == nullptr) {
        ClearString(name, length);
        return KA_ERR_NULL_ARGUMENT;
    }
    const Element* element = AsElement(node);
    SetString(element->name, element->nameLength, name, length);
    return KA_OK;
}

// The module has no parameters.
unsigned int SetParam(void* /*handle*/, unsigned int /*id*/, void* /*value*/) {
    return kErrUnsupported;
}

unsigned int GetParam(void* /*handle*/, unsigned int /*id*/, void* /*value*/) {
    return kErrUnsupported;
}

// The unnamed slot does nothing; its two integers read 0.
unsigned int Reserved12(void* /*handle*/, char* /*text*/, void* /*node*/, int* a, int* b) {
    if (a != nullptr) *a = 0;
    if (b != nullptr) *b = 0;
    return kErrUnsupported;
}

}  // namespace

// The module's single entry: fills all thirteen slots; 0, or -1 for a null table.
extern "C" __attribute__((visibility("default"))) int kaXMLGetParserAPI(XMLParserAPI* api) {
    if (api == nullptr) return -1;
    api->Init = Init;
    api->Uninit = Uninit;
    api->LoadXML = LoadXML;
    api->GetFirstChild = GetFirstChild;
    api->GetNextSibling = GetNextSibling;
    api->GetChildByName = GetChildByName;
    api->GetAttributeValue = GetAttributeValue;
    api->GetNextAttribute = GetNextAttribute;
    api->GetTagValue = GetTagValue;
    api->GetTagName = GetTagName;
    api->SetParam = SetParam;
    api->GetParam = GetParam;
    api->Reserved12 = Reserved12;
    return 0;
}
