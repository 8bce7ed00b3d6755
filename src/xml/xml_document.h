// CXMLDocument drives the platform's XML parser module: it loads the module through the
// CLibLoader it is, opens one parser handle, and forwards every operation to the module's table.
// Both parsers are documents, so each holds its own module handle.
#pragma once

#include "platform/lib_loader.h"
#include "xml_parser_api.h"

class CXMLDocument : public CLibLoader {
public:
    CXMLDocument();
    ~CXMLDocument() override;

    // Loads the module and opens a handle: Init's result, or 0x90000001 without a module.
    unsigned int InitXMLParser();
    // Closes the handle, empties the table and releases the module; always 0.
    unsigned int UninitXMLParser();

    // Forwarders: 0x90000001 with outputs untouched while no handle is open.
    unsigned int LoadXML(char* buffer, int size, int mode);
    unsigned int GetFirstChild(void* node, void** child);
    unsigned int GetNextSibling(void* node, void** sibling);
    unsigned int GetChildByName(void* node, char* name, void** child);
    unsigned int GetAttributeValue(void* node, char* name, char** value, int& length);
    unsigned int GetNextAttribute(void* node, void** next, void* current, char** name,
                                  int& nameLength, char** value, int& valueLength);
    unsigned int GetTagValue(void* node, char** text, int& length);
    unsigned int GetTagName(void* node, char** name, int& length);
    unsigned int SetParam(unsigned int id, void* value);
    unsigned int GetParam(unsigned int id, void* value);
    unsigned int Reserved12(char* text, void* node, int& a, int& b);

    // How ReadElementText stores a text that is not a CDATA section.
    enum class TextForm {
        kDecoded,  // each "&amp;" turned into "&"
        kRaw,      // entities kept as written
    };

    // Element text for a record field: a complete CDATA section unwrapped and trimmed (its
    // content is never decoded; one that does not close is stored whole), any other text in the
    // given form. Replaces (and frees) the field's string only when the element has at least
    // one character of text; true when it did. A failed copy throws and leaves the field as is.
    bool ReadElementText(void* node, char*& field, TextForm form);
    // ReadElementText in the decoded form: what most record fields hold.
    void GetElementText(void* node, char*& field);
    // 0 when the element's text is a CDATA section, 0x91001000 otherwise.
    unsigned int IsElementCData(void* node, char** text, int& length);

    // Looks up an attribute: true when it exists with at least one character.
    bool ReadAttribute(void* node, const char* name, char** value, int& length);
    // Replaces field with a copy of the attribute's raw value when it is present; true when it
    // did. A failed copy throws and leaves the field as is.
    bool CopyAttribute(void* node, const char* name, char*& field);

    void* mXMLHandle;
    XMLParserAPI mXMLAPI;

protected:
    // The child walk of both parsers' LoadTag: calls (parser->*handler)(child, target, name,
    // length) for each direct child element with a non-empty name, in document order.
    template <class Parser, class Handler>
    void ForEachChild(void* node, void* target, Parser* parser, Handler handler) {
        void* child = nullptr;
        GetFirstChild(node, &child);
        while (child != nullptr) {
            char* name = nullptr;
            int length = 0;
            GetTagName(child, &name, length);
            if (name != nullptr && length >= 1) {
                (parser->*handler)(child, target, name, static_cast<unsigned int>(length));
            }
            // Written fresh each time: a lookup that fails without writing still ends the walk.
            void* sibling = nullptr;
            GetNextSibling(child, &sibling);
            child = sibling;
        }
    }
};
