// The exported entries and the eight table functions. Every function but Open is a null test
// on the handle followed by the matching virtual operation of the CVMAPParser behind it.
//
// The player calls these from C: no exception may leave them. Each body runs inside Guarded,
// which turns an allocation failure (or any other std::exception) into a result code. What a
// failed Process had built is released there, so the handle is left as after a failed load.
#include <exception>
#include <memory>
#include <new>

#include "ka/result_codes.h"
#include "ka/vmap_parser_api.h"
#include "vast/vast_parser.h"
#include "vmap/vmap_parser.h"

namespace _KANS_kaVMAPParser {

namespace {

CVMAPParser* Parser(void* handle) { return static_cast<CVMAPParser*>(handle); }

// body's result, or the code of the exception it threw. Exceptions of other types (a host's own,
// or the unwinding of a cancelled thread) are not caught: nothing in the library throws them.
template <typename Body>
uint32_t Guarded(Body body) noexcept {
    try {
        return body();
    } catch (const std::bad_alloc&) {
        return KA_ERR_NO_MEMORY;
    } catch (const std::exception&) {
        return KA_ERR_INTERNAL;
    }
}

}  // namespace

uint32_t kaVMAPParserOpen(void** handle, char* workPath) {
    return Guarded([&] {
        std::unique_ptr<CVMAPParser> parser(new CVMAPParser());
        const unsigned int result = parser->Open(workPath);
        // Destroying the half-opened object also releases a module that did load.
        if (result != KA_OK) return result;
        *handle = parser.release();
        return static_cast<unsigned int>(KA_OK);
    });
}

uint32_t kaVMAPParserClose(void* handle) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Guarded([&] {
        CVMAPParser* parser = Parser(handle);
        parser->Close();
        delete parser;
        return KA_OK;
    });
}

uint32_t kaVMAPParserProcess(void* handle, void* buffer, uint32_t size) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    const uint32_t result = Guarded([&] { return Parser(handle)->Process(buffer, size); });
    // Every record of a failed Process is reachable from the handle, complete enough to be
    // freed; the player gets none of them. Reset allocates nothing.
    if (result == KA_ERR_NO_MEMORY || result == KA_ERR_INTERNAL) Parser(handle)->Reset();
    return result;
}

uint32_t kaVMAPParserGetAdInfo(void* handle, AdInfo** out) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Guarded([&] { return Parser(handle)->GetAdInfo(out); });
}

uint32_t kaVMAPParserGetVastAdData(void* handle, VastAdData** out) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Guarded([&] { return Parser(handle)->GetVastAdData(out); });
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
    // A base URL that cannot be copied leaves the earlier one.
    return Guarded([&] { return Parser(handle)->SetParam(id, value); });
}

uint32_t kaVMAPParserGetParam(void* handle, uint32_t id, void* value) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return Guarded([&] { return Parser(handle)->GetParam(id, value); });
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
