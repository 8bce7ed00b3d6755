// Stand-in for the platform's XML parser module: the thirteen-slot table of
// "xml/xml_parser_api.h" over pugixml.
//
// What the module promises, and how:
// - A node is the pugixml node record itself (xml_node::internal_object()), so a node from one
//   handle's document works with the operations of any other handle of this module; node
//   queries never look at the handle's own document.
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
// - GetNextAttribute walks an element's attributes; SetParam, GetParam and slot 12 do nothing
//   and answer kErrUnsupported.
#include <cstddef>
#include <cstring>
#include <new>
#include <pugixml.hpp>

#include "ka/result_codes.h"
#include "xml/xml_parser_api.h"

namespace {

// Module-private: SetParam, GetParam and slot 12 know no identifiers or requests.
constexpr unsigned int kErrUnsupported = 0x91001001u;

// pugixml flags of every load: CDATA sections and a DOCTYPE become nodes (so that the one can be
// read and the other refused); no escapes, no end-of-line or attribute normalisation, so texts
// stay raw; fragment mode keeps text at the top level visible, so that it can be refused too.
constexpr unsigned int kParseFlags = pugi::parse_cdata | pugi::parse_doctype | pugi::parse_fragment;

constexpr char kCDataOpen[] = "![CDATA[";
constexpr size_t kCDataOpenLength = sizeof(kCDataOpen) - 1;
constexpr char kCDataClose[] = "]]";
constexpr size_t kCDataCloseLength = sizeof(kCDataClose) - 1;

struct ParserHandle {
    pugi::xml_document document;
    // Where trimmed texts and CDATA forms are assembled before they go into the document.
    char* scratch = nullptr;
    size_t scratchSize = 0;

    ~ParserHandle() { delete[] scratch; }
};

ParserHandle* AsHandle(void* handle) { return static_cast<ParserHandle*>(handle); }

pugi::xml_node AsNode(void* node) {
    return pugi::xml_node(static_cast<pugi::xml_node_struct*>(node));
}

bool IsSpace(char c) {
    return c == ' ' || c == '\t' || c == '\n' || c == '\v' || c == '\f' || c == '\r';
}

bool IsText(const pugi::xml_node& node) {
    return node.type() == pugi::node_pcdata || node.type() == pugi::node_cdata;
}

bool EnsureScratch(ParserHandle* handle, size_t size) {
    if (handle->scratchSize >= size) return true;
    char* grown = new (std::nothrow) char[size];
    if (grown == nullptr) return false;
    delete[] handle->scratch;
    handle->scratch = grown;
    handle->scratchSize = size;
    return true;
}

// A text node keeps its trimmed value. pugixml may write the new value over the old one, so the
// trimmed text goes through the scratch buffer rather than straight from the value itself.
bool TrimText(ParserHandle* handle, pugi::xml_node node) {
    const char* value = node.value();
    size_t length = strlen(value);
    size_t begin = 0;
    while (begin < length && IsSpace(value[begin])) ++begin;
    size_t end = length;
    while (end > begin && IsSpace(value[end - 1])) --end;
    if (begin == 0 && end == length) return true;
    if (!EnsureScratch(handle, end - begin + 1)) return false;
    memcpy(handle->scratch, value + begin, end - begin);
    return node.set_value(handle->scratch, end - begin);
}

// A CDATA node's value becomes the section as the library reads it: "![CDATA[" content "]]".
bool WrapCData(ParserHandle* handle, pugi::xml_node node) {
    const char* value = node.value();
    size_t length = strlen(value);
    size_t total = kCDataOpenLength + length + kCDataCloseLength;
    if (!EnsureScratch(handle, total)) return false;
    memcpy(handle->scratch, kCDataOpen, kCDataOpenLength);
    memcpy(handle->scratch + kCDataOpenLength, value, length);
    memcpy(handle->scratch + kCDataOpenLength + length, kCDataClose, kCDataCloseLength);
    return node.set_value(handle->scratch, total);
}

// The top level must hold exactly one element and no text, CDATA or DOCTYPE.
bool HasSingleRoot(const pugi::xml_document& document) {
    int elements = 0;
    for (pugi::xml_node node = document.first_child(); node; node = node.next_sibling()) {
        if (node.type() != pugi::node_element) return false;
        ++elements;
    }
    return elements == 1;
}

// Visits every node in document order with a cursor (no recursion) and puts each text and
// CDATA value into the form GetTagValue hands out.
bool PrepareTexts(ParserHandle* handle) {
    pugi::xml_node root = handle->document;
    pugi::xml_node cursor = root.first_child();
    while (cursor) {
        if (cursor.type() == pugi::node_pcdata && !TrimText(handle, cursor)) return false;
        if (cursor.type() == pugi::node_cdata && !WrapCData(handle, cursor)) return false;

        pugi::xml_node next = cursor.first_child();
        while (!next && cursor) {
            next = cursor.next_sibling();
            if (!next) {
                cursor = cursor.parent();
                if (cursor == root) cursor = pugi::xml_node();
            }
        }
        cursor = next;
    }
    return true;
}

pugi::xml_node FirstElement(pugi::xml_node node) {
    while (node && node.type() != pugi::node_element) node = node.next_sibling();
    return node;
}

void ClearNode(void** out) {
    if (out != nullptr) *out = nullptr;
}

void ClearString(char** text, int* length) {
    if (text != nullptr) *text = nullptr;
    if (length != nullptr) *length = 0;
}

void SetString(const char* value, char** text, int* length) {
    *text = const_cast<char*>(value);
    *length = static_cast<int>(strlen(value));
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
    parser->document.reset();
    if (buffer == nullptr || size <= 0) return KA_ERR_LOAD_FAILED;

    // A terminator that the caller counted in the size is tolerated; a NUL byte anywhere
    // inside the document is not XML, and pugixml would stop reading there silently.
    size_t length = static_cast<size_t>(size);
    while (length > 0 && buffer[length - 1] == '\0') --length;
    if (length == 0 || memchr(buffer, '\0', length) != nullptr) return KA_ERR_LOAD_FAILED;

    pugi::xml_parse_result result =
        parser->document.load_buffer(buffer, length, kParseFlags, pugi::encoding_utf8);
    if (!result || !HasSingleRoot(parser->document) || !PrepareTexts(parser)) {
        parser->document.reset();
        return KA_ERR_LOAD_FAILED;
    }
    return KA_OK;
}

unsigned int GetFirstChild(void* handle, void* node, void** child) {
    ClearNode(child);
    if (handle == nullptr || child == nullptr) return KA_ERR_NULL_ARGUMENT;
    pugi::xml_node found = node == nullptr ? AsHandle(handle)->document.document_element()
                                           : FirstElement(AsNode(node).first_child());
    *child = found.internal_object();
    return KA_OK;
}

unsigned int GetNextSibling(void* handle, void* node, void** sibling) {
    ClearNode(sibling);
    if (handle == nullptr || node == nullptr || sibling == nullptr) return KA_ERR_NULL_ARGUMENT;
    *sibling = FirstElement(AsNode(node).next_sibling()).internal_object();
    return KA_OK;
}

unsigned int GetChildByName(void* handle, void* node, char* name, void** child) {
    ClearNode(child);
    if (handle == nullptr || node == nullptr || name == nullptr || child == nullptr) {
        return KA_ERR_NULL_ARGUMENT;
    }
    for (pugi::xml_node it = FirstElement(AsNode(node).first_child()); it;
         it = FirstElement(it.next_sibling())) {
        if (strcmp(it.name(), name) == 0) {
            *child = it.internal_object();
            break;
        }
    }
    return KA_OK;
}

unsigned int GetAttributeValue(void* handle, void* node, char* name, char** value, int* length) {
    ClearString(value, length);
    if (handle == nullptr || node == nullptr || name == nullptr || value == nullptr ||
        length == nullptr) {
        return KA_ERR_NULL_ARGUMENT;
    }
    // Duplicate attributes are not refused; the first one is the one read. The first byte is
    // compared before the whole name: the library asks for many names that are absent.
    for (pugi::xml_attribute attribute = AsNode(node).first_attribute(); attribute;
         attribute = attribute.next_attribute()) {
        const char* candidate = attribute.name();
        if (candidate[0] == name[0] && strcmp(candidate, name) == 0) {
            SetString(attribute.value(), value, length);
            break;
        }
    }
    return KA_OK;
}

// Walks an element's attributes in document order: a null current gives the first one, an
// attribute this operation returned for the same node gives the one after it.
unsigned int GetNextAttribute(void* handle, void* node, void** next, void* current, char** name,
                              int* nameLength, char** value, int* valueLength) {
    ClearNode(next);
    ClearString(name, nameLength);
    ClearString(value, valueLength);
    if (handle == nullptr || node == nullptr || next == nullptr || name == nullptr ||
        nameLength == nullptr || value == nullptr || valueLength == nullptr) {
        return KA_ERR_NULL_ARGUMENT;
    }
    pugi::xml_attribute attribute =
        current == nullptr ? AsNode(node).first_attribute()
                           : pugi::xml_attribute(static_cast<pugi::xml_attribute_struct*>(current))
                                 .next_attribute();
    if (attribute) {
        *next = attribute.internal_object();
        SetString(attribute.name(), name, nameLength);
        SetString(attribute.value(), value, valueLength);
    }
    return KA_OK;
}

unsigned int GetTagValue(void* handle, void* node, char** text, int* length) {
    ClearString(text, length);
    if (handle == nullptr || node == nullptr || text == nullptr || length == nullptr) {
        return KA_ERR_NULL_ARGUMENT;
    }
    // A text of nothing but white space is no text: the search goes on past it.
    for (pugi::xml_node it = AsNode(node).first_child(); it; it = it.next_sibling()) {
        if (IsText(it) && it.value()[0] != '\0') {
            SetString(it.value(), text, length);
            break;
        }
    }
    return KA_OK;
}

unsigned int GetTagName(void* handle, void* node, char** name, int* length) {
    ClearString(name, length);
    if (handle == nullptr || node == nullptr || name == nullptr || length == nullptr) {
        return KA_ERR_NULL_ARGUMENT;
    }
    SetString(AsNode(node).name(), name, length);
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
