// kavmap: loads the library as a player does, parses one document and prints its records.
#include <dlfcn.h>
#include <unistd.h>

#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "ka/vmap_parser_api.h"
#include "printer.h"
#include "result_text.h"

namespace {

// Bigger documents are no ad playlists; refusing them keeps the size within 32 bits.
constexpr size_t kMaxDocumentSize = 256u << 20;

struct Options {
    bool vastOnly = false;
    bool merge = true;
    bool json = false;
    std::string modulesDir;
    std::string libPath;
    std::string document;
};

int Usage() {
    fputs(
        "usage: kavmap [--vast] [--no-merge] [--json] [--modules DIR] [--lib PATH] DOCUMENT\n"
        "  DOCUMENT     a VMAP file, or - for standard input\n"
        "  --vast       read DOCUMENT as a bare VAST document\n"
        "  --no-merge   do not merge wrapper ads into the ads they lead to\n"
        "  --json       print the records as JSON\n"
        "  --modules    folder of the platform modules (default: ../modules next to kavmap)\n"
        "  --lib        the parser library (default: ../lib/libkaVMAPParser.so next to kavmap)\n",
        stderr);
    return 2;
}

// The folder kavmap runs from, with a trailing "/"; empty when it cannot be found.
std::string ExecutableDir() {
    char path[4096];
    ssize_t n = readlink("/proc/self/exe", path, sizeof(path) - 1);
    if (n <= 0) return std::string();
    std::string exe(path, static_cast<size_t>(n));
    size_t slash = exe.rfind('/');
    return slash == std::string::npos ? std::string() : exe.substr(0, slash + 1);
}

// 0 on success, 2 after printing the usage on bad arguments.
int ParseArguments(int argc, char** argv, Options& options) {
    bool haveDocument = false;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (arg == "--vast") {
            options.vastOnly = true;
        } else if (arg == "--no-merge") {
            options.merge = false;
        } else if (arg == "--json") {
            options.json = true;
        } else if (arg == "--modules" || arg == "--lib") {
            if (i + 1 >= argc || argv[i + 1][0] == '\0') return Usage();
            (arg == "--lib" ? options.libPath : options.modulesDir) = argv[++i];
        } else if (arg == "-" || arg.compare(0, 1, "-") != 0) {
            if (haveDocument) return Usage();
            options.document = arg;
            haveDocument = true;
        } else {
            fprintf(stderr, "kavmap: unknown option %s\n", arg.c_str());
            return Usage();
        }
    }
    if (!haveDocument || options.document.empty()) return Usage();
    const std::string dir = ExecutableDir();
    if (options.libPath.empty()) options.libPath = dir + "../lib/libkaVMAPParser.so";
    if (options.modulesDir.empty()) options.modulesDir = dir + "../modules/";
    // The library looks modules up by appending file names to this folder.
    if (options.modulesDir.back() != '/') options.modulesDir += '/';
    return 0;
}

bool IsUrl(const std::string& document) {
    return document.compare(0, 7, "http://") == 0 || document.compare(0, 8, "https://") == 0;
}

// Reads the whole file, or standard input for "-"; false with a message on failure.
bool ReadDocument(const std::string& name, std::vector<char>& data) {
    FILE* file = name == "-" ? stdin : fopen(name.c_str(), "rb");
    if (file == nullptr) {
        fprintf(stderr, "kavmap: cannot open %s: %s\n", name.c_str(), strerror(errno));
        return false;
    }
    char chunk[65536];
    size_t n;
    bool tooLarge = false;
    while ((n = fread(chunk, 1, sizeof(chunk), file)) > 0) {
        if (data.size() + n > kMaxDocumentSize) {
            tooLarge = true;
            break;
        }
        data.insert(data.end(), chunk, chunk + n);
    }
    const bool failed = ferror(file) != 0;
    if (file != stdin) fclose(file);
    if (tooLarge) {
        fprintf(stderr, "kavmap: %s is larger than %zu bytes\n", name.c_str(), kMaxDocumentSize);
        return false;
    }
    if (failed) {
        fprintf(stderr, "kavmap: cannot read %s\n", name.c_str());
        return false;
    }
    return true;
}

void ReportFailure(const char* step, uint32_t code) {
    fprintf(stderr, "kavmap: %s failed: 0x%08" PRIx32 " (%s)\n", step, code, ResultText(code));
}

int Run(const Options& options, const VMAPParserAPI& api, std::vector<char>& document) {
    std::string workPath = options.modulesDir;  // kept alive until Close, as the library asks
    void* handle = nullptr;
    uint32_t result = api.Open(&handle, &workPath[0]);
    if (result != KA_OK) {
        ReportFailure("Open", result);
        return 1;
    }
    api.SetParam(handle, KA_PID_VMAP_VAST_ONLY,
                 reinterpret_cast<void*>(static_cast<uintptr_t>(options.vastOnly)));
    api.SetParam(handle, KA_PID_VMAP_MERGE_WRAPPERS,
                 reinterpret_cast<void*>(static_cast<uintptr_t>(options.merge)));

    char empty = '\0';
    result = api.Process(handle, document.empty() ? &empty : document.data(),
                         static_cast<uint32_t>(document.size()));
    if (result != KA_OK) {
        ReportFailure("Process", result);
        api.Close(handle);
        return 1;
    }

    ProcessResult records = {};
    AdInfo* info = nullptr;
    api.GetAdInfo(handle, &info);
    records.adInfo = info;
    char* contentUri = nullptr;
    api.GetParam(handle, KA_PID_VMAP_CONTENT_URI, &contentUri);
    records.contentUri = contentUri;
    VastAdData* vast = nullptr;
    api.GetVastAdData(handle, &vast);
    records.vastAdData = vast;
    if (options.json) {
        PrintJson(stdout, records);
    } else {
        PrintText(stdout, records);
    }
    api.Close(handle);
    return fflush(stdout) == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (ParseArguments(argc, argv, options) != 0) return 2;
    if (IsUrl(options.document)) {
        fprintf(stderr, "kavmap: %s: documents by URL are not supported; save it to a file\n",
                options.document.c_str());
        return 2;
    }

    std::vector<char> document;
    if (!ReadDocument(options.document, document)) return 1;

    void* library = dlopen(options.libPath.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) {
        fprintf(stderr, "kavmap: cannot load %s: %s\n", options.libPath.c_str(), dlerror());
        return 1;
    }
    auto getApi = reinterpret_cast<KaGetVMAPParserAPIFn>(dlsym(library, "kaGetVMAPParserAPI"));
    if (getApi == nullptr) {
        fprintf(stderr, "kavmap: %s has no kaGetVMAPParserAPI\n", options.libPath.c_str());
        dlclose(library);
        return 1;
    }
    VMAPParserAPI api = {};
    getApi(&api);
    const int status = Run(options, api, document);
    dlclose(library);
    return status;
}
