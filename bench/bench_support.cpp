#include "bench_support.h"

#include <dlfcn.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>

#include "ka/vast_extras.h"
#include "source_io_api.h"

namespace bench {
namespace {

[[noreturn]] void Fail(const std::string& what) {
    fprintf(stderr, "bench: %s\n", what.c_str());
    exit(1);
}

std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) Fail("cannot read " + path);
    std::ostringstream out;
    out << in.rdbuf();
    return out.str();
}

void ReplaceAll(std::string& text, const std::string& from, const std::string& to) {
    for (size_t at = text.find(from); at != std::string::npos;
         at = text.find(from, at + to.size())) {
        text.replace(at, from.size(), to);
    }
}

std::string gLibPath = KA_LIB_PATH;
std::string gModulesDir = KA_MODULES_DIR;

}  // namespace

void TakePathOptions(int& argc, char** argv) {
    int kept = 1;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if ((arg == "--lib" || arg == "--modules") && i + 1 < argc) {
            (arg == "--lib" ? gLibPath : gModulesDir) = argv[++i];
        } else {
            argv[kept++] = argv[i];
        }
    }
    argc = kept;
}

size_t Document::Bytes() const {
    size_t bytes = 0;
    for (const std::string& buffer : buffers) bytes += buffer.size();
    return bytes;
}

std::string MakePlaylist(const std::string& vastDocument, int breaks) {
    const size_t begin = vastDocument.find("<Ad ");
    const size_t end = vastDocument.rfind("</Ad>");
    if (begin == std::string::npos || end == std::string::npos) Fail("no <Ad> to repeat");
    const std::string ad = vastDocument.substr(begin, end + 5 - begin);

    std::string out =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<vmap:VMAP xmlns:vmap=\"http://www.iab.net/videosuite/vmap\" version=\"1.0\">\n";
    for (int i = 0; i < breaks; ++i) {
        char id[32];
        snprintf(id, sizeof(id), "break-%03d", i);
        char offset[32];
        snprintf(offset, sizeof(offset), "%02d:%02d:%02d.000", i / 60, i % 60, (i * 7) % 60);
        std::string copy = ad;
        ReplaceAll(copy, "bench-inline-1", id);
        ReplaceAll(copy, "winter", id);
        out +=
            std::string("  <vmap:AdBreak timeOffset=\"") + offset +
            "\" breakType=\"linear\" breakId=\"" + id +
            "\">\n"
            "    <vmap:AdSource id=\"" +
            std::to_string(i + 1) +
            "\" allowMultipleAds=\"false\" followRedirects=\"true\">\n"
            "      <vmap:VASTAdData>\n"
            "        <VAST version=\"3.0\">\n" +
            copy +
            "\n"
            "        </VAST>\n"
            "      </vmap:VASTAdData>\n"
            "    </vmap:AdSource>\n"
            "    <vmap:TrackingEvents>\n"
            "      <vmap:Tracking "
            "event=\"breakStart\">https://ads.bench.example/break?e=start&amp;b=" +
            id +
            "</vmap:Tracking>\n"
            "      <vmap:Tracking event=\"breakEnd\">https://ads.bench.example/break?e=end&amp;b=" +
            id +
            "</vmap:Tracking>\n"
            "    </vmap:TrackingEvents>\n"
            "  </vmap:AdBreak>\n";
    }
    out += "</vmap:VMAP>\n";
    return out;
}

const std::vector<Document>& Documents() {
    static const std::vector<Document> documents = [] {
        const std::string vast = ReadFile(KA_BENCH_DATA_DIR "vast_inline_4k.xml");
        return std::vector<Document>{
            {"vast_2k_3k",
             {ReadFile(KA_BENCH_DATA_DIR "vast_inline_2k.xml"),
              ReadFile(KA_BENCH_DATA_DIR "vast_inline_3k.xml")},
             true},
            {"vast_4k", {vast}, true},
            {"vmap_40k", {ReadFile(KA_BENCH_DATA_DIR "vmap_six_breaks_40k.xml")}, false},
            {"playlist_1m", {MakePlaylist(vast, 200)}, false},
        };
    }();
    return documents;
}

const VMAPParserAPI& Library() {
    static const VMAPParserAPI api = [] {
        void* library = dlopen(gLibPath.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (library == nullptr) Fail(std::string("dlopen: ") + dlerror());
        auto get = reinterpret_cast<KaGetVMAPParserAPIFn>(dlsym(library, "kaGetVMAPParserAPI"));
        if (get == nullptr) Fail("no kaGetVMAPParserAPI in " + gLibPath);
        VMAPParserAPI table{};
        if (get(&table) != 0) Fail("kaGetVMAPParserAPI failed");
        return table;
    }();
    return api;
}

ParserHandle::ParserHandle(bool vastOnly, bool readExtras) {
    // Open keeps the path by pointer: the string lives as long as the program.
    if (Library().Open(&mHandle, &gModulesDir[0]) != 0 || mHandle == nullptr) Fail("Open failed");
    if (vastOnly) Library().SetParam(mHandle, KA_PID_VMAP_VAST_ONLY, reinterpret_cast<void*>(1));
    if (!readExtras) Library().SetParam(mHandle, KA_PID_VMAP_READ_EXTRAS, nullptr);
}

ParserHandle::~ParserHandle() { Library().Close(mHandle); }

uint32_t ParserHandle::Process(const std::string& document) {
    return Library().Process(mHandle, const_cast<char*>(document.data()),
                             static_cast<uint32_t>(document.size()));
}

uint32_t ParserHandle::ProcessAll(const Document& document) {
    uint32_t failed = 0;
    for (const std::string& buffer : document.buffers) {
        if (const uint32_t result = Process(buffer)) failed = result;
    }
    return failed;
}

void AllowLocalFiles(const char* baseDir) {
    void* module = dlopen((gModulesDir + "libkaSourceIO.so").c_str(), RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) Fail(std::string("dlopen: ") + dlerror());
    auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
    static SourceIOApi api = {};
    if (entry == nullptr || entry(&api) != 0 || api.SetParam == nullptr) Fail("no source-IO table");
    uint32_t on = 1;
    api.SetParam(nullptr, ka::kSioAllowFiles, &on);
    if (baseDir != nullptr) api.SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(baseDir));
}

XmlModule::XmlModule() {
    mLibrary = dlopen((gModulesDir + "libkaXMLParser.so").c_str(), RTLD_NOW | RTLD_LOCAL);
    if (mLibrary == nullptr) Fail(std::string("dlopen: ") + dlerror());
    auto get = reinterpret_cast<KaXMLGetParserAPIFn>(dlsym(mLibrary, "kaXMLGetParserAPI"));
    if (get == nullptr || get(&mApi) != 0 || mApi.Init == nullptr) Fail("no XML module table");
    XMLInitData init = {nullptr, nullptr, nullptr};
    if (mApi.Init(&mHandle, &init) != 0) Fail("XML module Init failed");
}

XmlModule::~XmlModule() {
    mApi.Uninit(mHandle);
    dlclose(mLibrary);
}

unsigned int XmlModule::Load(const std::string& document) {
    // The library's load mode: the module may make something of it.
    return mApi.LoadXML(mHandle, const_cast<char*>(document.data()),
                        static_cast<int>(document.size()), 160);
}

unsigned int XmlModule::LoadAll(const Document& document) {
    unsigned int failed = 0;
    for (const std::string& buffer : document.buffers) {
        if (const unsigned int result = Load(buffer)) failed = result;
    }
    return failed;
}

void KeepingReporter::ReportRuns(const std::vector<Run>& runs) {
    for (const Run& run : runs) {
        if (run.error_occurred || run.run_type != Run::RT_Iteration) continue;
        std::string name = run.run_name.function_name;
        if (!run.run_name.args.empty()) name += "/" + run.run_name.args;
        const double cpu = run.GetAdjustedCPUTime();
        auto found = mCpuTime.find(name);
        if (found == mCpuTime.end() || cpu < found->second) mCpuTime[name] = cpu;
        for (const auto& counter : run.counters) mCounters[name][counter.first] = counter.second;
    }
    ConsoleReporter::ReportRuns(runs);
}

double KeepingReporter::CpuTime(const std::string& name) const {
    auto found = mCpuTime.find(name);
    return found == mCpuTime.end() ? 0.0 : found->second;
}

double KeepingReporter::Counter(const std::string& name, const std::string& counter) const {
    auto found = mCounters.find(name);
    if (found == mCounters.end()) return 0.0;
    auto value = found->second.find(counter);
    return value == found->second.end() ? 0.0 : value->second;
}

}  // namespace bench
