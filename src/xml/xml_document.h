// CXMLDocument drives the platform's XML parser module: it loads the module through the
// CLibLoader it is, opens one parser handle, and forwards every operation to the module's table.
// Both parsers are documents, so each holds its own module handle.
#pragma once

#include "platform/lib_loader.h"
#include "xml/xml_parser_api.h"

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

    // Element text for a record field: CDATA unwrapped and trimmed, otherwise "&amp;" decoded.
    // Replaces (and frees) the field's string only when the element has text.
    void GetElementText(void* node, char*& field);
    // 0 when the element's text is a CDATA section, 0x91001000 otherwise.
    unsigned int IsElementCData(void* node, char** text, int& length);

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
