// Allocation failures injected into one Process, one allocation at a time: for N = 0, 1, 2, ...
// the (N+1)th allocation after arming fails, until an armed run completes without reaching it.
// After each run the handle must read the same document again into the ordinary records, and
// Close must leave no memory behind (counted in blocks here; LeakSanitizer's at exit under ASan).
//
// Two reaches. "library": only the operator new calls made from the library's own code (its
// records, strings, parsers, containers), and then the Process either gives the ordinary records
// or KA_ERR_NO_MEMORY with nothing lent. "everything": also operator new inside the modules and,
// outside sanitizer builds (whose allocator owns malloc), every malloc of the process: pugixml,
// libc, the dynamic loader. A module that runs out answers with its ordinary failure, which the
// library cannot tell from a broken document or download, so any result code is accepted there.
#include <gtest/gtest.h>
#include <link.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>
#include <string>
#include <vector>

#include "api_support.h"
#include "ka/chain_limits.h"
#include "printer.h"

namespace {

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
void* operator new(size_t size) {
    if (void* p = New(size, __builtin_return_address(0))) return p;
    throw std::bad_alloc();
}
void* operator new[](size_t size) {
    if (void* p = New(size, __builtin_return_address(0))) return p;
    throw std::bad_alloc();
}
void* operator new(size_t size, const std::nothrow_t&) noexcept {
    return New(size, __builtin_return_address(0));
}
void* operator new[](size_t size, const std::nothrow_t&) noexcept {
    return New(size, __builtin_return_address(0));
}
void operator delete(void* p) noexcept { Free(p); }
void operator delete[](void* p) noexcept { Free(p); }
void operator delete(void* p, size_t) noexcept { Free(p); }
void operator delete[](void* p, size_t) noexcept { Free(p); }
void operator delete(void* p, const std::nothrow_t&) noexcept { Free(p); }
void operator delete[](void* p, const std::nothrow_t&) noexcept { Free(p); }

namespace {

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

std::string Print(void* handle, uint32_t result, bool vastOnly) {
    char* text = nullptr;
    size_t length = 0;
    FILE* out = open_memstream(&text, &length);
    fprintf(out, "result 0x%08x\n", static_cast<unsigned int>(result));
    PrintJson(out, ReadResult(katest::Api(), handle, vastOnly));
    fclose(out);
    std::string printed(text, length);
    free(text);
    return printed;
}

struct Case {
    const char* document;  // below tests/data/documents/
    bool vastOnly;
    bool libraryOnly;
};

void PrintTo(const Case& c, std::ostream* out) {
    *out << c.document << (c.libraryOnly ? ", library" : ", everything");
}

class AllocationFailure : public ::testing::TestWithParam<Case> {};

TEST_P(AllocationFailure, EndsInAResultCodeAndLeavesTheHandleUsable) {
    const Case& c = GetParam();
    const std::string path = std::string(KA_TEST_DATA_DIR) + "documents/" + c.document;
    katest::AllowLocalFilesBelow(path.substr(0, path.rfind('/') + 1));
    const std::vector<char> document = katest::ReadFile(path);
    std::string base = "file://localhost" + path;
    const VMAPParserAPI& api = katest::Api();
    FindLibraryText();
    ASSERT_LT(gLibraryText[0], gLibraryText[1]);

    // One handle reads the document twice; when armed, allocation n (from 0) of the first
    // Process fails.
    struct Run {
        uint32_t result;
        bool injected;
        std::string first, second;
    };
    auto run = [&](bool arm, long n) {
        Run r = {};
        std::string workPath = KA_MODULES_DIR;
        void* handle = nullptr;
        EXPECT_EQ(api.Open(&handle, &workPath[0]), KA_OK);
        api.SetParam(handle, KA_PID_VMAP_VAST_ONLY, c.vastOnly ? katest::kUntouched : nullptr);
        api.SetParam(handle, KA_PID_VMAP_BASE_URL, &base[0]);
        for (std::string* printed : {&r.first, &r.second}) {
            std::vector<char> copy = document;
            gInjection = {arm && printed == &r.first, c.libraryOnly, n, false};
            const uint32_t result =
                api.Process(handle, copy.data(), static_cast<uint32_t>(copy.size()));
            gInjection.armed = false;
            if (printed == &r.first) r = {result, gInjection.injected, {}, {}};
            *printed = Print(handle, result, c.vastOnly);
        }
        EXPECT_EQ(api.Close(handle), KA_OK);
        return r;
    };
    // Also warms the modules' one-time state, which the block count must not see.
    const std::string ordinary = run(false, 0).first;
    ASSERT_EQ(ordinary.compare(0, 18, "result 0x00000000\n"), 0) << ordinary;
    std::string nothing;
    {
        katest::Handle empty;
        nothing = Print(empty.get(), KA_ERR_NO_MEMORY, c.vastOnly);
    }
    long n = 0;
    for (bool injected = true; injected && !HasFailure(); ++n) {
        const long blocks = gLiveBlocks;
        {
            const Run r = run(true, n);
            injected = r.injected;
            EXPECT_EQ(r.second, ordinary) << "after failing allocation " << n;
            if (c.libraryOnly) {
                EXPECT_EQ(r.first, r.result == KA_OK ? ordinary : nothing)
                    << "failing allocation " << n;
            }
        }
        EXPECT_EQ(gLiveBlocks, blocks) << "leaked after failing allocation " << n;
    }
    printf("%ld runs, all but the last failing one allocation\n", n);
}

INSTANTIATE_TEST_SUITE_P(Documents, AllocationFailure,
                         ::testing::Values(Case{"vmap/vmap-inline-vast.xml", false, true},
                                           Case{"vast/chain_three.xml", true, true},
                                           Case{"vmap/vmap-inline-vast.xml", false, false},
                                           Case{"vast/chain_three.xml", true, false}));

}  // namespace
