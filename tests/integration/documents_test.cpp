// Every document under tests/data/documents/<mode>/ read through the public table over the real
// modules and printed as kavmap --json prints it; the output must equal <name>.out beside the
// document, byte for byte. Documents named *.wrapped.xml are fetched by the cases' wrappers.
// The folder names the mode: vmap, vmap-no-merge, vast, vast-no-merge, and the same with
// "-extras", read with KA_PID_VMAP_LENIENT and printed as kavmap --json --extras prints them.
// Wrapped documents are read as local files below the case's folder, the base URL of each case
// being its own file.
//
// Each case is processed twice on one handle (the second Process must release the first's
// records and build the same again), and the heap in use must be the same before Open and after
// Close (counted in blocks). KA_UPDATE_EXPECTED=1 writes the .out files instead of comparing.
//
// Three of the cases are also run with allocation failures injected, one allocation at a time:
// for N = 0, 1, 2, ... the (N+1)th allocation of the first Process fails, until an armed run
// completes without reaching it. "library" fails only the operator new calls of the library's
// own code, and the Process then gives the ordinary records or KA_ERR_NO_MEMORY with nothing
// lent; "everything" also fails those of the modules and, outside sanitizer builds, every malloc
// of the process. A module that runs out answers with its ordinary failure, which the library
// cannot tell from a broken document or download, so any result code is accepted there.
#include <dirent.h>
#include <gtest/gtest.h>
#include <link.h>

#include <algorithm>
#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>
#include <string>
#include <vector>

#include "api_support.h"
#include "ka/chain_limits.h"
#include "loopback.h"

// The HTTP server's headers bring <arpa/nameser.h>, whose p_type macro hides the ELF field read
// below.
#undef p_type
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
    for (const char* mode : {"vmap", "vmap-no-merge", "vast", "vast-no-merge", "vmap-extras",
                             "vast-extras", "vast-no-merge-extras"}) {
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

struct Injection {
    bool armed = false;
    bool libraryOnly = true;
    long countdown = 0;  // allocations let through before the one that fails
    bool injected = false;
};
Injection gInjection;  // the library starts no threads
uintptr_t gLibraryText[2];
long gLiveBlocks = 0;

bool FailHere(const void* caller, bool viaMalloc) {
    Injection& in = gInjection;
    if (!in.armed || in.injected) return false;
    const uintptr_t at = reinterpret_cast<uintptr_t>(caller);
    if (in.libraryOnly && (viaMalloc || at < gLibraryText[0] || at >= gLibraryText[1]))
        return false;
    if (in.countdown-- > 0) return false;
    in.injected = true;
    return true;
}

#if defined(__SANITIZE_ADDRESS__)
// Not inlined into the operators below, where the compiler would see new paired with free.
__attribute__((noinline)) void* Raw(size_t size) { return malloc(size); }
__attribute__((noinline)) void Free(void* pointer) { free(pointer); }
#else
extern "C" {
void* __libc_malloc(size_t size);
void* __libc_calloc(size_t count, size_t size);
void* __libc_realloc(void* pointer, size_t size);
void* __libc_memalign(size_t alignment, size_t size);
void __libc_free(void* pointer);
}
void* Counted(void* pointer) {
    gLiveBlocks += pointer != nullptr ? 1 : 0;
    return pointer;
}
void* Raw(size_t size) { return Counted(__libc_malloc(size)); }
void Free(void* pointer) {
    gLiveBlocks -= pointer != nullptr ? 1 : 0;
    __libc_free(pointer);
}
#endif

void* New(size_t size, const void* caller) {
    return FailHere(caller, false) ? nullptr : Raw(size == 0 ? 1 : size);
}

}  // namespace

#if !defined(__SANITIZE_ADDRESS__)
extern "C" {
void* malloc(size_t size) { return FailHere(nullptr, true) ? nullptr : Raw(size); }
void* calloc(size_t n, size_t size) {
    return FailHere(nullptr, true) ? nullptr : Counted(__libc_calloc(n, size));
}
void* memalign(size_t alignment, size_t size) {
    return FailHere(nullptr, true) ? nullptr : Counted(__libc_memalign(alignment, size));
}
void* aligned_alloc(size_t alignment, size_t size) { return memalign(alignment, size); }
int posix_memalign(void** out, size_t alignment, size_t size) {
    *out = memalign(alignment, size);
    return *out != nullptr ? 0 : ENOMEM;
}
void free(void* pointer) { Free(pointer); }
void* realloc(void* pointer, size_t size) {
    if (pointer == nullptr) return malloc(size);
    if (FailHere(nullptr, true)) return nullptr;
    void* moved = __libc_realloc(pointer, size);
    if (size == 0 && moved == nullptr) --gLiveBlocks;  // freed
    return moved;
}
}  // extern "C"
#endif

// Called from the library through its PLT, so the return address is the library's own code.
// Never inlined: a memory checker that replaces the allocator by symbol (Valgrind) must see
// every new and every delete, or it pairs its own new with this file's delete.
__attribute__((noinline)) void* operator new(size_t size) {
    if (void* p = New(size, __builtin_return_address(0))) return p;
    throw std::bad_alloc();
}
__attribute__((noinline)) void* operator new[](size_t size) {
    if (void* p = New(size, __builtin_return_address(0))) return p;
    throw std::bad_alloc();
}
__attribute__((noinline)) void* operator new(size_t size, const std::nothrow_t&) noexcept {
    return New(size, __builtin_return_address(0));
}
__attribute__((noinline)) void* operator new[](size_t size, const std::nothrow_t&) noexcept {
    return New(size, __builtin_return_address(0));
}
__attribute__((noinline)) void operator delete(void* p) noexcept { Free(p); }
__attribute__((noinline)) void operator delete[](void* p) noexcept { Free(p); }
__attribute__((noinline)) void operator delete(void* p, size_t) noexcept { Free(p); }
__attribute__((noinline)) void operator delete[](void* p, size_t) noexcept { Free(p); }
__attribute__((noinline)) void operator delete(void* p, const std::nothrow_t&) noexcept { Free(p); }
__attribute__((noinline)) void operator delete[](void* p, const std::nothrow_t&) noexcept {
    Free(p);
}

namespace {

// Valgrind puts its own allocator in place of the one above, in part: the blocks counted here
// then say nothing, and no failure can be injected.
bool UnderValgrind() {
    const char* preload = getenv("LD_PRELOAD");
    return preload != nullptr && strstr(preload, "vgpreload") != nullptr;
}

// The result code and the records of one Process, as text.
std::string Print(void* handle, uint32_t result, bool vastOnly, bool extras) {
    char* text = nullptr;
    size_t length = 0;
    FILE* out = open_memstream(&text, &length);
    fprintf(out, "result 0x%08" PRIx32 "\n", result);
    ProcessResult records = ReadResult(katest::Api(), handle, vastOnly);
    if (extras) records.extrasApi = &katest::ExtApi();
    records.handle = handle;
    PrintJson(out, records);
    fclose(out);
    std::string printed(text, length);
    free(text);
    return printed;
}

// One handle in the given modes reads each input in turn; what each Process gave, printed.
// When armed, allocation n (from 0) of the first Process fails; gInjection.injected then tells
// whether it was reached.
std::vector<std::string> Cycle(std::initializer_list<const std::vector<char>*> inputs,
                               bool vastOnly, bool merge, bool extras, std::string base,
                               bool arm = false, bool libraryOnly = true, long n = 0) {
    const VMAPParserAPI& api = katest::Api();
    std::string workPath = KA_MODULES_DIR;
    void* handle = nullptr;
    EXPECT_EQ(api.Open(&handle, &workPath[0]), KA_OK);
    api.SetParam(handle, KA_PID_VMAP_VAST_ONLY, vastOnly ? katest::kUntouched : nullptr);
    api.SetParam(handle, KA_PID_VMAP_MERGE_WRAPPERS, merge ? katest::kUntouched : nullptr);
    api.SetParam(handle, KA_PID_VMAP_BASE_URL, &base[0]);
    api.SetParam(handle, KA_PID_VMAP_LENIENT, extras ? katest::kUntouched : nullptr);
    std::vector<std::string> printed;
    printed.reserve(inputs.size());
    gInjection = {false, libraryOnly, n, false};
    for (const std::vector<char>* input : inputs) {
        std::vector<char> copy = *input;  // freed after Process: nothing may point into it
        char empty = '\0';
        gInjection.armed = arm && printed.empty();
        const uint32_t result = api.Process(handle, copy.empty() ? &empty : copy.data(),
                                            static_cast<uint32_t>(copy.size()));
        gInjection.armed = false;
        printed.push_back(Print(handle, result, vastOnly, extras));
    }
    EXPECT_EQ(api.Close(handle), KA_OK);
    return printed;
}

// A chain of the extras read over HTTP, merged and not: relative references resolve against the
// URL each document came from, and the records are those read from the files.
TEST(DocumentsOverHttp, ChainOfExtrasReadsAsFromFiles) {
    loopback::Server server;
    ASSERT_TRUE(server.Running());
    for (const char* mode : {"vast-extras/", "vast-no-merge-extras/"}) {
        SCOPED_TRACE(mode);
        for (const char* name :
             {"chain_extras_middle.wrapped.xml", "chain_extras_inline.wrapped.xml"}) {
            const std::vector<char> body = katest::ReadFile(kRoot + mode + name);
            server.Put(name, std::string(body.begin(), body.end()));
        }
        const std::vector<char> top = katest::ReadFile(kRoot + mode + "chain_extras.xml");
        const std::vector<char> expected = katest::ReadFile(kRoot + mode + "chain_extras.out");
        const bool merge = std::string(mode).find("no-merge") == std::string::npos;
        EXPECT_EQ(Cycle({&top}, true, merge, true, server.Url("/d/chain_extras.xml"))[0],
                  std::string(expected.begin(), expected.end()));
    }
    EXPECT_EQ(server.Requests(), 4);
}

class Documents : public ::testing::TestWithParam<Case> {};

TEST_P(Documents, ReadIntoTheExpectedRecords) {
    const Case& c = GetParam();
    const std::string folder = kRoot + c.mode + "/";
    const std::vector<char> document = katest::ReadFile(folder + c.name + ".xml");
    static const std::vector<char> interleaved =
        katest::ReadFile(kRoot + "vmap/vmap-inline-vast.xml");
    katest::AllowLocalFilesBelow(folder);

    std::string printed;
    long blocksBefore = 0;
    for (int cycle = 0; cycle < 2; ++cycle) {  // the first warms the modules' one-time state
        blocksBefore = gLiveBlocks;
        // Between the two readings, another document of another size on the same handle; as a
        // player that read the document from a file, relative references resolve from it.
        const auto p =
            Cycle({&document, &interleaved, &document}, c.mode.compare(0, 4, "vast") == 0,
                  c.mode.find("no-merge") == std::string::npos,
                  c.mode.find("extras") != std::string::npos,
                  "file://localhost" + folder + c.name + ".xml");
        EXPECT_EQ(p[2], p[0]) << "a second Process built other records";
        printed = p[0];
    }
    // Valgrind counts what is left behind itself; the blocks counted here are not all its.
    if (!UnderValgrind()) {
        EXPECT_EQ(gLiveBlocks, blocksBefore) << "Close left memory behind";
    }
    katest::AllowLocalFiles(false);

    const std::string expectedPath = folder + c.name + ".out";
    if (getenv("KA_UPDATE_EXPECTED") != nullptr) {
        FILE* file = fopen(expectedPath.c_str(), "wb");
        ASSERT_NE(file, nullptr);
        fwrite(printed.data(), 1, printed.size(), file);
        fclose(file);
        return;
    }
    const std::vector<char> expected = katest::ReadFile(expectedPath);
    EXPECT_EQ(printed, std::string(expected.begin(), expected.end()));
}

INSTANTIATE_TEST_SUITE_P(All, Documents, ::testing::ValuesIn(Cases()), CaseName);

TEST(DocumentFolders, HoldCases) { EXPECT_GE(Cases().size(), 20u); }

// The executable segment of the library the tests load.
void FindLibraryText() {
    katest::Api();
    dl_iterate_phdr(
        [](dl_phdr_info* info, size_t, void*) {
            if (strcmp(info->dlpi_name, KA_LIB_PATH) != 0) return 0;
            for (int i = 0; i < info->dlpi_phnum; ++i) {
                const ElfW(Phdr)& segment = info->dlpi_phdr[i];
                if (segment.p_type != PT_LOAD || (segment.p_flags & PF_X) == 0) continue;
                gLibraryText[0] = info->dlpi_addr + segment.p_vaddr;
                gLibraryText[1] = gLibraryText[0] + segment.p_memsz;
            }
            return 1;
        },
        nullptr);
}

struct Injected {
    const char* document;  // below tests/data/documents/
    bool vastOnly;
    bool libraryOnly;
};

void PrintTo(const Injected& c, std::ostream* out) {
    *out << c.document << (c.libraryOnly ? ", library" : ", everything");
}

class AllocationFailure : public ::testing::TestWithParam<Injected> {};

TEST_P(AllocationFailure, EndsInAResultCodeAndLeavesTheHandleUsable) {
    if (UnderValgrind()) GTEST_SKIP() << "the allocator is Valgrind's: nothing can be injected";
    const Injected& c = GetParam();
    const std::string path = kRoot + c.document;
    katest::AllowLocalFilesBelow(path.substr(0, path.rfind('/') + 1));
    const std::vector<char> document = katest::ReadFile(path);
    FindLibraryText();
    ASSERT_LT(gLibraryText[0], gLibraryText[1]);
    auto run = [&](bool arm, long n) {
        return Cycle({&document, &document}, c.vastOnly, true, true, "file://localhost" + path, arm,
                     c.libraryOnly, n);
    };
    // Also warms the modules' one-time state, which the block count must not see.
    const std::string ordinary = run(false, 0)[0];
    ASSERT_EQ(ordinary.compare(0, 18, "result 0x00000000\n"), 0) << ordinary;
    const std::string nothing = [&] {
        katest::Handle empty;
        return Print(empty.get(), KA_ERR_NO_MEMORY, c.vastOnly, true);
    }();
    long n = 0;
    for (bool injected = true; injected && !HasFailure(); ++n) {
        const long blocks = gLiveBlocks;
        {
            const auto r = run(true, n);
            injected = gInjection.injected;
            EXPECT_EQ(r[1], ordinary) << "after failing allocation " << n;
            const bool ok = r[0].compare(0, 18, ordinary, 0, 18) == 0;
            if (c.libraryOnly) {
                EXPECT_EQ(r[0], ok ? ordinary : nothing) << "failing allocation " << n;
            }
        }
        EXPECT_EQ(gLiveBlocks, blocks) << "leaked after failing allocation " << n;
    }
    printf("%ld runs, all but the last failing one allocation\n", n);
}

// The records of a Process come from a few arena chunks; arena_chunks.xml fills several of
// them and has texts that get blocks of their own, so that a failure lands at each growth.
INSTANTIATE_TEST_SUITE_P(Documents, AllocationFailure,
                         ::testing::Values(Injected{"vmap/vmap-inline-vast.xml", false, true},
                                           Injected{"vast/chain_three.xml", true, true},
                                           Injected{"vast/arena_chunks.xml", true, true},
                                           Injected{"vast-extras/inline_full.xml", true, true},
                                           Injected{"vast-extras/chain_extras.xml", true, true},
                                           Injected{"vmap/vmap-inline-vast.xml", false, false},
                                           Injected{"vast/chain_three.xml", true, false}));

}  // namespace
