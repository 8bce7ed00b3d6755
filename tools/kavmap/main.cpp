// kavmap: loads the library as a player does, parses one document and prints its records.
#include <dlfcn.h>
#include <unistd.h>

#include <cerrno>
#include <cinttypes>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "ka/chain_limits.h"
#include "ka/download.h"
#include "ka/vmap_parser_api.h"
#include "ka/vmap_parser_ext.h"
#include "printer.h"
#include "result_text.h"
#include "source_io_api.h"

namespace {

// Bigger documents are no ad playlists; refusing them keeps the size within 32 bits.
constexpr size_t kMaxDocumentSize = 256u << 20;

struct Options {
    bool vastOnly = false;
    bool merge = true;
    bool json = false;
    bool trace = false;                 // print each ad's wrapper chain after the records
    bool extras = false;                // print the VAST 4 extras of each ad and creative
    bool lenient = false;               // VMAP elements under any prefix of its namespace
    unsigned long timeoutSeconds = 10;  // every download of the Process together; 0: none
    std::string baseUrl;                // where the document came from
    std::string modulesDir;
    std::string libPath;
    std::string document;
};

int Usage() {
    fputs(
        "usage: kavmap [--vast] [--no-merge] [--json] [--trace] [--extras] [--lenient]\n"
        "              [--timeout SECONDS]\n"
        "              [--modules DIR] [--lib PATH] DOCUMENT\n"
        "  DOCUMENT     a VMAP file, - for standard input, or an http(s) URL\n"
        "  --vast       read DOCUMENT as a bare VAST document\n"
        "  --no-merge   do not merge wrapper ads into the ads they lead to\n"
        "  --json       print the records as JSON\n"
        "  --trace      also print each ad's wrapper chain: downloads, outcome, Error URLs\n"
        "  --extras     also print each ad's and creative's VAST 4 extras (companions, icons...)\n"
        "  --lenient    also read VMAP elements without a prefix or under another one\n"
        "  --timeout    seconds all downloads of wrapped documents may take (default 10, 0: none)\n"
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
        } else if (arg == "--trace") {
            options.trace = true;
        } else if (arg == "--extras") {
            options.extras = true;
        } else if (arg == "--lenient") {
            options.lenient = true;
        } else if (arg == "--timeout") {
            char* end = nullptr;
            if (i + 1 >= argc) return Usage();
            const unsigned long seconds = strtoul(argv[++i], &end, 10);
            if (end == argv[i] || *end != '\0' || argv[i][0] == '-' || seconds > 86400) {
                return Usage();
            }
            options.timeoutSeconds = seconds;
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

// The source-IO module, loaded from the path the library loads it from, so that both use the
// same instance: its module-wide settings then hold for the library's downloads too. The
// module stays loaded for the life of the process (it is linked with -z nodelete).
class SourceModule {
public:
    explicit SourceModule(const std::string& modulesDir) : mApi() {
        const std::string path = modulesDir + "libkaSourceIO.so";
        void* module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (module == nullptr) {
            mError = dlerror();
            return;
        }
        auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
        if (entry == nullptr || entry(&mApi) != 0 || mApi.SetParam == nullptr) {
            mApi = SourceIOApi();
            mError = path + " has no usable kaGetSourceIOAPI";
        }
    }

    bool ok() const { return mApi.SetParam != nullptr; }
    const std::string& error() const { return mError; }
    SourceIOApi* api() { return &mApi; }

    // Local files, relative paths taken from dir: wrapped documents of a local document resolve
    // without a network.
    void AllowFilesBelow(const std::string& dir) {
        uint32_t one = 1;
        mApi.SetParam(nullptr, ka::kSioAllowFiles, &one);
        mApi.SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(dir.c_str()));
    }

private:
    SourceIOApi mApi;
    std::string mError;
};

// The absolute folder of a local document ("-": the current one), with a trailing "/".
std::string DocumentDir(const std::string& document) {
    char resolved[PATH_MAX];
    std::string dir;
    if (document == "-") {
        if (getcwd(resolved, sizeof(resolved)) != nullptr) dir = resolved;
    } else if (realpath(document.c_str(), resolved) != nullptr) {
        dir = resolved;
        dir.erase(dir.rfind('/') + 1);
    }
    if (!dir.empty() && dir.back() != '/') dir += '/';
    return dir;
}

// Fetches url through the library's DownloadToBuffer; false with a message on failure.
bool FetchDocument(void* library, SourceModule& module, const std::string& url,
                   std::vector<char>& data, std::string& finalUrl) {
    // Resolved at run time like the rest of the library, with the public declaration's type.
    auto download =
        reinterpret_cast<decltype(&DownloadToBuffer)>(dlsym(library, "DownloadToBuffer"));
    if (download == nullptr) {
        fprintf(stderr, "kavmap: the library has no DownloadToBuffer\n");
        return false;
    }
    if (url.size() >= KA_DOWNLOAD_URL_SIZE) {
        fprintf(stderr, "kavmap: the URL is longer than %d bytes\n", KA_DOWNLOAD_URL_SIZE - 1);
        return false;
    }
    // Too large for the stack of small threads; one record per run is enough.
    static DownloadRecord record;
    memset(&record, 0, sizeof(record));
    memcpy(record.url, url.c_str(), url.size() + 1);
    uint8_t* buffer = nullptr;
    uint32_t capacity = 0;
    uint32_t bytesRead = 0;
    const uint32_t result = download(module.api(), nullptr, nullptr, nullptr, nullptr, &record,
                                     &buffer, &capacity, &bytesRead, nullptr, 0, nullptr, nullptr);
    if (result == KA_OK && buffer != nullptr && bytesRead <= capacity) {
        data.assign(buffer, buffer + bytesRead);
        finalUrl = record.finalURL[0] != '\0' ? record.finalURL : url;
    }
    delete[] buffer;
    if (result != KA_OK) {
        fprintf(stderr, "kavmap: download of %s failed: 0x%08" PRIx32 " (%s)\n", url.c_str(),
                result, ResultText(result));
        return false;
    }
    return true;
}

int Run(const Options& options, const VMAPParserAPI& api, const VMAPParserExtAPI& ext,
        std::vector<char>& document) {
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
    api.SetParam(handle, KA_PID_VMAP_DEADLINE_MS,
                 reinterpret_cast<void*>(static_cast<uintptr_t>(options.timeoutSeconds * 1000)));
    if (options.lenient)
        api.SetParam(handle, KA_PID_VMAP_LENIENT, reinterpret_cast<void*>(uintptr_t{1}));
    std::string baseUrl = options.baseUrl;
    if (!baseUrl.empty()) api.SetParam(handle, KA_PID_VMAP_BASE_URL, &baseUrl[0]);

    char empty = '\0';
    result = api.Process(handle, document.empty() ? &empty : document.data(),
                         static_cast<uint32_t>(document.size()));
    if (result != KA_OK) {
        ReportFailure("Process", result);
        api.Close(handle);
        return 1;
    }

    ProcessResult records = ReadResult(api, handle, options.vastOnly);
    KaChainOutcome* outcomes = nullptr;
    records.trace = options.trace;
    if (options.trace && ext.GetChainOutcomes != nullptr) {
        ext.GetChainOutcomes(handle, &outcomes);
    }
    records.outcomes = outcomes;
    // A library without the lookups shows no extras.
    if (options.extras && ext.GetNestedCreativeExtras != nullptr) {
        records.extrasApi = &ext;
        records.handle = handle;
    }
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
    const bool isUrl = IsUrl(options.document);

    std::vector<char> document;
    if (!isUrl && !ReadDocument(options.document, document)) return 1;

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
    // The second table, for --trace; a library without it shows no chains.
    VMAPParserExtAPI ext = {};
    ext.size = sizeof(ext);
    auto getExt =
        reinterpret_cast<KaGetVMAPParserExtAPIFn>(dlsym(library, "kaGetVMAPParserExtAPI"));
    if (getExt == nullptr || getExt(&ext) != KA_OK) ext = VMAPParserExtAPI();

    // Wrapped documents are fetched through the same module; without it they just fail.
    SourceModule module(options.modulesDir);
    if (isUrl) {
        if (!module.ok()) {
            fprintf(stderr, "kavmap: cannot load the source-IO module: %s\n",
                    module.error().c_str());
            dlclose(library);
            return 1;
        }
        if (!FetchDocument(library, module, options.document, document, options.baseUrl)) {
            dlclose(library);
            return 1;
        }
    } else if (module.ok()) {
        const std::string dir = DocumentDir(options.document);
        if (!dir.empty()) module.AllowFilesBelow(dir);
        // Relative references resolve from the file itself ("-": from the current folder).
        char file[PATH_MAX];
        if (options.document == "-") {
            if (!dir.empty()) options.baseUrl = "file://localhost" + dir;
        } else if (realpath(options.document.c_str(), file) != nullptr) {
            options.baseUrl = std::string("file://localhost") + file;
        }
    }
    const int status = Run(options, api, ext, document);
    dlclose(library);
    return status;
}
