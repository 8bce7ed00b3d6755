// The exported entries and the eight table functions. Every function but Open is a null test
// on the handle followed by the matching virtual operation of the CVMAPParser behind it.
#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "vast/vast_parser.h"
#include "vmap/vmap_parser.h"

namespace _KANS_kaVMAPParser {

namespace {

CVMAPParser* Parser(void* handle) { return static_cast<CVMAPParser*>(handle); }

}  // namespace

uint32_t kaVMAPParserOpen(void** handle, char* workPath) {
    CVMAPParser* parser = new CVMAPParser();
    const unsigned int result = parser->Open(workPath);
    if (result != KA_OK) {
        // Destroying the half-opened object also releases a module that did load.
        delete parser;
        return result;
    }
    *handle = parser;
    return KA_OK;
}

uint32_t kaVMAPParserClose(void* handle) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    CVMAPParser* parser = Parser(handle);
    parser->Close();
    delete parser;
    return KA_OK;
}

uint32_t kaVMAPParserProcess(void* handle, void* buffer, uint32_t size) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Parser(handle)->Process(buffer, size);
}

uint32_t kaVMAPParserGetAdInfo(void* handle, AdInfo** out) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Parser(handle)->GetAdInfo(out);
}

uint32_t kaVMAPParserGetVastAdData(void* handle, VastAdData** out) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Parser(handle)->GetVastAdData(out);
}

uint32_t kaVMAPParserGetVastParserVastAdData(void* parser, VastAdData** out) {
    if (parser == nullptr) return KA_ERR_NULL_ARGUMENT;
    // The object is a CVASTParser such as an unmerged wrapper's nestedParser; its kind cannot
    // be checked, so a handle passed here yields no meaningful container.
    if (out != nullptr) *out = &static_cast<CVASTParser*>(parser)->mVastAdData;
    return KA_OK;
}

uint32_t kaVMAPParserSetParam(void* handle, uint32_t id, void* value) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Parser(handle)->SetParam(id, value);
}

uint32_t kaVMAPParserGetParam(void* handle, uint32_t id, void* value) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Parser(handle)->GetParam(id, value);
}

}  // namespace _KANS_kaVMAPParser

uint32_t kaGetVMAPParserAPI(VMAPParserAPI* api) {
    using namespace _KANS_kaVMAPParser;
    api->Open = kaVMAPParserOpen;
    api->Close = kaVMAPParserClose;
    api->Process = kaVMAPParserProcess;
    api->GetAdInfo = kaVMAPParserGetAdInfo;
    api->GetVastAdData = kaVMAPParserGetVastAdData;
    api->GetVastParserVastAdData = kaVMAPParserGetVastParserVastAdData;
    api->SetParam = kaVMAPParserSetParam;
    api->GetParam = kaVMAPParserGetParam;
    return KA_OK;
}

uintptr_t kaGetVMAPParserAPIAdapter(void) {
    return reinterpret_cast<uintptr_t>(&kaGetVMAPParserAPI);
}
