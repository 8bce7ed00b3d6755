#include "xml/element_values.h"

#include <cstring>

#include "xml/text_helpers.h"
#include "xml/xml_document.h"

namespace ka {

bool NameIs(const char* name, unsigned int length, const char* literal) {
    if (name == nullptr) return false;
    size_t n = strlen(literal);
    return length == n && memcmp(name, literal, n) == 0;
}

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
    field = CopyText(text, static_cast<size_t>(length));
    // Only a complete CDATA section gives 0; any other text stays as it was copied.
    char* scratch = new char[static_cast<size_t>(length) + 1];
    if (parse_cdata(scratch, field, length + 1) == 0) {
        memcpy(field, scratch, strlen(scratch) + 1);
    }
    delete[] scratch;
    return true;
}

}  // namespace ka
