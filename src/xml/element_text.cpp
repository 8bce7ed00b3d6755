// The element-text operations of CXMLDocument, shared by both parsers.
#include <cstring>
#include <new>

#include "ka/result_codes.h"
#include "xml/text_helpers.h"
#include "xml/xml_document.h"

namespace {

constexpr char kCDataOpen[] = "![CDATA[";
constexpr size_t kCDataOpenLength = sizeof(kCDataOpen) - 1;

bool IsCDataSection(const char* text) {
    return text[0] == kCDataOpen[0] && strncmp(text, kCDataOpen, kCDataOpenLength) == 0;
}

}  // namespace

void CXMLDocument::GetElementText(void* node, char*& field) {
    char* text = nullptr;
    int length = 0;
    GetTagValue(node, &text, length);
    if (text == nullptr) return;
    const bool isCData = IsCDataSection(text);
    if (!isCData && length == 0) return;

    delete[] field;
    field = nullptr;

    // The module's strings are NUL-terminated; its length is not trusted for the copy. Text
    // inside a complete CDATA section is kept as written (trimmed, no "&amp;" decoding); a
    // section that does not close is copied whole.
    const size_t size = strlen(text);
    size_t begin = 0;
    size_t count = size;
    if (isCData) ka::CDataContent(text, size, &begin, &count);
    char* copy = new (std::nothrow) char[count + 1];
    if (copy == nullptr) return;
    memcpy(copy, text + begin, count);
    copy[count] = '\0';
    field = copy;
    // Most texts hold no '&' at all; they are not searched for "&amp;" a second time.
    if (!isCData && memchr(copy, '&', count) != nullptr) unescape_amp(field);
}

unsigned int CXMLDocument::IsElementCData(void* node, char** text, int& length) {
    length = 0;
    if (text == nullptr) return KA_ERR_LOAD_FAILED;
    *text = nullptr;
    GetTagValue(node, text, length);
    return *text != nullptr && IsCDataSection(*text) ? KA_OK : KA_ERR_LOAD_FAILED;
}
