// Process through the public table, beside the XML module's own load of the same buffers, for
// each of the four cases. The ratio of the two times is the library's own overhead; it is
// printed at the end of the run, per document (a case of two documents reads both per
// iteration), with the cost of the VAST 4 extras: Process with them (the default) over Process
// without (KA_PID_VMAP_READ_EXTRAS off).
//
// On a shared machine the speed of both drifts within a run, by more than the differences worth
// measuring; so the ratio printed is measured apart from the benchmarks above it: Process and
// load take turns in short rounds of about a millisecond of CPU time each, and the median of the
// rounds' ratios is printed, with the quartiles.
//
//   process_bench [--lib PATH] [--modules DIR] [benchmark options]   (DIR ends with "/")
#include <time.h>

#include <algorithm>
#include <cstdio>
#include <vector>

#include "bench_support.h"

namespace {

void Run(benchmark::State& state, const bench::Document* document, bool readExtras) {
    bench::ParserHandle handle(document->vastOnly, readExtras);
    if (handle.ProcessAll(*document) != 0) {
        state.SkipWithError("Process failed");
        return;
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(handle.ProcessAll(*document));
    }
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) *
                            static_cast<int64_t>(document->Bytes()));
}

void ProcessDocument(benchmark::State& state, const bench::Document* document) {
    Run(state, document, true);
}

void ProcessWithoutExtras(benchmark::State& state, const bench::Document* document) {
    Run(state, document, false);
}

void LoadDocument(benchmark::State& state, const bench::Document* document) {
    bench::XmlModule module;
    if (module.LoadAll(*document) != 0) {
        state.SkipWithError("LoadXML failed");
        return;
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(module.LoadAll(*document));
    }
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) *
                            static_cast<int64_t>(document->Bytes()));
}

// CPU time of this thread, in ns.
double CpuNow() {
    timespec now{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) * 1e9 + static_cast<double>(now.tv_nsec);
}

template <typename Body>
double CpuTimeOf(int iterations, Body body) {
    const double start = CpuNow();
    for (int i = 0; i < iterations; ++i) body();
    return CpuNow() - start;
}

// Quartiles of Process ÷ load over rounds in which the two take turns, each round repeating
// Process and then the load `iterations` times.
struct RatioSpread {
    double low, median, high;
};

RatioSpread InterleavedRatio(const bench::Document& document, int iterations) {
    constexpr int kRounds = 41;
    bench::ParserHandle handle(document.vastOnly, true);
    bench::XmlModule module;
    std::vector<double> ratios;
    for (int round = 0; round < kRounds; ++round) {
        const double process =
            CpuTimeOf(iterations, [&] { benchmark::DoNotOptimize(handle.ProcessAll(document)); });
        const double load =
            CpuTimeOf(iterations, [&] { benchmark::DoNotOptimize(module.LoadAll(document)); });
        if (load > 0.0) ratios.push_back(process / load);
    }
    if (ratios.empty()) return {0.0, 0.0, 0.0};
    std::sort(ratios.begin(), ratios.end());
    return {ratios[ratios.size() / 4], ratios[ratios.size() / 2], ratios[ratios.size() * 3 / 4]};
}

}  // namespace

int main(int argc, char** argv) {
    bench::TakePathOptions(argc, argv);
    // Each document's two benchmarks run one after the other, so that both see the same load
    // on a shared machine.
    for (const bench::Document& document : bench::Documents()) {
        benchmark::RegisterBenchmark(("Process/" + document.name).c_str(), ProcessDocument,
                                     &document);
        benchmark::RegisterBenchmark(("Load/" + document.name).c_str(), LoadDocument, &document);
        benchmark::RegisterBenchmark(("NoExtras/" + document.name).c_str(), ProcessWithoutExtras,
                                     &document);
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    bench::KeepingReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);
    benchmark::Shutdown();

    // Lowest CPU time per iteration of each, over the repetitions asked for, per document; the
    // ratio from the rounds of InterleavedRatio.
    printf("\n%-12s %10s %14s %14s %16s %14s %16s\n", "document", "bytes", "Process (us)",
           "load (us)", "Process / load", "quartiles", "extras on / off");
    for (const bench::Document& document : bench::Documents()) {
        const double count = static_cast<double>(document.buffers.size());
        const double process = reporter.CpuTime("Process/" + document.name) / count;
        const double load = reporter.CpuTime("Load/" + document.name) / count;
        const double off = reporter.CpuTime("NoExtras/" + document.name) / count;
        if (process <= 0.0 || load <= 0.0 || off <= 0.0) continue;
        // Rounds of about a millisecond of Process.
        const int iterations = std::max(1, static_cast<int>(1e6 / (process * count)));
        const RatioSpread ratio = InterleavedRatio(document, iterations);
        printf("%-12s %10.0f %14.1f %14.1f %16.2f %8.2f-%.2f %16.2f\n", document.name.c_str(),
               static_cast<double>(document.Bytes()) / count, process / 1000.0, load / 1000.0,
               ratio.median, ratio.low, ratio.high, process / off);
    }
    return 0;
}
