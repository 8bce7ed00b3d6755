// Resident set over many Process cycles of every bundled example, through the public table
// over the real modules: a record, string or module reference left behind per cycle shows up as
// growth between the 1,000th and the last cycle. Two loops: one handle per mode that Processes
// every example again and again (each Process releases the previous records), and
// Open / Process / Close of a fresh handle per example.
//
// VMAP examples run in VMAP mode, VAST ones in VAST-only mode. The wrapper chain reads its
// documents from examples/wrapper-chain/ with local files allowed, as kavmap does; a wrapper
// that names a network URL is pointed at 127.0.0.1:1 with the stop flag raised, so its fetch
// fails at once without leaving the machine.
//
//   rss_bench [CYCLES]   (default 10000; exits 1 when the growth exceeds kMaxGrowthKiB)
#include <dirent.h>
#include <dlfcn.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "bench_support.h"
#include "ka/download.h"
#include "ka/vmap_parser_api.h"
#include "source_io_api.h"

namespace {

constexpr long kFirstCheckpoint = 1000;
constexpr long kDefaultCycles = 10000;
// Allocator noise stays well below this; one leaked string per cycle would not.
constexpr long kMaxGrowthKiB = 256;

struct Example {
    std::string name;
    std::vector<char> text;
    bool vastOnly;
    bool stopDownloads;  // its wrapper URL was rewritten to a closed loopback port
};

// Points every http(s) VASTAdTagURI at a closed loopback port; true when one was.
bool KeepOffTheNetwork(std::string& text) {
    static const std::string kOpen = "<VASTAdTagURI>";
    static const std::string kClose = "</VASTAdTagURI>";
    bool rewritten = false;
    for (size_t at = text.find(kOpen); at != std::string::npos; at = text.find(kOpen, at + 1)) {
        const size_t begin = at + kOpen.size();
        const size_t end = text.find(kClose, begin);
        if (end == std::string::npos) break;
        if (text.substr(begin, end - begin).find("http") == std::string::npos) continue;
        text.replace(begin, end - begin, "http://127.0.0.1:1/vast.xml");
        rewritten = true;
    }
    return rewritten;
}

void AddExamples(const std::string& dir, const std::string& prefix, std::vector<Example>& out) {
    DIR* folder = opendir(dir.c_str());
    if (folder == nullptr) return;
    std::vector<std::string> names;
    while (dirent* entry = readdir(folder)) {
        const std::string name = entry->d_name;
        if (name.size() > 4 && name.compare(name.size() - 4, 4, ".xml") == 0) names.push_back(name);
    }
    closedir(folder);
    std::sort(names.begin(), names.end());
    for (const std::string& name : names) {
        std::ifstream file(dir + name, std::ios::binary);
        std::string text((std::istreambuf_iterator<char>(file)), {});
        Example example;
        example.name = prefix + name;
        example.vastOnly = text.find("<vmap:VMAP") == std::string::npos;
        example.stopDownloads = KeepOffTheNetwork(text);
        example.text.assign(text.begin(), text.end());
        out.push_back(example);
    }
}

long ResidentKiB() {
    long pages = 0;
    long resident = 0;
    FILE* statm = fopen("/proc/self/statm", "r");
    if (statm == nullptr) return -1;
    if (fscanf(statm, "%ld %ld", &pages, &resident) != 2) resident = -1;
    fclose(statm);
    return resident < 0 ? -1 : resident * (sysconf(_SC_PAGESIZE) / 1024);
}

KA_BOOL gStop = 1;
std::string gWorkPath = KA_MODULES_DIR;

bool Process(void* handle, Example& example) {
    bench::Library().SetParam(handle, KA_PID_VMAP_STOP_FLAG,
                              example.stopDownloads ? &gStop : nullptr);
    const uint32_t result = bench::Library().Process(handle, example.text.data(),
                                                     static_cast<uint32_t>(example.text.size()));
    if (result != 0) {
        fprintf(stderr, "%s: Process gave 0x%08x\n", example.name.c_str(), result);
        return false;
    }
    return true;
}

void* OpenHandle(bool vastOnly) {
    void* handle = nullptr;
    if (bench::Library().Open(&handle, &gWorkPath[0]) != 0) {
        fprintf(stderr, "Open failed\n");
        exit(2);
    }
    bench::Library().SetParam(handle, KA_PID_VMAP_VAST_ONLY, vastOnly ? handle : nullptr);
    return handle;
}

// One handle per mode, every example Processed on it each cycle.
bool ReuseCycle(std::vector<Example>& examples, void* vmap, void* vast) {
    for (Example& example : examples) {
        if (!Process(example.vastOnly ? vast : vmap, example)) return false;
    }
    return true;
}

// A fresh handle per example: Open, Process, Close.
bool FreshCycle(std::vector<Example>& examples) {
    for (Example& example : examples) {
        void* handle = OpenHandle(example.vastOnly);
        const bool ok = Process(handle, example);
        bench::Library().Close(handle);
        if (!ok) return false;
    }
    return true;
}

struct Figures {
    long start;
    long first;
    long last;
};

template <typename Cycle>
bool Run(const char* label, long cycles, Cycle cycle) {
    Figures figures = {ResidentKiB(), 0, 0};
    for (long i = 1; i <= cycles; ++i) {
        if (!cycle()) return false;
        if (i == std::min(kFirstCheckpoint, cycles)) figures.first = ResidentKiB();
    }
    figures.last = ResidentKiB();
    const long growth = figures.last - figures.first;
    printf("%-36s RSS %6ld KiB before, %6ld KiB after %ld, %6ld KiB after %ld: %+ld KiB%s\n", label,
           figures.start, figures.first, std::min(kFirstCheckpoint, cycles), figures.last, cycles,
           growth, growth > kMaxGrowthKiB ? "  GROWS" : "");
    return growth <= kMaxGrowthKiB;
}

}  // namespace

int main(int argc, char** argv) {
    const long cycles = argc > 1 ? atol(argv[1]) : kDefaultCycles;
    if (cycles < 1) {
        fprintf(stderr, "usage: %s [CYCLES]\n", argv[0]);
        return 2;
    }
    const std::string examplesDir = KA_EXAMPLES_DIR;
    bench::AllowLocalFiles((examplesDir + "wrapper-chain/").c_str());
    std::vector<Example> examples;
    AddExamples(examplesDir, "", examples);
    AddExamples(examplesDir + "wrapper-chain/", "wrapper-chain/", examples);
    bool flat = true;
    void* vmap = OpenHandle(false);
    void* vast = OpenHandle(true);
    // What each example gives, so that a chain that stopped resolving is seen.
    for (Example& example : examples) {
        void* handle = example.vastOnly ? vast : vmap;
        if (!Process(handle, example)) return 1;
        if (example.vastOnly) {
            VastAdData* data = nullptr;
            bench::Library().GetVastAdData(handle, &data);
            const AdData* first = data != nullptr ? data->firstAd : nullptr;
            printf("%-28s VAST: %u ads, the first %s%s\n", example.name.c_str(),
                   data != nullptr ? data->adCount : 0,
                   first == nullptr                ? "missing"
                   : first->type == AD_TYPE_INLINE ? "InLine"
                                                   : "Wrapper",
                   example.stopDownloads ? " (its fetch kept off the network)" : "");
        } else {
            AdInfo* info = nullptr;
            bench::Library().GetAdInfo(handle, &info);
            printf("%-28s VMAP: %u breaks\n", example.name.c_str(), info->adBreakCount);
        }
    }
    flat = Run("one handle per mode, Process each", cycles,
               [&] { return ReuseCycle(examples, vmap, vast); }) &&
           flat;
    bench::Library().Close(vmap);
    bench::Library().Close(vast);
    flat = Run("Open / Process / Close each", cycles, [&] { return FreshCycle(examples); }) && flat;
    printf("resident set %s (limit %ld KiB of growth)\n", flat ? "flat" : "GROWS", kMaxGrowthKiB);
    return flat ? 0 : 1;
}
