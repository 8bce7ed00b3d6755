#include "xml/xml_document.h"

#include <cstring>

#include "ka/result_codes.h"
#include "platform/bounded_string.h"
#include "xml/text.h"

namespace {

constexpr char kModuleName[] = "kaXMLParser";
constexpr char kModuleExtension[] = ".so";
constexpr char kEntryName[] = "kaXMLGetParserAPI";

}  // namespace

CXMLDocument::CXMLDocument() : mXMLHandle(nullptr) { memset(&mXMLAPI, 0, sizeof(mXMLAPI)); }

CXMLDocument::~CXMLDocument() { UninitXMLParser(); }

unsigned int CXMLDocument::InitXMLParser() {
    // A second Init first undoes the first one.
    UninitXMLParser();

    if (!ka::CopyBounded(mLibName, sizeof(mLibName), kModuleName) ||
        !ka::AppendBounded(mLibName, sizeof(mLibName), kModuleExtension) ||
        !ka::CopyBounded(mEntryName, sizeof(mEntryName), kEntryName) || LoadLib(nullptr) == 0 ||
        mEntry == nullptr) {
        return KA_ERR_MODULE_NOT_LOADED;
    }
    // Called through the entry's own type: the loader keeps it as a generic pointer.
    reinterpret_cast<KaXMLGetParserAPIFn>(mEntry)(&mXMLAPI);
    if (mXMLAPI.Init == nullptr) return KA_ERR_MODULE_NOT_LOADED;

    XMLInitData init = {nullptr, nullptr, this};
    return mXMLAPI.Init(&mXMLHandle, &init);
}

unsigned int CXMLDocument::UninitXMLParser() {
    if (mXMLAPI.Uninit != nullptr) {
        mXMLAPI.Uninit(mXMLHandle);
        mXMLHandle = nullptr;
    }
    memset(&mXMLAPI, 0, sizeof(mXMLAPI));
    FreeLib();
    return KA_OK;
}

// Forwarders. A module that left a slot empty answers like a missing module instead of crashing.
unsigned int CXMLDocument::LoadXML(char* buffer, int size, int mode) {
    if (mXMLHandle == nullptr || mXMLAPI.LoadXML == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.LoadXML(mXMLHandle, buffer, size, mode);
}

unsigned int CXMLDocument::GetFirstChild(void* node, void** child) {
    if (mXMLHandle == nullptr || mXMLAPI.GetFirstChild == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetFirstChild(mXMLHandle, node, child);
}

unsigned int CXMLDocument::GetNextSibling(void* node, void** sibling) {
    if (mXMLHandle == nullptr || mXMLAPI.GetNextSibling == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetNextSibling(mXMLHandle, node, sibling);
}

unsigned int CXMLDocument::GetChildByName(void* node, char* name, void** child) {
    if (mXMLHandle == nullptr || mXMLAPI.GetChildByName == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetChildByName(mXMLHandle, node, name, child);
}

unsigned int CXMLDocument::GetAttributeValue(void* node, char* name, char** value, int& length) {
    if (mXMLHandle == nullptr || mXMLAPI.GetAttributeValue == nullptr)
        return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetAttributeValue(mXMLHandle, node, name, value, &length);
}

unsigned int CXMLDocument::GetNextAttribute(void* node, void** next, void* current, char** name,
                                            int& nameLength, char** value, int& valueLength) {
    if (mXMLHandle == nullptr || mXMLAPI.GetNextAttribute == nullptr)
        return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetNextAttribute(mXMLHandle, node, next, current, name, &nameLength, value,
                                    &valueLength);
}

unsigned int CXMLDocument::GetTagValue(void* node, char** text, int& length) {
    if (mXMLHandle == nullptr || mXMLAPI.GetTagValue == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetTagValue(mXMLHandle, node, text, &length);
}

unsigned int CXMLDocument::GetTagName(void* node, char** name, int& length) {
    if (mXMLHandle == nullptr || mXMLAPI.GetTagName == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetTagName(mXMLHandle, node, name, &length);
}

unsigned int CXMLDocument::SetParam(unsigned int id, void* value) {
    if (mXMLHandle == nullptr || mXMLAPI.SetParam == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.SetParam(mXMLHandle, id, value);
}

unsigned int CXMLDocument::GetParam(unsigned int id, void* value) {
    if (mXMLHandle == nullptr || mXMLAPI.GetParam == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetParam(mXMLHandle, id, value);
}

unsigned int CXMLDocument::Reserved12(char* text, void* node, int& a, int& b) {
    if (mXMLHandle == nullptr || mXMLAPI.Reserved12 == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.Reserved12(mXMLHandle, text, node, &a, &b);
}

// Element access shared by both parsers' handlers.

bool CXMLDocument::ReadElementText(void* node, char*& field, TextForm form) {
    char* text = nullptr;
    int length = 0;
    GetTagValue(node, &text, length);
    // The module's strings are NUL-terminated and its length says the same; neither the test for
    // text nor the copy depends on that length.
    if (text == nullptr || text[0] == '\0') return false;

    const size_t size = strlen(text);
    const bool isCData = ka::IsCDataSection(text);
    size_t begin = 0;
    size_t count = size;
    if (isCData) ka::CDataContent(text, size, &begin, &count);
    // The copy is made before the old string goes: a copy that fails leaves the field as it
    // was, and the failure goes up to the public table instead of a text silently missing.
    char* copy = ka::CopyText(text + begin, count);
    delete[] field;
    field = copy;
    // Most texts hold no '&' at all; they are not searched for "&amp;" a second time.
    if (!isCData && form == TextForm::kDecoded && memchr(copy, '&', count) != nullptr) {
        unescape_amp(field);
    }
    return true;
}

void CXMLDocument::GetElementText(void* node, char*& field) {
    ReadElementText(node, field, TextForm::kDecoded);
}

unsigned int CXMLDocument::IsElementCData(void* node, char** text, int& length) {
    length = 0;
    if (text == nullptr) return KA_ERR_LOAD_FAILED;
    *text = nullptr;
    GetTagValue(node, text, length);
    return *text != nullptr && ka::IsCDataSection(*text) ? KA_OK : KA_ERR_LOAD_FAILED;
}

bool CXMLDocument::ReadAttribute(void* node, const char* name, char** value, int& length) {
    *value = nullptr;
    length = 0;
    // The module's lookups take mutable names but never write to them.
    GetAttributeValue(node, const_cast<char*>(name), value, length);
    return *value != nullptr && length >= 1;
}

bool CXMLDocument::CopyAttribute(void* node, const char* name, char*& field) {
    char* value = nullptr;
    int length = 0;
    if (!ReadAttribute(node, name, &value, length)) return false;
    // Copied first: a failed copy leaves the field as it was, never pointing at freed memory.
    char* copy = ka::CopyText(value, static_cast<size_t>(length));
    delete[] field;
    field = copy;
    return true;
}
