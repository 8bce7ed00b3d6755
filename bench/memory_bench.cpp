// Bytes allocated by one Process of each document, against the document's size (per document
// for a case of two documents read in turn).
//
//   memory_bench [--lib PATH] [--modules DIR] [benchmark options]   (DIR ends with "/")
//
// The program
// replaces malloc and its family: the library, the XML module and pugixml are loaded into this
// process, and every heap allocation of theirs (operator new included, which the C++ runtime
// serves from malloc) resolves to the definitions below. Counting is on only around the
// measured call.
#include <malloc.h>

#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstdio>

#include "bench_support.h"

extern "C" {
void* __libc_malloc(size_t size);
void* __libc_calloc(size_t count, size_t size);
void* __libc_realloc(void* pointer, size_t size);
void* __libc_memalign(size_t alignment, size_t size);
void __libc_free(void* pointer);
}

namespace {

// Only the benchmark's own thread allocates while counting is on.
struct Tally {
    bool on = false;
    uint64_t calls = 0;
    uint64_t bytes = 0;  // requested sizes, added up
    int64_t live = 0;    // usable bytes held, from when counting started
    int64_t peak = 0;
};
Tally gTally;

void Counted(void* pointer, size_t requested) {
    if (!gTally.on || pointer == nullptr) return;
    ++gTally.calls;
    gTally.bytes += requested;
    gTally.live += static_cast<int64_t>(malloc_usable_size(pointer));
    if (gTally.live > gTally.peak) gTally.peak = gTally.live;
}

void Released(void* pointer) {
    if (!gTally.on || pointer == nullptr) return;
    gTally.live -= static_cast<int64_t>(malloc_usable_size(pointer));
}

}  // namespace

extern "C" {

void* malloc(size_t size) {
    void* pointer = __libc_malloc(size);
    Counted(pointer, size);
    return pointer;
}

void* calloc(size_t count, size_t size) {
    void* pointer = __libc_calloc(count, size);
    Counted(pointer, count * size);
    return pointer;
}

void* realloc(void* pointer, size_t size) {
    Released(pointer);
    void* moved = __libc_realloc(pointer, size);
    Counted(moved, size);
    return moved;
}

void free(void* pointer) {
    Released(pointer);
    __libc_free(pointer);
}

void* memalign(size_t alignment, size_t size) {
    void* pointer = __libc_memalign(alignment, size);
    Counted(pointer, size);
    return pointer;
}

void* aligned_alloc(size_t alignment, size_t size) { return memalign(alignment, size); }

int posix_memalign(void** out, size_t alignment, size_t size) {
    void* pointer = memalign(alignment, size);
    if (pointer == nullptr) return ENOMEM;
    *out = pointer;
    return 0;
}

}  // extern "C"

namespace {

struct Measure {
    Tally tally;
    int64_t heldAfter = 0;  // live bytes when the call returned, against before it
};

template <class Call>
Measure Count(Call call) {
    gTally = Tally();
    gTally.on = true;
    call();
    gTally.on = false;
    return Measure{gTally, gTally.live};
}

// Allocations and bytes per document of the measured calls (count of them, one per document).
void SetCounters(benchmark::State& state, const Measure& m, size_t documentSize, size_t count) {
    state.counters["allocs"] = static_cast<double>(m.tally.calls) / count;
    state.counters["bytes"] = static_cast<double>(m.tally.bytes) / count;
    state.counters["per_doc_byte"] = static_cast<double>(m.tally.bytes) / documentSize;
    state.counters["peak"] = static_cast<double>(m.tally.peak);
    state.counters["held"] = static_cast<double>(m.heldAfter);
}

// One Process of each document on a handle that has processed them before: what every further
// Process allocates (the previous records are freed inside the same call).
void ProcessAgain(benchmark::State& state, const bench::Document* document) {
    bench::ParserHandle handle(document->vastOnly);
    if (handle.ProcessAll(*document) != 0) {
        state.SkipWithError("Process failed");
        return;
    }
    Measure m;
    for (auto _ : state) {
        m = Count([&] { handle.ProcessAll(*document); });
    }
    SetCounters(state, m, document->Bytes(), document->buffers.size());
}

// The first Process of a fresh handle, on the case's first document: "held" is then what the
// handle keeps for the records (and the module for its document) until the next Process.
void ProcessFirst(benchmark::State& state, const bench::Document* document) {
    const std::string& first = document->buffers.front();
    Measure m;
    for (auto _ : state) {
        bench::ParserHandle handle(document->vastOnly);
        m = Count([&] { handle.Process(first); });
    }
    SetCounters(state, m, first.size(), 1);
}

// The XML module's own load of the same buffers, repeated on one handle.
void LoadAgain(benchmark::State& state, const bench::Document* document) {
    bench::XmlModule module;
    module.LoadAll(*document);
    Measure m;
    for (auto _ : state) {
        m = Count([&] { module.LoadAll(*document); });
    }
    SetCounters(state, m, document->Bytes(), document->buffers.size());
}

}  // namespace

int main(int argc, char** argv) {
    bench::TakePathOptions(argc, argv);
    for (const bench::Document& document : bench::Documents()) {
        benchmark::RegisterBenchmark(("ProcessAgain/" + document.name).c_str(), ProcessAgain,
                                     &document)
            ->Iterations(5);
        benchmark::RegisterBenchmark(("ProcessFirst/" + document.name).c_str(), ProcessFirst,
                                     &document)
            ->Iterations(5);
        benchmark::RegisterBenchmark(("LoadAgain/" + document.name).c_str(), LoadAgain, &document)
            ->Iterations(5);
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    bench::KeepingReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    benchmark::Shutdown();

    printf("\n%-12s %9s | %-37s | %-24s | %-21s\n", "", "", "  one more Process", "  first Process",
           "  XML module load");
    printf("%-12s %9s | %7s %10s %6s %10s | %10s %13s | %7s %10s %6s\n", "document", "bytes",
           "allocs", "allocated", "/byte", "peak", "allocated", "held after", "allocs", "allocated",
           "/byte");
    for (const bench::Document& document : bench::Documents()) {
        const std::string again = "ProcessAgain/" + document.name;
        const std::string first = "ProcessFirst/" + document.name;
        const std::string load = "LoadAgain/" + document.name;
        printf("%-12s %9zu | %7.0f %10.0f %6.2f %10.0f | %10.0f %13.0f | %7.0f %10.0f %6.2f\n",
               document.name.c_str(), document.Bytes() / document.buffers.size(),
               reporter.Counter(again, "allocs"), reporter.Counter(again, "bytes"),
               reporter.Counter(again, "per_doc_byte"), reporter.Counter(again, "peak"),
               reporter.Counter(first, "bytes"), reporter.Counter(first, "held"),
               reporter.Counter(load, "allocs"), reporter.Counter(load, "bytes"),
               reporter.Counter(load, "per_doc_byte"));
    }
    return 0;
}
