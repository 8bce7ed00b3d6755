#include "recording_xmlparser.h"

#include <cstring>

namespace {

FakeXmlState gState;
char gHandles[16];

intptr_t Arg(const void* p) { return reinterpret_cast<intptr_t>(p); }

unsigned int Record(int slot, void* handle, intptr_t a = 0, intptr_t b = 0, intptr_t c = 0,
                    intptr_t d = 0, intptr_t e = 0, intptr_t f = 0, intptr_t g = 0) {
    gState.lastSlot = slot;
    gState.lastHandle = handle;
    const intptr_t args[] = {a, b, c, d, e, f, g};
    memcpy(gState.lastArgs, args, sizeof(args));
    return kFakeXmlResultBase + static_cast<unsigned int>(slot);
}

unsigned int Init(void** handle, XMLInitData* init) {
    ++gState.initCalls;
    if (init != nullptr) gState.lastInit = *init;
    *handle = gState.initHandle != nullptr ? gState.initHandle
                                           : &gHandles[gState.initCalls % sizeof(gHandles)];
    return gState.initResult;
}

unsigned int Uninit(void* handle) {
    ++gState.uninitCalls;
    gState.lastUninitHandle = handle;
    return 0;
}

unsigned int LoadXML(void* h, char* buffer, int size, int mode) {
    return Record(2, h, Arg(buffer), size, mode);
}
unsigned int GetFirstChild(void* h, void* node, void** child) {
    return Record(3, h, Arg(node), Arg(child));
}
unsigned int GetNextSibling(void* h, void* node, void** sibling) {
    return Record(4, h, Arg(node), Arg(sibling));
}
unsigned int GetChildByName(void* h, void* node, char* name, void** child) {
    return Record(5, h, Arg(node), Arg(name), Arg(child));
}
unsigned int GetAttributeValue(void* h, void* node, char* name, char** value, int* length) {
    return Record(6, h, Arg(node), Arg(name), Arg(value), Arg(length));
}
unsigned int GetNextAttribute(void* h, void* node, void** next, void* current, char** name,
                              int* nameLength, char** value, int* valueLength) {
    return Record(7, h, Arg(node), Arg(next), Arg(current), Arg(name), Arg(nameLength), Arg(value),
                  Arg(valueLength));
}
unsigned int GetTagValue(void* h, void* node, char** text, int* length) {
    return Record(8, h, Arg(node), Arg(text), Arg(length));
}
unsigned int GetTagName(void* h, void* node, char** name, int* length) {
    return Record(9, h, Arg(node), Arg(name), Arg(length));
}
unsigned int SetParam(void* h, unsigned int id, void* value) {
    return Record(10, h, id, Arg(value));
}
unsigned int GetParam(void* h, unsigned int id, void* value) {
    return Record(11, h, id, Arg(value));
}
unsigned int Reserved12(void* h, char* text, void* node, int* a, int* b) {
    return Record(12, h, Arg(text), Arg(node), Arg(a), Arg(b));
}

}  // namespace

extern "C" __attribute__((visibility("default"))) FakeXmlState* fake_xml_state() { return &gState; }

// The variant without the entry exports the table under another name only.
#ifndef KA_FAKE_WITHOUT_ENTRY
#define KA_FAKE_ENTRY kaXMLGetParserAPI
#else
#define KA_FAKE_ENTRY kaXMLGetParserAPIMissing
#endif

extern "C" __attribute__((visibility("default"))) int KA_FAKE_ENTRY(XMLParserAPI* api) {
    *api = XMLParserAPI{Init,           Uninit,         LoadXML,           GetFirstChild,
                        GetNextSibling, GetChildByName, GetAttributeValue, GetNextAttribute,
                        GetTagValue,    GetTagName,     SetParam,          GetParam,
                        Reserved12};
    return 0;
}
