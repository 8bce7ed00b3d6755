// Shared helpers of the integration tests: the library loaded as a player loads it, handles
// that close themselves, and documents read from the test data folder.
#pragma once

#include <string>
#include <vector>

#include "ka/vmap_parser_api.h"
#include "ka/vmap_parser_ext.h"

namespace katest {

// A value the library must not write over.
void* const kUntouched = reinterpret_cast<void*>(0x5a5a);

// The library from KA_LIB_PATH, loaded once per process, and its table.
const VMAPParserAPI& Api();
// The second table, filled at its full size.
const VMAPParserExtAPI& ExtApi();
void* LibrarySymbol(const char* name);

// Lets the source-IO module instance the library uses read local files, so that wrapped
// documents in the test data are fetched without a network.
void AllowLocalFiles(bool allow);
// The same, with relative names read below folder (which ends with "/").
void AllowLocalFilesBelow(const std::string& folder);

std::vector<char> ReadFile(const std::string& path);  // empty when unreadable

// A handle opened on the real modules and closed when it goes out of scope.
class Handle {
public:
    Handle() { mOpenResult = Api().Open(&mHandle, &mWorkPath[0]); }
    ~Handle() { Api().Close(mHandle); }
    Handle(const Handle&) = delete;
    Handle& operator=(const Handle&) = delete;

    void* get() const { return mHandle; }
    uint32_t openResult() const { return mOpenResult; }
    // A copy freed on return: a record pointing into the buffer shows under ASan.
    uint32_t Process(std::vector<char> copy) {
        return Api().Process(mHandle, copy.data(), static_cast<uint32_t>(copy.size()));
    }
    uint32_t Process(const std::string& text) {
        return Process(std::vector<char>(text.begin(), text.end()));
    }
    AdInfo* Info() const;
    // SetParam with a non-null value for true.
    void SetFlag(uint32_t id, bool on) { Api().SetParam(mHandle, id, on ? kUntouched : nullptr); }
    // What GetVastAdData lends, or kUntouched when it writes nothing.
    VastAdData* Container() const;

private:
    std::string mWorkPath = KA_MODULES_DIR;  // the handle keeps the path by pointer
    void* mHandle = nullptr;
    uint32_t mOpenResult;
};

}  // namespace katest
