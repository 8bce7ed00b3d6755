// Wrapper chains shaped by a hostile ad server, each run once through the public table over the
// real modules with default settings, in a child process of its own so that its peak resident
// memory is its own. The wrapped documents are local files that the source-IO module reads, as
// it does for a host that enables file access. Prints, per shape, the bytes handed over in all
// (the caller's document and every file), the wall time and the peak resident set, and exits 1
// when a shape takes more than kMaxMs or kMaxRssMiB.
//
//   chain_bench [--lib PATH] [--modules DIR]   (DIR ends with "/"; defaults: this build's)
#include <dlfcn.h>
#include <stdlib.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "ka/vmap_parser_api.h"
#include "source_io_api.h"

namespace {

constexpr double kMaxMs = 2000;
constexpr double kMaxRssMiB = 256;

struct Shape {
    const char* name;
    bool vastOnly;
    bool merge;
    // Writes the wrapped files into folder and returns the caller's document.
    std::function<std::string(const std::string& folder)> build;
};

std::string Vast(const std::string& ads) { return "<VAST version=\"3.0\">" + ads + "</VAST>"; }
std::string Repeat(const std::string& text, int times) {
    std::string out;
    for (int i = 0; i < times; ++i) out += text;
    return out;
}
size_t gFileBytes = 0;  // of the files the current shape wrote
void Write(const std::string& path, const std::string& text) {
    FILE* file = fopen(path.c_str(), "wb");
    if (file == nullptr || fwrite(text.data(), 1, text.size(), file) != text.size()) exit(3);
    fclose(file);
    gFileBytes += text.size();
}
std::string Wrapper(const std::string& uri, const std::string& content) {
    return "<Ad><Wrapper><VASTAdTagURI>" + uri + "</VASTAdTagURI>" + content + "</Wrapper></Ad>";
}

const std::vector<Shape>& Shapes() {
    static const std::vector<Shape> shapes = {
        {"tracking x Linear creatives, 8000 x 8000", true, true,
         [](const std::string& folder) {
             Write(folder + "i.xml",
                   Vast("<Ad><InLine><Creatives>" + Repeat("<Creative><Linear/></Creative>", 8000) +
                        "</Creatives></InLine></Ad>"));
             return Vast(
                 Wrapper("i.xml", "<Creatives><Creative><Linear><TrackingEvents>" +
                                      Repeat("<Tracking event=\"start\">u</Tracking>", 8000) +
                                      "</TrackingEvents></Linear></Creative></Creatives>"));
         }},
        {"impressions x InLine ads, 8000 x 8000", true, true,
         [](const std::string& folder) {
             Write(folder + "i.xml", Vast(Repeat("<Ad><InLine/></Ad>", 8000)));
             return Vast(Wrapper("i.xml", Repeat("<Impression>u</Impression>", 8000)));
         }},
        {"64 wrappers of one 2 MiB document, merging off", true, false,
         [](const std::string& folder) {
             Write(folder + "big.xml", Vast(Repeat("<Ad/>", (2 << 20) / 5)));
             return Vast(Repeat(Wrapper("big.xml", ""), 64));
         }},
        {"six wrappers that name their own document", true, true,
         [](const std::string& folder) {
             const std::string loop = Vast(Repeat(Wrapper("f.xml", ""), 6));
             Write(folder + "f.xml", loop);
             return loop;
         }},
        {"25 breaks of three-document chains", false, true,
         [](const std::string& folder) {
             Write(folder + "w1.xml", Vast(Wrapper("w2.xml", "<Impression>w1</Impression>")));
             Write(folder + "w2.xml", Vast(Wrapper("in.xml", "<Impression>w2</Impression>")));
             Write(folder + "in.xml",
                   Vast("<Ad><InLine><Impression>in</Impression></InLine></Ad>"));
             return "<vmap:VMAP>" +
                    Repeat("<vmap:AdBreak><vmap:AdSource><vmap:VASTAdData>" +
                               Vast(Wrapper("w1.xml", "")) +
                               "</vmap:VASTAdData></vmap:AdSource></vmap:AdBreak>",
                           25) +
                    "</vmap:VMAP>";
         }},
    };
    return shapes;
}

struct Figures {
    double ms;
    double rssMiB;
    double inputBytes;
    uint32_t result;
};

// In the child: one Process of the shape; the figures go to fd.
void RunShape(const Shape& shape, const std::string& lib, std::string modules,
              const std::string& folder, int fd) {
    const std::string document = shape.build(folder);

    void* module = dlopen((modules + "libkaSourceIO.so").c_str(), RTLD_NOW);
    void* library = dlopen(lib.c_str(), RTLD_NOW);
    if (module == nullptr || library == nullptr) exit(3);
    SourceIOApi io = {};
    reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"))(&io);
    uint32_t one = 1;
    io.SetParam(nullptr, ka::kSioAllowFiles, &one);
    io.SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(folder.c_str()));
    VMAPParserAPI api = {};
    reinterpret_cast<KaGetVMAPParserAPIFn>(dlsym(library, "kaGetVMAPParserAPI"))(&api);

    void* handle = nullptr;
    if (api.Open(&handle, &modules[0]) != 0) exit(3);
    api.SetParam(handle, KA_PID_VMAP_VAST_ONLY, shape.vastOnly ? handle : nullptr);
    api.SetParam(handle, KA_PID_VMAP_MERGE_WRAPPERS, shape.merge ? handle : nullptr);
    std::vector<char> buffer(document.begin(), document.end());
    const auto start = std::chrono::steady_clock::now();
    Figures figures = {};
    figures.result = api.Process(handle, buffer.data(), static_cast<uint32_t>(buffer.size()));
    figures.ms =
        std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
    rusage usage = {};
    getrusage(RUSAGE_SELF, &usage);
    figures.rssMiB = usage.ru_maxrss / 1024.0;
    figures.inputBytes = static_cast<double>(document.size() + gFileBytes);
    if (write(fd, &figures, sizeof(figures)) != sizeof(figures)) exit(3);
    _exit(0);  // the records go with the process; what is measured is the Process above
}

}  // namespace

int main(int argc, char** argv) {
    std::string lib = KA_LIB_PATH, modules = KA_MODULES_DIR;
    for (int i = 1; i + 1 < argc; i += 2) {
        if (strcmp(argv[i], "--lib") == 0) lib = argv[i + 1];
        if (strcmp(argv[i], "--modules") == 0) modules = argv[i + 1];
    }
    printf("%-48s %10s %10s %12s %8s\n", "shape", "input KB", "ms", "peak MiB", "result");
    bool within = true;
    for (const Shape& shape : Shapes()) {
        int fds[2];
        if (pipe(fds) != 0) return 3;
        char pattern[] = "/tmp/ka-chain-bench-XXXXXX";
        if (mkdtemp(pattern) == nullptr) return 3;
        fflush(stdout);
        const pid_t child = fork();
        if (child == 0) RunShape(shape, lib, modules, std::string(pattern) + "/", fds[1]);
        close(fds[1]);
        Figures figures = {};
        const bool read = ::read(fds[0], &figures, sizeof(figures)) == sizeof(figures);
        close(fds[0]);
        int status = 0;
        waitpid(child, &status, 0);
        std::filesystem::remove_all(pattern);
        if (!read) {
            printf("%-48s failed (status %d)\n", shape.name, status);
            within = false;
            continue;
        }
        printf("%-48s %10.0f %10.1f %12.1f %#8x\n", shape.name, figures.inputBytes / 1024,
               figures.ms, figures.rssMiB, figures.result);
        within = within && figures.ms <= kMaxMs && figures.rssMiB <= kMaxRssMiB;
    }
    printf(within ? "every shape within %.0f ms and %.0f MiB\n"
                  : "a shape took more than %.0f ms or %.0f MiB\n",
           kMaxMs, kMaxRssMiB);
    return within ? 0 : 1;
}
