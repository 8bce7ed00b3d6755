// Every document under tests/data/documents/<mode>/ read through the public table over the real
// modules and printed as kavmap --json prints it; the output must equal <name>.out beside the
// document, byte for byte. Documents named *.wrapped.xml are fetched by the cases' wrappers.
// The folder names the mode: vmap, vmap-no-merge, vast, vast-no-merge. Wrapped documents are
// read as local files below the case's folder, the base URL of each case being its own file.
//
// Each case is processed twice on one handle (the second Process must release the first's
// records and build the same again), and the heap in use must be the same before Open and after
// Close (counted in blocks). KA_UPDATE_EXPECTED=1 writes the .out files instead of comparing.
#include <dirent.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "api_support.h"
#include "ka/chain_limits.h"
#include "printer.h"

namespace {

const std::string kRoot = std::string(KA_TEST_DATA_DIR) + "documents/";

struct Case {
    std::string mode;  // the folder
    std::string name;  // the document's name without ".xml"
};

void PrintTo(const Case& c, std::ostream* out) { *out << c.mode << "/" << c.name << ".xml"; }

std::vector<Case> Cases() {
    std::vector<Case> cases;
    for (const char* mode : {"vmap", "vmap-no-merge", "vast", "vast-no-merge"}) {
        DIR* dir = opendir((kRoot + mode).c_str());
        if (dir == nullptr) continue;
        while (dirent* entry = readdir(dir)) {
            const std::string file = entry->d_name;
            const size_t dot = file.find('.');
            if (dot != std::string::npos && file.compare(dot, std::string::npos, ".xml") == 0) {
                cases.push_back({mode, file.substr(0, dot)});
            }
        }
        closedir(dir);
    }
    std::sort(cases.begin(), cases.end(),
              [](const Case& a, const Case& b) { return a.mode + a.name < b.mode + b.name; });
    return cases;
}

std::string CaseName(const ::testing::TestParamInfo<Case>& info) {
    std::string name = info.param.mode + "_" + info.param.name;
    for (char& c : name) {
        if (!isalnum(static_cast<unsigned char>(c))) c = '_';
    }
    return name;
}

// Blocks allocated and not yet freed, counted by this program's own malloc family, which every
// library in the process calls. Sanitizer builds keep their own allocator; their leak checker
// covers what this compares there.
#if defined(__SANITIZE_ADDRESS__)
long LiveBlocks() { return 0; }
#else
long gLiveBlocks = 0;  // the cases run on one thread, and the library starts none
long LiveBlocks() { return gLiveBlocks; }

extern "C" {
void* __libc_malloc(size_t size);
void* __libc_calloc(size_t count, size_t size);
void* __libc_realloc(void* pointer, size_t size);
void* __libc_memalign(size_t alignment, size_t size);
void __libc_free(void* pointer);

void* Counted(void* pointer) {
    if (pointer != nullptr) ++gLiveBlocks;
    return pointer;
}
void* malloc(size_t size) { return Counted(__libc_malloc(size)); }
void* calloc(size_t count, size_t size) { return Counted(__libc_calloc(count, size)); }
void* memalign(size_t alignment, size_t size) { return Counted(__libc_memalign(alignment, size)); }
void* aligned_alloc(size_t alignment, size_t size) { return memalign(alignment, size); }
int posix_memalign(void** out, size_t alignment, size_t size) {
    *out = memalign(alignment, size);
    return *out != nullptr ? 0 : ENOMEM;
}
void free(void* pointer) {
    if (pointer != nullptr) --gLiveBlocks;
    __libc_free(pointer);
}
void* realloc(void* pointer, size_t size) {
    void* moved = __libc_realloc(pointer, size);
    if (pointer == nullptr) return Counted(moved);
    if (size == 0 && moved == nullptr) --gLiveBlocks;  // freed
    return moved;
}
}  // extern "C"
#endif

// The result code and the records of one Process, as text.
std::string Print(void* handle, uint32_t result, bool vastOnly) {
    char* text = nullptr;
    size_t length = 0;
    FILE* out = open_memstream(&text, &length);
    fprintf(out, "result 0x%08" PRIx32 "\n", result);
    PrintJson(out, ReadResult(katest::Api(), handle, vastOnly));
    fclose(out);
    std::string printed(text, length);
    free(text);
    return printed;
}

const std::vector<char>& Interleaved() {
    static const std::vector<char> document = katest::ReadFile(kRoot + "vmap/vmap-inline-vast.xml");
    return document;
}

class Documents : public ::testing::TestWithParam<Case> {};

TEST_P(Documents, ReadIntoTheExpectedRecords) {
    const Case& c = GetParam();
    const std::string folder = kRoot + c.mode + "/";
    const bool vastOnly = c.mode.compare(0, 4, "vast") == 0;
    const bool merge = c.mode.find("no-merge") == std::string::npos;
    const std::vector<char> document = katest::ReadFile(folder + c.name + ".xml");
    katest::AllowLocalFilesBelow(folder);

    std::string printed[2];
    long blocksBefore = 0;
    for (int cycle = 0; cycle < 2; ++cycle) {  // the first warms the modules' one-time state
        blocksBefore = LiveBlocks();
        std::string workPath = KA_MODULES_DIR;
        void* handle = nullptr;
        const VMAPParserAPI& api = katest::Api();
        ASSERT_EQ(api.Open(&handle, &workPath[0]), KA_OK);
        api.SetParam(handle, KA_PID_VMAP_VAST_ONLY, vastOnly ? katest::kUntouched : nullptr);
        api.SetParam(handle, KA_PID_VMAP_MERGE_WRAPPERS, merge ? katest::kUntouched : nullptr);
        // As a player that read the document from a file: relative references resolve from it.
        std::string base = "file://localhost" + folder + c.name + ".xml";
        api.SetParam(handle, KA_PID_VMAP_BASE_URL, &base[0]);
        // Between the two readings, another document of another size on the same handle.
        int read = 0;
        for (const std::vector<char>* input : {&document, &Interleaved(), &document}) {
            std::vector<char> copy = *input;  // freed after Process: nothing may point into it
            char empty = '\0';
            const uint32_t result = api.Process(handle, copy.empty() ? &empty : copy.data(),
                                                static_cast<uint32_t>(copy.size()));
            if (input == &document) printed[read++] = Print(handle, result, vastOnly);
        }
        EXPECT_EQ(printed[1], printed[0]) << "a second Process built other records";
        EXPECT_EQ(api.Close(handle), KA_OK);
    }
    EXPECT_EQ(LiveBlocks(), blocksBefore) << "Close left memory behind";
    katest::AllowLocalFiles(false);

    const std::string expectedPath = folder + c.name + ".out";
    if (getenv("KA_UPDATE_EXPECTED") != nullptr) {
        FILE* file = fopen(expectedPath.c_str(), "wb");
        ASSERT_NE(file, nullptr);
        fwrite(printed[0].data(), 1, printed[0].size(), file);
        fclose(file);
        return;
    }
    const std::vector<char> expected = katest::ReadFile(expectedPath);
    EXPECT_EQ(printed[0], std::string(expected.begin(), expected.end()));
}

INSTANTIATE_TEST_SUITE_P(All, Documents, ::testing::ValuesIn(Cases()), CaseName);

TEST(DocumentFolders, HoldCases) { EXPECT_GE(Cases().size(), 20u); }

}  // namespace
