#include "result_text.h"

#include "ka/result_codes.h"
#include "ka/vmap_parser_ext.h"

const char* ResultText(uint32_t code) {
    switch (code) {
        case KA_OK:
            return "success";
        case KA_ERR_MODULE_NOT_LOADED:
            return "an auxiliary module (XML parser) could not be loaded";
        case KA_ERR_LOAD_FAILED:
            return "the document could not be loaded or has no root element";
        case KA_ERR_NULL_ARGUMENT:
            return "null handle or argument";
        case KA_ERR_DOWNLOAD_TIMEOUT:
            return "the download timed out";
        case KA_ERR_DOWNLOAD_FAILED:
            return "the download failed or was stopped";
        case KA_ERR_DOWNLOAD_OPEN:
            return "the source-IO module could not start a download";
        case KA_ERR_NO_MEMORY:
            return "memory ran out";
        case KA_ERR_INTERNAL:
            return "an unexpected exception inside the library";
        default:
            return "unknown result";
    }
}

const char* ChainStateText(uint32_t state) {
    static const char* const kNames[] = {"not wrapped", "resolved", "wrapper", "emptied"};
    return state < sizeof(kNames) / sizeof(kNames[0]) ? kNames[state] : "unknown";
}

const char* ChainReasonText(uint32_t reason) {
    // Indexed by KA_CHAIN_REASON_*.
    static const char* const kNames[] = {"none",
                                         "a Wrapper without VASTAdTagURI",
                                         "an Ad without InLine or Wrapper",
                                         "the URL was refused",
                                         "the download failed",
                                         "the deadline passed",
                                         "the stop flag was set",
                                         "the document is not XML",
                                         "an unsupported VAST version",
                                         "a document without ads",
                                         "the depth limit",
                                         "the fetch budget",
                                         "the byte budget",
                                         "the merge share"};
    static_assert(sizeof(kNames) / sizeof(kNames[0]) == KA_CHAIN_REASON_MERGE_SHARE + 1,
                  "one name per reason");
    return reason < sizeof(kNames) / sizeof(kNames[0]) ? kNames[reason] : "unknown";
}
