#include "xml/xml_document.h"

#include <cstring>

#include "ka/result_codes.h"
#include "platform/bounded_string.h"
#include "xml/text.h"

namespace {

constexpr char kModuleName[] = "kaXMLParser";
constexpr char kModuleExtension[] = ".so";
constexpr char kEntryName[] = "kaXMLGetParserAPI";

// Handlers that read at most this many attributes look each one up by name: a pass over the
// element's attributes takes a call per attribute and one more to end, which for a few names
// costs more than their lookups.
constexpr size_t kLookedUpNames = 4;

template <typename Word>
Word Load(const char* at) {
    Word word;
    memcpy(&word, at, sizeof(word));
    return word;
}

// Whether length (1 to 31) bytes at a and b are the same. Attribute names are short: a few word
// comparisons, the last one overlapping, cost less than a call to memcmp or a byte loop, and
// read nothing past the length.
bool SameBytes(const char* a, const char* b, int length) {
    if (length >= 8) {
        for (int i = 0; i + 8 < length; i += 8) {
            if (Load<uint64_t>(a + i) != Load<uint64_t>(b + i)) return false;
        }
        return Load<uint64_t>(a + length - 8) == Load<uint64_t>(b + length - 8);
    }
    if (length >= 4) {
        return Load<uint32_t>(a) == Load<uint32_t>(b) &&
               Load<uint32_t>(a + length - 4) == Load<uint32_t>(b + length - 4);
    }
    return a[0] == b[0] && a[length / 2] == b[length / 2] && a[length - 1] == b[length - 1];
}

}  // namespace

CXMLDocument::CXMLDocument() : mXMLHandle(nullptr), mArena(nullptr), mBorrowedXML(false) {
    memset(&mXMLAPI, 0, sizeof(mXMLAPI));
}

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
    if (mBorrowedXML) {
        // The owner closes its handle and releases its module itself.
        mBorrowedXML = false;
        mXMLHandle = nullptr;
        memset(&mXMLAPI, 0, sizeof(mXMLAPI));
        return KA_OK;
    }
    if (mXMLAPI.Uninit != nullptr) {
        mXMLAPI.Uninit(mXMLHandle);
        mXMLHandle = nullptr;
    }
    memset(&mXMLAPI, 0, sizeof(mXMLAPI));
    FreeLib();
    return KA_OK;
}

void CXMLDocument::BorrowXMLParser(const CXMLDocument& owner) {
    UninitXMLParser();
    mXMLHandle = owner.mXMLHandle;
    mXMLAPI = owner.mXMLAPI;
    mBorrowedXML = true;
}

// Forwarders. A module that left a slot empty answers like a missing module instead of crashing.
unsigned int CXMLDocument::LoadXML(char* buffer, int size, int mode) {
    if (mXMLHandle == nullptr || mXMLAPI.LoadXML == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.LoadXML(mXMLHandle, buffer, size, mode);
}

unsigned int CXMLDocument::GetChildByName(void* node, char* name, void** child) {
    if (mXMLHandle == nullptr || mXMLAPI.GetChildByName == nullptr) return KA_ERR_MODULE_NOT_LOADED;
    return mXMLAPI.GetChildByName(mXMLHandle, node, name, child);
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
    if (text == nullptr || text[0] == '\0') return false;

    // The module measures its texts as it loads them and terminates them: a length that ends on
    // the terminator is taken, any other is measured again.
    const size_t size =
        length > 0 && text[length] == '\0' ? static_cast<size_t>(length) : strlen(text);
    const bool isCData = ka::IsCDataSection(text, size);
    size_t begin = 0;
    size_t count = size;
    if (isCData) ka::CDataContent(text, size, &begin, &count);
    // The field changes only once the copy exists: a copy that fails leaves it as it was, and
    // the failure goes up to the public table instead of a text silently missing. "&amp;" is
    // decoded while copying.
    if (!isCData && form == TextForm::kDecoded) {
        char* copy = mArena->AllocateText(count);
        ka::CopyDecodingAmp(copy, text + begin, count);
        field = copy;
    } else {
        field = mArena->CopyText(text + begin, count);
    }
    return true;
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
    XMLAttributeValue attribute;
    if (!ReadAttribute(node, name, &attribute.value, attribute.length)) return false;
    return CopyAttribute(attribute, field);
}

bool CXMLDocument::CopyAttribute(const XMLAttributeValue& value, char*& field) {
    if (!value.Present()) return false;
    field = mArena->CopyText(value.value, static_cast<size_t>(value.length));
    return true;
}

void CXMLDocument::ReadAttributeList(void* node, const XMLAttributeName* names,
                                     const uint32_t* byLength, XMLAttributeValue* values,
                                     size_t count) {
    const auto nextAttribute = mXMLAPI.GetNextAttribute;
    void* const handle = mXMLHandle;
    // Handlers that read many names (media files, companions, icons) meet most of them in one
    // pass; a few names are looked up.
    if (count > kLookedUpNames && handle != nullptr && nextAttribute != nullptr) {
        // Which names have been met: the first attribute of a name is the one read, and the
        // walk ends once every name has been met.
        const uint32_t all = count == 32 ? ~0u : (1u << count) - 1;
        uint32_t seen = 0;
        void* current = nullptr;
        // The module writes all four on every call that succeeds; one that left them would only
        // show the last attribute again, whose name has been met.
        char* name = nullptr;
        char* value = nullptr;
        int nameLength = 0;
        int valueLength = 0;
        do {
            // Written fresh each time: a call that does not write it still ends the walk.
            void* next = nullptr;
            const unsigned int result = nextAttribute(handle, node, &next, current, &name,
                                                      &nameLength, &value, &valueLength);
            if (result != KA_OK && current == nullptr) break;  // no walk: looked up by name
            if (result != KA_OK || next == nullptr) return;
            current = next;
            if (name == nullptr || static_cast<unsigned int>(nameLength - 1) >=
                                       static_cast<unsigned int>(kXMLAttributeNameLimit - 1)) {
                continue;
            }
            // Only the names of this length not met yet, mostly one or none.
            for (uint32_t candidates = byLength[nameLength] & ~seen; candidates != 0;
                 candidates &= candidates - 1) {
                const int i = __builtin_ctz(candidates);
                if (SameBytes(names[i].name, name, nameLength)) {
                    seen |= 1u << i;
                    values[i].value = value;
                    values[i].length = valueLength;
                    break;
                }
            }
        } while (seen != all);
        if (seen == all) return;
    }
    const auto lookUp = mXMLAPI.GetAttributeValue;
    if (handle == nullptr || lookUp == nullptr) return;
    for (size_t i = 0; i < count; ++i) {
        // The module's lookups take mutable names but never write to them.
        lookUp(handle, node, const_cast<char*>(names[i].name), &values[i].value, &values[i].length);
    }
}
