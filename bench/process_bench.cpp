// Bytes per second of Process through the public table, beside the XML module's own load of
// the same buffer, for each of the three documents. The ratio of the two times is the
// library's own overhead; it is printed at the end of the run.
#include <cstdio>

#include "bench_support.h"

namespace {

void ProcessDocument(benchmark::State& state, const bench::Document* document) {
    bench::ParserHandle handle(document->vastOnly);
    if (handle.Process(document->bytes) != 0) {
        state.SkipWithError("Process failed");
        return;
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(handle.Process(document->bytes));
    }
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) *
                            static_cast<int64_t>(document->bytes.size()));
}

void LoadDocument(benchmark::State& state, const bench::Document* document) {
    bench::XmlModule module;
    if (module.Load(document->bytes) != 0) {
        state.SkipWithError("LoadXML failed");
        return;
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(module.Load(document->bytes));
    }
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) *
                            static_cast<int64_t>(document->bytes.size()));
}

}  // namespace

int main(int argc, char** argv) {
    // Each document's two benchmarks run one after the other, so that both see the same load
    // on a shared machine.
    for (const bench::Document& document : bench::Documents()) {
        benchmark::RegisterBenchmark(("Process/" + document.name).c_str(), ProcessDocument,
                                     &document);
        benchmark::RegisterBenchmark(("Load/" + document.name).c_str(), LoadDocument, &document);
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    bench::KeepingReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    benchmark::Shutdown();

    // Lowest CPU time per iteration of each, over the repetitions asked for.
    printf("\n%-12s %10s %14s %14s %16s\n", "document", "bytes", "Process (us)", "load (us)",
           "Process / load");
    for (const bench::Document& document : bench::Documents()) {
        const double process = reporter.CpuTime("Process/" + document.name);
        const double load = reporter.CpuTime("Load/" + document.name);
        if (process <= 0.0 || load <= 0.0) continue;
        printf("%-12s %10zu %14.1f %14.1f %16.2f\n", document.name.c_str(), document.bytes.size(),
               process / 1000.0, load / 1000.0, process / load);
    }
    return 0;
}
