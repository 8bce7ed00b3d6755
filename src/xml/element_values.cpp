#include "xml/element_values.h"

#include <cstring>

#include "xml/text_helpers.h"
#include "xml/xml_document.h"

namespace ka {

char* CopyText(const char* text, size_t length) {
    char* copy = new char[length + 1];
    memcpy(copy, text, length);
    copy[length] = '\0';
    return copy;
}

bool ReadAttribute(CXMLDocument& doc, void* node, const char* name, char** value, int& length) {
    *value = nullptr;
    length = 0;
    doc.GetAttributeValue(node, const_cast<char*>(name), value, length);
    return *value != nullptr && length >= 1;
}

bool CopyAttribute(CXMLDocument& doc, void* node, const char* name, char*& field) {
    char* value = nullptr;
    int length = 0;
    if (!ReadAttribute(doc, node, name, &value, length)) return false;
    delete[] field;
    field = CopyText(value, static_cast<size_t>(length));
    return true;
}

bool ReadRawText(CXMLDocument& doc, void* node, char*& field) {
    char* text = nullptr;
    int length = 0;
    doc.GetTagValue(node, &text, length);
    if (text == nullptr || length < 1) return false;
    delete[] field;
    // Only a complete CDATA section is unwrapped; any other text is copied as it is.
    const size_t size = strnlen(text, static_cast<size_t>(length));
    size_t begin = 0;
    size_t count = size;
    ka::CDataContent(text, size, &begin, &count);
    field = CopyText(text + begin, count);
    return true;
}

}  // namespace ka
