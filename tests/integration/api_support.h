// Shared helpers of the integration tests: the library loaded as a player loads it, handles
// that close themselves, and documents read from the test data folder.
#pragma once

#include <string>
#include <vector>

#include "ka/vmap_parser_api.h"

namespace katest {

// The library from KA_LIB_PATH, loaded once per process, and its table.
const VMAPParserAPI& Api();
// Address of a symbol of the loaded library, or null.
void* LibrarySymbol(const char* name);

// Lets the source-IO module (the instance the library uses) read local files, or stops it; wrapped
// documents in the test data are then fetched without a network.
void AllowLocalFiles(bool allow);

// Contents of a file; empty when it cannot be read.
std::vector<char> ReadFile(const std::string& path);
// Contents of a file below tests/data/.
std::vector<char> ReadTestData(const std::string& relative);

// A handle opened on the real modules and closed when it goes out of scope.
class Handle {
public:
    Handle();
    ~Handle();
    Handle(const Handle&) = delete;
    Handle& operator=(const Handle&) = delete;

    void* get() const { return mHandle; }
    uint32_t openResult() const { return mOpenResult; }
    uint32_t Process(std::vector<char> document);
    uint32_t Process(const std::string& text);
    AdInfo* Info() const;
    const char* ContentUri() const;

private:
    std::string mWorkPath;  // the handle keeps the path by pointer
    void* mHandle;
    uint32_t mOpenResult;
};

// The break of the list at index, or null past the end.
AdBreak* BreakAt(const AdInfo* info, uint32_t index);
// The first break with the given breakId, or null.
AdBreak* BreakById(const AdInfo* info, const char* id);
// Number of records of a list.
template <typename Record>
size_t Length(const Record* first) {
    size_t n = 0;
    for (; first != nullptr; first = first->next) ++n;
    return n;
}

}  // namespace katest
