// Stand-in for the platform's source-IO module on libcurl. Each source is one transfer on its
// own curl multi handle: Open starts it, GetSourceSize and Read drive it without blocking, and
// the whole body is kept in memory until Uninit. URLs come from ad servers, so only http and
// https are fetched (also behind redirects), TLS is verified, redirects, time and size are
// bounded; local files are read only when the host allows them module-wide, and only inside the
// base folder it names.
#include <curl/curl.h>
#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <new>

#include "source_io_api.h"

#define KA_SOURCEIO_API extern "C" __attribute__((visibility("default")))

namespace {

// GetParam / SetParam: an id this module does not know, or a value it cannot use.
constexpr uint32_t kUnknownParam = 0x91127003;
constexpr size_t kBaseDirSize = 1024;
constexpr size_t kUserAgentSize = 512;
constexpr const char* kDefaultUserAgent = "kaSourceIO/1.0";

struct Settings {
    uint32_t connectTimeoutMs = ka::kSioDefaultConnectTimeoutMs;
    uint32_t totalTimeoutMs = ka::kSioDefaultTotalTimeoutMs;
    uint32_t maxRedirects = ka::kSioDefaultMaxRedirects;
    bool allowFiles = false;
    char baseDir[kBaseDirSize] = {};
};

// Module-wide settings; each source takes a copy at Init.
std::mutex gSettingsMutex;
Settings gSettings;

// libcurl's process-wide state. An init that failed (memory ran out) is tried again by the next
// transfer instead of leaving the module without http for good.
std::mutex gCurlMutex;
bool gCurlReady = false;

bool CurlReady() {
    std::lock_guard<std::mutex> lock(gCurlMutex);
    if (!gCurlReady) gCurlReady = curl_global_init(CURL_GLOBAL_DEFAULT) == CURLE_OK;
    return gCurlReady;
}

enum class State { kCreated, kRunning, kDone, kFailed };

struct Source {
    char url[KA_DOWNLOAD_URL_SIZE] = {};
    char finalUrl[KA_DOWNLOAD_URL_SIZE] = {};
    char userAgent[kUserAgentSize] = {};
    Settings settings;
    State state = State::kCreated;
    CURL* easy = nullptr;
    CURLM* multi = nullptr;
    uint8_t* body = nullptr;
    size_t bodySize = 0;
    size_t bodyCapacity = 0;
    size_t readPosition = 0;
    uint32_t httpStatus = 0;
    uint32_t redirects = 0;
};

// Appends received bytes; refusing them (a short count) makes curl end the transfer.
size_t WriteBody(char* data, size_t size, size_t count, void* user) {
    Source* source = static_cast<Source*>(user);
    const size_t n = size * count;
    if (n > ka::kSioMaxBodySize - source->bodySize) return 0;
    if (source->bodySize + n > source->bodyCapacity) {
        size_t capacity = source->bodyCapacity == 0 ? 64 * 1024 : source->bodyCapacity * 2;
        while (capacity < source->bodySize + n) capacity *= 2;
        if (capacity > ka::kSioMaxBodySize) capacity = ka::kSioMaxBodySize;
        void* grown = realloc(source->body, capacity);
        if (grown == nullptr) return 0;
        source->body = static_cast<uint8_t*>(grown);
        source->bodyCapacity = capacity;
    }
    memcpy(source->body + source->bodySize, data, n);
    source->bodySize += n;
    return n;
}

void StopTransfer(Source* source) {
    if (source->multi != nullptr && source->easy != nullptr) {
        curl_multi_remove_handle(source->multi, source->easy);
    }
    if (source->easy != nullptr) curl_easy_cleanup(source->easy);
    if (source->multi != nullptr) curl_multi_cleanup(source->multi);
    source->easy = nullptr;
    source->multi = nullptr;
}

bool StartsWithNoCase(const char* text, const char* prefix) {
    return strncasecmp(text, prefix, strlen(prefix)) == 0;
}

// True when text begins with a URI scheme ("letters:"), which then is not a file path.
bool HasScheme(const char* text) {
    const char* p = text;
    if (!((*p >= 'a' && *p <= 'z') || (*p >= 'A' && *p <= 'Z'))) return false;
    while ((*p >= 'a' && *p <= 'z') || (*p >= 'A' && *p <= 'Z') || (*p >= '0' && *p <= '9') ||
           *p == '+' || *p == '-' || *p == '.') {
        ++p;
    }
    return *p == ':';
}

// True when a segment of path is "..": relative references stay inside the base directory.
bool ClimbsUp(const char* path) {
    const char* segment = path;
    for (;;) {
        const char* end = strchr(segment, '/');
        const size_t length = end != nullptr ? static_cast<size_t>(end - segment) : strlen(segment);
        if (length == 2 && segment[0] == '.' && segment[1] == '.') return true;
        if (end == nullptr) return false;
        segment = end + 1;
    }
}

// Copies src whole into dst (size bytes), terminated; null copies as "". A string that does not
// fit is not cut: dst becomes "" and the answer is false, since a cut URL or path names some
// other resource.
bool CopyWhole(char* dst, size_t size, const char* src) {
    if (size == 0) return false;
    if (src == nullptr) src = "";
    const size_t length = strnlen(src, size);
    if (length >= size) {
        dst[0] = '\0';
        return false;
    }
    memcpy(dst, src, length + 1);
    return true;
}

// Whether snprintf's result says that the whole string went into size bytes.
bool Fits(int written, size_t size) { return written >= 0 && static_cast<size_t>(written) < size; }

// The local path a file reference names, or false when it names none that may be read.
bool FilePath(const Source* source, char* path, size_t size) {
    const char* url = source->url;
    if (StartsWithNoCase(url, "file://")) {
        url += strlen("file://");
        if (StartsWithNoCase(url, "localhost/")) url += strlen("localhost");
        if (url[0] != '/') return false;
        return Fits(snprintf(path, size, "%s", url), size);
    }
    if (HasScheme(url) || url[0] == '\0') return false;
    if (url[0] == '/') return Fits(snprintf(path, size, "%s", url), size);
    if (ClimbsUp(url)) return false;
    const char* base = source->settings.baseDir;
    const bool slash = base[0] != '\0' && base[strlen(base) - 1] != '/';
    return Fits(snprintf(path, size, "%s%s%s", base, slash ? "/" : "", url), size);
}

// Whether the real path real lies inside the real folder realBase: a prefix that ends on a
// component boundary, so that "/base2/x" is not inside "/base".
bool Inside(const char* real, const char* realBase) {
    size_t length = strlen(realBase);
    while (length > 0 && realBase[length - 1] == '/') --length;  // "/" itself keeps length 0
    return strncmp(real, realBase, length) == 0 && real[length] == '/';
}

// Whether the file open as fd is, by the kernel's account, still the one inside realBase: a
// folder swapped for a symlink between the check and the open shows here. Without /proc the
// check made before the open stands.
bool OpenedInside(int fd, const char* realBase) {
    char link[64];
    char opened[PATH_MAX];
    snprintf(link, sizeof(link), "/proc/self/fd/%d", fd);
    const ssize_t n = readlink(link, opened, sizeof(opened));
    if (n < 0) return true;
    if (static_cast<size_t>(n) >= sizeof(opened)) return false;
    opened[n] = '\0';
    return Inside(opened, realBase);
}

// Reads a regular file whole when its real path, symlinks resolved, lies inside the real base
// folder; with no base folder nothing is read. Devices and pipes are refused so that nothing
// blocks.
bool ReadFile(Source* source, const char* path) {
    char realBase[PATH_MAX];
    char real[PATH_MAX];
    if (source->settings.baseDir[0] == '\0' ||
        realpath(source->settings.baseDir, realBase) == nullptr ||
        realpath(path, real) == nullptr || !Inside(real, realBase)) {
        return false;
    }
    const int fd = open(real, O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOFOLLOW);
    if (fd < 0) return false;
    struct stat info = {};
    bool ok = OpenedInside(fd, realBase) && fstat(fd, &info) == 0 && S_ISREG(info.st_mode) &&
              info.st_size >= 0 && static_cast<uint64_t>(info.st_size) <= ka::kSioMaxBodySize;
    if (ok && info.st_size > 0) {
        source->body = static_cast<uint8_t*>(malloc(static_cast<size_t>(info.st_size)));
        ok = source->body != nullptr;
        if (ok) source->bodyCapacity = static_cast<size_t>(info.st_size);
    }
    while (ok && source->bodySize < source->bodyCapacity) {
        const ssize_t n =
            read(fd, source->body + source->bodySize, source->bodyCapacity - source->bodySize);
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) ok = false;
        if (n <= 0) break;
        source->bodySize += static_cast<size_t>(n);
    }
    close(fd);
    return ok;
}

bool StartTransfer(Source* source) {
    if (!CurlReady()) return false;
    source->easy = curl_easy_init();
    source->multi = curl_multi_init();
    if (source->easy == nullptr || source->multi == nullptr) return false;

    const Settings& s = source->settings;
    CURL* e = source->easy;
    bool ok =
        curl_easy_setopt(e, CURLOPT_URL, source->url) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_PROTOCOLS_STR, "http,https") == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_REDIR_PROTOCOLS_STR, "http,https") == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_FOLLOWLOCATION, 1L) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_MAXREDIRS, static_cast<long>(s.maxRedirects)) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_CONNECTTIMEOUT_MS, static_cast<long>(s.connectTimeoutMs)) ==
            CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_TIMEOUT_MS, static_cast<long>(s.totalTimeoutMs)) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_MAXFILESIZE_LARGE,
                         static_cast<curl_off_t>(ka::kSioMaxBodySize)) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_SSL_VERIFYPEER, 1L) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_SSL_VERIFYHOST, 2L) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_FAILONERROR, 1L) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_NOSIGNAL, 1L) == CURLE_OK &&
        // The host decides about proxies, not the environment of the process.
        curl_easy_setopt(e, CURLOPT_PROXY, "") == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_ACCEPT_ENCODING, "") == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_USERAGENT,
                         source->userAgent[0] != '\0' ? source->userAgent : kDefaultUserAgent) ==
            CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_WRITEFUNCTION, WriteBody) == CURLE_OK &&
        curl_easy_setopt(e, CURLOPT_WRITEDATA, source) == CURLE_OK;
    return ok && curl_multi_add_handle(source->multi, e) == CURLM_OK;
}

void Finish(Source* source, CURLcode code) {
    long status = 0;
    long redirects = 0;
    char* effective = nullptr;
    curl_easy_getinfo(source->easy, CURLINFO_RESPONSE_CODE, &status);
    curl_easy_getinfo(source->easy, CURLINFO_REDIRECT_COUNT, &redirects);
    curl_easy_getinfo(source->easy, CURLINFO_EFFECTIVE_URL, &effective);
    source->httpStatus = static_cast<uint32_t>(status);
    source->redirects = static_cast<uint32_t>(redirects);
    // A URL reached after redirects that does not fit cannot be reported: the transfer fails.
    const bool ok = code == CURLE_OK && status >= 200 && status < 400 &&
                    CopyWhole(source->finalUrl, sizeof(source->finalUrl),
                              effective != nullptr ? effective : source->url);
    source->state = ok ? State::kDone : State::kFailed;
    StopTransfer(source);
}

// Moves a running transfer on without waiting: whatever the sockets hold now.
void Drive(Source* source) {
    if (source->state != State::kRunning) return;
    int running = 0;
    if (curl_multi_perform(source->multi, &running) != CURLM_OK) {
        source->state = State::kFailed;
        StopTransfer(source);
        return;
    }
    int queued = 0;
    while (CURLMsg* message = curl_multi_info_read(source->multi, &queued)) {
        if (message->msg == CURLMSG_DONE) {
            Finish(source, message->data.result);
            return;
        }
    }
}

void SetUint(uint32_t* target, void* value, uint32_t fallback) {
    const uint32_t v = *static_cast<const uint32_t*>(value);
    *target = v == 0 ? fallback : v;
}

uint32_t SetModuleParam(uint32_t id, void* value) {
    if (id == ka::kSioWorkPath) return 0;  // modules are found by the host; nothing to keep
    std::lock_guard<std::mutex> lock(gSettingsMutex);
    if (id == ka::kSioFileBaseDir) {
        // A folder that does not fit leaves none: no file is read rather than one elsewhere.
        return CopyWhole(gSettings.baseDir, sizeof(gSettings.baseDir),
                         static_cast<const char*>(value))
                   ? 0
                   : kUnknownParam;
    }
    if (value == nullptr) return kUnknownParam;
    switch (id) {
        case ka::kSioConnectTimeoutMs:
            SetUint(&gSettings.connectTimeoutMs, value, ka::kSioDefaultConnectTimeoutMs);
            return 0;
        case ka::kSioTotalTimeoutMs:
            SetUint(&gSettings.totalTimeoutMs, value, ka::kSioDefaultTotalTimeoutMs);
            return 0;
        case ka::kSioMaxRedirects:
            gSettings.maxRedirects = *static_cast<const uint32_t*>(value);
            return 0;
        case ka::kSioAllowFiles:
            gSettings.allowFiles = *static_cast<const uint32_t*>(value) != 0;
            return 0;
        default:
            return kUnknownParam;
    }
}

uint32_t GetModuleParam(uint32_t id, void* value) {
    if (value == nullptr) return kUnknownParam;
    std::lock_guard<std::mutex> lock(gSettingsMutex);
    uint32_t* out = static_cast<uint32_t*>(value);
    switch (id) {
        case ka::kSioConnectTimeoutMs:
            *out = gSettings.connectTimeoutMs;
            return 0;
        case ka::kSioTotalTimeoutMs:
            *out = gSettings.totalTimeoutMs;
            return 0;
        case ka::kSioMaxRedirects:
            *out = gSettings.maxRedirects;
            return 0;
        case ka::kSioAllowFiles:
            *out = gSettings.allowFiles ? 1 : 0;
            return 0;
        default:
            return kUnknownParam;
    }
}

// ---- The table's operations ----

uint32_t SioInit(void** handle, char* url, uint32_t /*flags*/, void* /*init*/) {
    if (handle == nullptr || url == nullptr) return ka::kSioFailed;
    Source* source = new (std::nothrow) Source();
    if (source == nullptr) return ka::kSioFailed;
    // A URL too long for the source is refused; cut, it would fetch some other resource.
    if (!CopyWhole(source->url, sizeof(source->url), url) ||
        !CopyWhole(source->finalUrl, sizeof(source->finalUrl), url)) {
        delete source;
        return ka::kSioFailed;
    }
    {
        std::lock_guard<std::mutex> lock(gSettingsMutex);
        source->settings = gSettings;
    }
    *handle = source;
    return 0;
}

uint32_t SioClose(void* handle) {
    if (handle == nullptr) return ka::kSioFailed;
    Source* source = static_cast<Source*>(handle);
    StopTransfer(source);
    if (source->state == State::kRunning) source->state = State::kFailed;
    return 0;
}

uint32_t SioUninit(void* handle) {
    if (handle == nullptr) return ka::kSioFailed;
    Source* source = static_cast<Source*>(handle);
    SioClose(source);
    free(source->body);
    delete source;
    return 0;
}

uint32_t SioOpen(void* handle, uint32_t /*mode*/) {
    if (handle == nullptr) return ka::kSioFailed;
    Source* source = static_cast<Source*>(handle);
    if (source->state != State::kCreated) return 0;

    const char* url = source->url;
    if (StartsWithNoCase(url, "http://") || StartsWithNoCase(url, "https://")) {
        if (StartTransfer(source)) {
            source->state = State::kRunning;
        } else {
            StopTransfer(source);
            source->state = State::kFailed;
        }
        return 0;
    }
    // Anything else fails at GetSourceSize, the one place callers look for transfer failures.
    char path[PATH_MAX];
    const bool readable = source->settings.allowFiles && FilePath(source, path, sizeof(path)) &&
                          ReadFile(source, path);
    source->state = readable ? State::kDone : State::kFailed;
    return 0;
}

uint32_t SioRead(void* handle, uint8_t* dst, uint32_t wanted, uint32_t* got) {
    if (handle == nullptr || got == nullptr || (dst == nullptr && wanted != 0)) {
        return ka::kSioFailed;
    }
    *got = 0;
    Source* source = static_cast<Source*>(handle);
    Drive(source);
    if (source->state == State::kRunning) return ka::kSioNotReady;
    if (source->state != State::kDone) return ka::kSioFailed;

    const size_t remaining = source->bodySize - source->readPosition;
    const size_t n = wanted < remaining ? wanted : remaining;
    if (n != 0) memcpy(dst, source->body + source->readPosition, n);
    source->readPosition += n;
    *got = static_cast<uint32_t>(n);
    // A request filled completely is plain data, even when it took the last byte.
    return n < wanted ? ka::kSioEnd : 0;
}

uint32_t SioGetSourceSize(void* handle, uint64_t* size) {
    if (handle == nullptr || size == nullptr) return ka::kSioFailed;
    Source* source = static_cast<Source*>(handle);
    Drive(source);
    if (source->state == State::kRunning) return ka::kSioNotReady;
    if (source->state != State::kDone) return ka::kSioFailed;
    *size = source->bodySize;
    return 0;
}

uint32_t SioGetParam(void* handle, uint32_t id, void* value) {
    if (handle == nullptr) return GetModuleParam(id, value);
    if (value == nullptr) return kUnknownParam;
    Source* source = static_cast<Source*>(handle);
    switch (id) {
        case ka::kSioFinalUrl: {
            auto* query = static_cast<ka::SourceFinalUrlQuery*>(value);
            if (source->state != State::kDone || query->out == nullptr || query->outSize == 0) {
                return kUnknownParam;
            }
            return CopyWhole(query->out, query->outSize, source->finalUrl) ? 0 : kUnknownParam;
        }
        case ka::kSioRetryCount:
            // One attempt per source: the module does not retry on its own.
            *static_cast<uint64_t*>(value) = 1;
            return 0;
        case ka::kSioResponseInfo: {
            auto* info = static_cast<ka::SourceResponseInfo*>(value);
            info->httpStatus = source->httpStatus;
            info->redirects = source->redirects;
            info->bodySize = source->bodySize;
            return 0;
        }
        default:
            return kUnknownParam;
    }
}

uint32_t SioSetParam(void* handle, uint32_t id, void* value) {
    if (handle == nullptr) return SetModuleParam(id, value);
    Source* source = static_cast<Source*>(handle);
    switch (id) {
        case ka::kSioRequest1:
        case ka::kSioRequest2:
        case ka::kSioRequest3:
        case ka::kSioRequest4:
            return 0;  // the host's request records carry nothing this stand-in uses
        case ka::kSioHostText:
            if (source->state != State::kCreated) return kUnknownParam;
            return CopyWhole(source->userAgent, sizeof(source->userAgent),
                             static_cast<const char*>(value))
                       ? 0
                       : kUnknownParam;
        default:
            return kUnknownParam;
    }
}

}  // namespace

KA_SOURCEIO_API int kaGetSourceIOAPI(SourceIOApi* api) {
    if (api == nullptr) return -1;
    // libcurl keeps process-wide state; the module is never unloaded (-z nodelete), so it is
    // set up once, before any transfer.
    CurlReady();
    api->Init = SioInit;
    api->Uninit = SioUninit;
    api->Open = SioOpen;
    api->Close = SioClose;
    api->Read = SioRead;
    api->GetSourceSize = SioGetSourceSize;
    api->GetParam = SioGetParam;
    api->SetParam = SioSetParam;
    return 0;
}
