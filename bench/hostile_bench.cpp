// Hostile documents (hostile_documents.h) at 1 MiB and 8 MiB, through the public table over the
// real modules, as a player reaches the library. Beside each, the XML module alone loading the
// same buffer. The summary at the end gives, per shape, the time per byte at 8 MiB over the time
// per byte at 1 MiB: a list walk or a copy that grows with the document shows up there as a
// ratio well above 1. The program exits 1 when a ratio exceeds kMaxRatio.
//
// glibc's malloc, left to itself, gives freed blocks of several MiB back to the kernel and
// faults them in again on the next Process, while 1 MiB documents reuse warm heap memory: that
// alone made one shape's 8 MiB bytes cost 1.8 times as much (and the XML module's load 2.6
// times), whichever ran first. The program therefore keeps freed memory in the heap, so that
// the ratio measures the work the library does; --default-allocator turns this off.
//
//   hostile_bench [--default-allocator] [--benchmark_filter=REGEX] ...
#include <benchmark/benchmark.h>
#include <dlfcn.h>
#include <malloc.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <map>
#include <string>
#include <vector>

#include "bench_support.h"
#include "hostile_documents.h"
#include "ka/vmap_parser_api.h"
#include "source_io_api.h"
#include "xml_parser_api.h"

namespace {

constexpr size_t kMiB = 1024 * 1024;
constexpr size_t kSmall = 1 * kMiB;
constexpr size_t kLarge = 8 * kMiB;
constexpr double kMaxRatio = 1.5;
constexpr int kRepetitions = 3;

// One document at a time: the benchmarks of one shape and size run one after another.
const hostile::Document& DocumentOf(const hostile::Shape& shape, size_t bytes) {
    static std::string key;
    static hostile::Document document;
    const std::string wanted = std::string(shape.name) + "/" + std::to_string(bytes);
    if (key != wanted) {
        document = shape.build(bytes);
        key = wanted;
    }
    return document;
}

void SetCounters(benchmark::State& state, const hostile::Document& document) {
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) *
                            static_cast<int64_t>(document.text.size()));
    state.counters["doc_bytes"] = static_cast<double>(document.text.size());
    state.counters["items"] = static_cast<double>(document.count);
}

void BM_Process(benchmark::State& state, const hostile::Shape* shape, size_t bytes) {
    const hostile::Document& document = DocumentOf(*shape, bytes);
    std::vector<char> buffer(document.text.begin(), document.text.end());
    std::string workPath = KA_MODULES_DIR;
    void* handle = nullptr;
    if (bench::Library().Open(&handle, &workPath[0]) != 0) {
        state.SkipWithError("Open failed");
        return;
    }
    if (shape->mode == hostile::Mode::kVastOnly) {
        bench::Library().SetParam(handle, KA_PID_VMAP_VAST_ONLY, handle);
    }
    // Each Process first releases what the one before built, so that cost is in the loop too.
    for (auto _ : state) {
        const uint32_t result =
            bench::Library().Process(handle, buffer.data(), static_cast<uint32_t>(buffer.size()));
        if (result != 0) {
            state.SkipWithError("Process failed");
            break;
        }
    }
    bench::Library().Close(handle);
    SetCounters(state, document);
}

void BM_XmlLoad(benchmark::State& state, const hostile::Shape* shape, size_t bytes) {
    const hostile::Document& document = DocumentOf(*shape, bytes);
    bench::XmlModule module;
    for (auto _ : state) {
        if (module.Load(document.text) != 0) {
            state.SkipWithError("LoadXML failed");
            break;
        }
    }
    SetCounters(state, document);
}

// CPU nanoseconds per document byte of every finished benchmark, by its registered name; the
// median of the repetitions.
class SummaryReporter : public benchmark::ConsoleReporter {
public:
    SummaryReporter() : ConsoleReporter(isatty(1) ? OO_ColorTabular : OO_Tabular) {}

    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& run : runs) {
            if (run.error_occurred) continue;
            if (run.run_type == Run::RT_Aggregate && run.aggregate_name != "median") continue;
            auto bytes = run.counters.find("doc_bytes");
            if (bytes == run.counters.end() || bytes->second.value <= 0) continue;
            // Aggregates come after the repetitions: the median replaces any single run.
            const double seconds =
                run.GetAdjustedCPUTime() / benchmark::GetTimeUnitMultiplier(run.time_unit);
            mPerByte[run.run_name.function_name] = seconds * 1e9 / bytes->second.value;
        }
        ConsoleReporter::ReportRuns(runs);
    }

    double PerByte(const std::string& name) const {
        auto found = mPerByte.find(name);
        return found == mPerByte.end() ? 0 : found->second;
    }

private:
    std::map<std::string, double> mPerByte;
};

std::string Name(const char* kind, const hostile::Shape& shape, size_t bytes) {
    return std::string(kind) + "/" + shape.name + "/" + std::to_string(bytes / kMiB) + "MiB";
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 1 && std::string(argv[1]) == "--default-allocator") {
        argv[1] = argv[0];
        --argc;
        ++argv;
    } else {
        // The largest fixed mmap threshold glibc takes; a fixed one also stops it from moving.
        mallopt(M_MMAP_THRESHOLD, 32 * 1024 * 1024);
        mallopt(M_TRIM_THRESHOLD, 1024 * 1024 * 1024);
    }
    // The wrapper shape reads its wrapped document from the examples folder.
    bench::AllowLocalFiles(KA_EXAMPLES_DIR);
    size_t count = 0;
    const hostile::Shape* shapes = hostile::Shapes(&count);
    for (size_t i = 0; i < count; ++i) {
        for (size_t bytes : {kSmall, kLarge}) {
            benchmark::RegisterBenchmark(Name("Process", shapes[i], bytes).c_str(), BM_Process,
                                         &shapes[i], bytes)
                ->Unit(benchmark::kMillisecond)
                ->Repetitions(kRepetitions)
                ->ReportAggregatesOnly(true);
            benchmark::RegisterBenchmark(Name("XmlLoad", shapes[i], bytes).c_str(), BM_XmlLoad,
                                         &shapes[i], bytes)
                ->Unit(benchmark::kMillisecond)
                ->Repetitions(kRepetitions)
                ->ReportAggregatesOnly(true);
        }
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
    SummaryReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    benchmark::Shutdown();

    printf("\n%-22s %12s %12s %8s %10s %10s\n", "shape", "ns/B 1MiB", "ns/B 8MiB", "ratio",
           "xml ratio", "overhead");
    bool over = false;
    for (size_t i = 0; i < count; ++i) {
        const double small = reporter.PerByte(Name("Process", shapes[i], kSmall));
        const double large = reporter.PerByte(Name("Process", shapes[i], kLarge));
        if (small <= 0 || large <= 0) continue;  // filtered out or failed
        const double ratio = large / small;
        const double xmlSmall = reporter.PerByte(Name("XmlLoad", shapes[i], kSmall));
        const double xmlLarge = reporter.PerByte(Name("XmlLoad", shapes[i], kLarge));
        const double xmlRatio = xmlSmall > 0 ? xmlLarge / xmlSmall : 0;
        // The library's own share: Process time over the XML module's load time, at 8 MiB.
        const double overhead = xmlLarge > 0 ? large / xmlLarge : 0;
        over = over || ratio > kMaxRatio;
        printf("%-22s %12.3f %12.3f %8.2f %10.2f %10.2f%s\n", shapes[i].name, small, large, ratio,
               xmlRatio, overhead, ratio > kMaxRatio ? "  OVER" : "");
    }
    printf("per-byte ratio 8MiB/1MiB must be <= %.1f: %s\n", kMaxRatio, over ? "FAILED" : "ok");
    return over ? 1 : 0;
}
