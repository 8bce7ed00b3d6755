#include "result_text.h"

#include "ka/result_codes.h"

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
