// CXMLDocument drives the platform's XML parser module: it loads the module through the
// CLibLoader it is, opens one parser handle, and forwards every operation to the module's table.
// Both parsers are documents, so each holds a module handle: its own, or, for the VAST parser a
// handle makes for one Process, the handle's own, borrowed.
#pragma once

#include <cstddef>
#include <cstdint>

#include "ka/result_codes.h"
#include "platform/arena.h"
#include "platform/lib_loader.h"
#include "xml/xml_attributes.h"
#include "xml_parser_api.h"

class CXMLDocument : public CLibLoader {
public:
    CXMLDocument();
    ~CXMLDocument() override;

    // Loads the module and opens a handle: Init's result, or 0x90000001 without a module.
    unsigned int InitXMLParser();
    // Closes the handle, empties the table and releases the module; always 0. A borrowed
    // handle is only let go: its owner closes it.
    unsigned int UninitXMLParser();
    // Uses the handle and table of owner, which must stay open while this object uses them:
    // a parser made for one Process of its owner's needs no module of its own.
    void BorrowXMLParser(const CXMLDocument& owner);

    // Forwarders: 0x90000001 with outputs untouched while no handle is open. The walks call the
    // first ones for every element, so they are inline.
    unsigned int GetFirstChild(void* node, void** child) {
        if (mXMLHandle == nullptr || mXMLAPI.GetFirstChild == nullptr)
            return KA_ERR_MODULE_NOT_LOADED;
        return mXMLAPI.GetFirstChild(mXMLHandle, node, child);
    }
    unsigned int GetNextSibling(void* node, void** sibling) {
        if (mXMLHandle == nullptr || mXMLAPI.GetNextSibling == nullptr)
            return KA_ERR_MODULE_NOT_LOADED;
        return mXMLAPI.GetNextSibling(mXMLHandle, node, sibling);
    }
    unsigned int GetTagName(void* node, char** name, int& length) {
        if (mXMLHandle == nullptr || mXMLAPI.GetTagName == nullptr) return KA_ERR_MODULE_NOT_LOADED;
        return mXMLAPI.GetTagName(mXMLHandle, node, name, &length);
    }
    unsigned int GetTagValue(void* node, char** text, int& length) {
        if (mXMLHandle == nullptr || mXMLAPI.GetTagValue == nullptr)
            return KA_ERR_MODULE_NOT_LOADED;
        return mXMLAPI.GetTagValue(mXMLHandle, node, text, &length);
    }
    unsigned int GetAttributeValue(void* node, char* name, char** value, int& length) {
        if (mXMLHandle == nullptr || mXMLAPI.GetAttributeValue == nullptr)
            return KA_ERR_MODULE_NOT_LOADED;
        return mXMLAPI.GetAttributeValue(mXMLHandle, node, name, value, &length);
    }
    unsigned int GetNextAttribute(void* node, void** next, void* current, char** name,
                                  int& nameLength, char** value, int& valueLength) {
        if (mXMLHandle == nullptr || mXMLAPI.GetNextAttribute == nullptr)
            return KA_ERR_MODULE_NOT_LOADED;
        return mXMLAPI.GetNextAttribute(mXMLHandle, node, next, current, name, &nameLength, value,
                                        &valueLength);
    }
    unsigned int LoadXML(char* buffer, int size, int mode);
    unsigned int GetChildByName(void* node, char* name, void** child);
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
    // given form, copied once into mArena. Replaces the field's string only when the element has
    // at least one character of text; true when it did. A failed copy throws and leaves the
    // field as is.
    bool ReadElementText(void* node, char*& field, TextForm form);
    // ReadElementText in the decoded form: what most record fields hold. A call, not a second
    // copy of the reader in every handler.
    void GetElementText(void* node, char*& field) {
        ReadElementText(node, field, TextForm::kDecoded);
    }
    // 0 when the element's text is a CDATA section, 0x91001000 otherwise.
    unsigned int IsElementCData(void* node, char** text, int& length);

    // Looks up an attribute: true when it exists with at least one character.
    bool ReadAttribute(void* node, const char* name, char** value, int& length);
    // Replaces field with a copy (in mArena) of the attribute's raw value when it is present;
    // true when it did. A failed copy throws and leaves the field as is.
    bool CopyAttribute(void* node, const char* name, char*& field);
    // Field := a copy (in mArena) of value when it is present; true when it did.
    bool CopyAttribute(const XMLAttributeValue& value, char*& field);
    // Reads the attributes of node named in names in one pass over the element's attributes:
    // values[i] (empty when given) becomes the first attribute called names[i], as
    // GetAttributeValue would find it. A handful of names, and every name for a module that does
    // not walk attributes, are looked up one by one instead.
    template <size_t N>
    void ReadAttributes(void* node, const XMLAttributeNames<N>& names,
                        XMLAttributeValue (&values)[N]) {
        ReadAttributeList(node, names.names, names.byLength, values, N);
    }

    void* mXMLHandle;
    XMLParserAPI mXMLAPI;
    // Where the copies of the text and attribute readers go: the arena of the records being
    // built. Set by the parser that owns or shares it; never null while a parser reads.
    ka::Arena* mArena;

protected:
    // The child walk of both parsers' LoadTag: calls (parser->*handler)(child, target, name,
    // length) for each direct child element with a non-empty name, in document order.
    template <class Parser, class Handler>
    void ForEachChild(void* node, void* target, Parser* parser, Handler handler) {
        // Handlers never close or switch the module while its document is walked: the handle
        // and the three accessors are read once per walk.
        void* const handle = mXMLHandle;
        const auto firstChild = mXMLAPI.GetFirstChild;
        const auto nextSibling = mXMLAPI.GetNextSibling;
        const auto tagName = mXMLAPI.GetTagName;
        if (handle == nullptr || firstChild == nullptr || nextSibling == nullptr ||
            tagName == nullptr) {
            return;
        }
        void* child = nullptr;
        firstChild(handle, node, &child);
        while (child != nullptr) {
            char* name = nullptr;
            int length = 0;
            tagName(handle, child, &name, &length);
            if (name != nullptr && length >= 1) {
                (parser->*handler)(child, target, name, static_cast<unsigned int>(length));
            }
            // Written fresh each time: a lookup that fails without writing still ends the walk.
            void* sibling = nullptr;
            nextSibling(handle, child, &sibling);
            child = sibling;
        }
    }

private:
    void ReadAttributeList(void* node, const XMLAttributeName* names, const uint32_t* byLength,
                           XMLAttributeValue* values, size_t count);

    bool mBorrowedXML;  // mXMLHandle and mXMLAPI are another object's
};
