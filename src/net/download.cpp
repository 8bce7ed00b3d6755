// Document downloads through the source-IO module: open, wait for the size, read, close. The
// module owns the network and its time limits; this side only polls it every 20 ms and watches
// the caller's stop flag.
#include "net/download.h"

#include <cstring>
#include <new>

#include "ka/os_utils.h"
#include "ka/result_codes.h"
#include "net/uri_whole.h"
#include "platform/lib_loader.h"
#include "platform/limits.h"
#include "source_io_api.h"

namespace {

constexpr uint32_t kPollMs = 20;
constexpr uint32_t kNoTimeLimit = 0xFFFFFFFFu;
constexpr uint64_t kNoRetryLimit = ~0ull;

// The caller's flag, written by another of its threads: read it afresh on every poll.
KA_BOOL FlagValue(const KA_BOOL* flag) {
    return flag == nullptr ? 0 : *static_cast<const volatile KA_BOOL*>(flag);
}

bool IsStopped(const KA_BOOL* flag) { return FlagValue(flag) != 0; }

// Closes and destroys a source handle the way every download ends.
void ReleaseSource(SourceIOApi* api, void* handle) {
    if (handle == nullptr) return;
    if (api->Open != nullptr) api->Close(handle);
    if (api->Init != nullptr) api->Uninit(handle);
}

// Init and Open for url; on success *handle is an open source. The handle may be set even on
// failure and is then released by the caller.
uint32_t OpenSource(SourceIOApi* api, char* url, void** handle, void* const* requests, char* text) {
    if (api->Init == nullptr) return KA_ERR_DOWNLOAD_OPEN;
    uint32_t result = api->Init(handle, url, 1, nullptr);
    if (result != 0) return result;

    if (requests != nullptr && *handle != nullptr) {
        const uint32_t ids[] = {ka::kSioRequest1, ka::kSioRequest2, ka::kSioRequest3,
                                ka::kSioRequest4};
        for (int i = 0; i < 4; ++i) {
            if (requests[i] != nullptr) api->SetParam(*handle, ids[i], requests[i]);
        }
        if (text != nullptr) api->SetParam(*handle, ka::kSioHostText, text);
    }

    if (*handle == nullptr || api->Open == nullptr) return KA_ERR_DOWNLOAD_OPEN;
    return api->Open(*handle, 1);
}

// When the size poll looks at the stop flag. The host operations ask at least once and look
// after each answer; ka_download_by_url looks before asking and again after each pause.
enum class StopCheck { kAfterEachAsk, kBeforeEachAsk };

// Asks the source for its size every kPollMs until it knows it. 0 once it does, and also when
// the stop flag ends the wait (*size then holds whatever the source last wrote); the module's
// failure code when the transfer failed.
uint32_t PollSourceSize(SourceIOApi* api, void* handle, const KA_BOOL* stopFlag, uint64_t* size,
                        StopCheck check, uint64_t deadline = 0) {
    if (check == StopCheck::kBeforeEachAsk && IsStopped(stopFlag)) return 0;
    for (;;) {
        const uint32_t result = api->GetSourceSize(handle, size);
        if (result == KA_ERR_DOWNLOAD_FAILED) return result;
        if (result == 0) return 0;
        if (check == StopCheck::kAfterEachAsk && IsStopped(stopFlag)) return 0;
        const uint64_t now = deadline != 0 ? ka::MonotonicMs() : 0;
        if (deadline != 0 && now + kPollMs > deadline) {
            // One more pause would end past the deadline: wait out what is left, ask once more.
            if (now < deadline) SleepMs(static_cast<uint32_t>(deadline - now));
            if (api->GetSourceSize(handle, size) == 0) return 0;
            return KA_ERR_DOWNLOAD_TIMEOUT;
        }
        SleepMs(kPollMs);
        if (check == StopCheck::kBeforeEachAsk && IsStopped(stopFlag)) return 0;
    }
}

// Reads *ioSize bytes into dst with neither a retry nor a time limit: the module bounds the
// transfer itself.
uint32_t ReadWhole(SourceIOApi* api, void* handle, uint8_t* dst, uint32_t* ioSize,
                   KA_BOOL* stopFlag) {
    return ReadSourceData(api, handle, dst, ioSize, stopFlag, kNoRetryLimit, kNoTimeLimit);
}

// What a host download hands the module besides the URL.
struct HostRequest {
    void* const* requests;  // the four request records, each may be null
    char* text;             // the host's string, or null
    void* outRecord;        // filled at the end of a successful download, or null
    KA_BOOL* stopFlag;      // may be null
    KA_BOOL useBase;        // join record->url to record->baseURL
};

// The caller's reusable buffer of DownloadToBuffer; DownloadWithAllocator has none and uses
// record->allocator.
struct HostBuffer {
    uint8_t** buffer;
    uint32_t* capacity;
    uint32_t* bytesRead;
};

// The host's table: the operations the host download calls unchecked must be there.
bool HasHostOperations(const SourceIOApi* api) {
    return api != nullptr && api->GetSourceSize != nullptr && api->Read != nullptr &&
           api->GetParam != nullptr && api->SetParam != nullptr &&
           (api->Init == nullptr || api->Uninit != nullptr) &&
           (api->Open == nullptr || api->Close != nullptr);
}

// Whether the record's field holds a terminated string.
bool Terminated(const char (&field)[KA_DOWNLOAD_URL_SIZE]) {
    return memchr(field, '\0', sizeof(field)) != nullptr;
}

// The URL to fetch into url (kUrlSize bytes): record->url, joined to record->baseURL when asked.
// False when a field is not terminated or the joined URL does not fit: cut, it would name some
// other resource.
bool ResolveUrl(const DownloadRecord* record, KA_BOOL useBase, char* url) {
    if (!Terminated(record->url)) return false;
    if (useBase == 0) {
        memcpy(url, record->url, ka::kUrlSize);
        return true;
    }
    return Terminated(record->baseURL) && ka::CombineUrlWhole(url, record->url, record->baseURL);
}

// Reads size bytes into the caller's buffer (grown to three times the size when too small) or
// into one from the record's allocator, and fills the record's buffer, size and capacity.
uint32_t ReadIntoTarget(SourceIOApi* api, void* handle, DownloadRecord* record,
                        const HostBuffer* target, uint32_t size, KA_BOOL* stopFlag) {
    // Hosts are given three times the source size of room.
    const uint32_t room = size * 3;
    uint8_t* dst = nullptr;
    uint32_t* count = nullptr;
    if (target != nullptr) {
        uint8_t** buffer = target->buffer;
        if (*target->capacity < room || (*buffer == nullptr && room != 0)) {
            uint8_t* old = *buffer;
            delete[] old;
            *buffer = new (std::nothrow) uint8_t[room];
            *target->capacity = *buffer != nullptr ? room : 0;
        }
        if (*buffer == nullptr && room != 0) return KA_ERR_LOAD_FAILED;
        if (*buffer != nullptr && *target->capacity != 0) memset(*buffer, 0, *target->capacity);
        *target->bytesRead = size;
        dst = *buffer;
        count = target->bytesRead;
    } else if (record->allocator == nullptr || record->allocator->Allocate == nullptr) {
        return KA_ERR_LOAD_FAILED;
    } else {
        record->size = size;
        record->capacity = room;
        record->allocator->Allocate(record->allocator->context, &record->buffer, room);
        // A host allocator that failed must not turn into a write through null.
        if (record->buffer == nullptr && size != 0) return KA_ERR_LOAD_FAILED;
        dst = record->buffer;
        count = &record->size;
    }
    const uint32_t result = ReadWhole(api, handle, dst, count, stopFlag);
    if (result == 0 && target != nullptr) {
        record->buffer = *target->buffer;
        record->size = *target->bytesRead;
        record->capacity = room;
    }
    return result;
}

// After a complete read: the URL reached after redirects into the record and the module's
// response into the host's out record. A stop flag set by now fails the download.
uint32_t FinishRecord(SourceIOApi* api, void* handle, char* url, DownloadRecord* record,
                      const HostRequest& request) {
    ka::SourceFinalUrlQuery query = {url, static_cast<uint32_t>(strlen(url)), record->finalURL,
                                     ka::kUrlSize};
    if (api->GetParam(handle, ka::kSioFinalUrl, &query) != 0) {
        memcpy(record->finalURL, url, sizeof(record->finalURL));
    }
    record->finalURL[sizeof(record->finalURL) - 1] = '\0';
    if (IsStopped(request.stopFlag)) return KA_ERR_LOAD_FAILED;
    if (request.outRecord != nullptr) {
        api->GetParam(handle, ka::kSioResponseInfo, request.outRecord);
    }
    return 0;
}

// The work shared by DownloadToBuffer (target set) and DownloadWithAllocator (target null).
uint32_t HostDownload(SourceIOApi* api, const HostRequest& request, DownloadRecord* record,
                      const HostBuffer* target) {
    if (record == nullptr) return KA_ERR_NULL_ARGUMENT;
    if (target != nullptr && (target->buffer == nullptr || target->capacity == nullptr ||
                              target->bytesRead == nullptr)) {
        return KA_ERR_NULL_ARGUMENT;
    }
    if (!HasHostOperations(api)) return KA_ERR_DOWNLOAD_OPEN;
    char url[ka::kUrlSize] = {};
    if (!ResolveUrl(record, request.useBase, url)) return KA_ERR_DOWNLOAD_FAILED;

    void* handle = nullptr;
    uint64_t sourceSize = 0;
    uint32_t result = OpenSource(api, url, &handle, request.requests, request.text);
    if (result == 0) {
        result =
            PollSourceSize(api, handle, request.stopFlag, &sourceSize, StopCheck::kAfterEachAsk);
    }
    if (result == 0 && sourceSize > KA_DOWNLOAD_MAX_SIZE) result = KA_ERR_LOAD_FAILED;
    if (result == 0) {
        result = ReadIntoTarget(api, handle, record, target, static_cast<uint32_t>(sourceSize),
                                request.stopFlag);
    }
    if (result == 0) result = FinishRecord(api, handle, url, record, request);
    ReleaseSource(api, handle);
    return result;
}

}  // namespace

uint32_t ReadSourceData(SourceIOApi* api, void* handle, uint8_t* dst, uint32_t* ioSize,
                        KA_BOOL* stopFlag, uint64_t maxRetries, uint32_t timeoutMs) {
    if (api == nullptr || ioSize == nullptr) return KA_ERR_NULL_ARGUMENT;
    if (dst == nullptr && *ioSize != 0) return KA_ERR_NULL_ARGUMENT;
    const uint32_t target = *ioSize;
    *ioSize = 0;
    const uint32_t start = GetTickCountMs();

    // How the loop ended decides between 0 and 1 below.
    bool endedByRead = false;
    bool endedByStop = false;
    bool queried = false;
    uint32_t lastQuery = 0;

    uint32_t position = 0;
    while (position < target) {
        if (IsStopped(stopFlag)) {
            endedByStop = true;
            break;
        }
        const uint32_t missing = target - position;
        uint32_t got = 0;
        const uint32_t result = api->Read(handle, dst + position, missing, &got);
        // A module never hands out more than asked; do not trust it to.
        if (got > missing) got = missing;
        if (result == ka::kSioNotReady) {
            SleepMs(kPollMs);
            continue;
        }
        if (result == ka::kSioEnd) {
            *ioSize += got;
            return 1;
        }
        if (result != 0) return result;

        if (maxRetries + 1 >= 2) {
            uint64_t retries = 0;
            lastQuery = api->GetParam(handle, ka::kSioRetryCount, &retries);
            queried = true;
            if (lastQuery != 0 || retries == 0) retries = 1;
            if (retries > maxRetries) return KA_ERR_DOWNLOAD_TIMEOUT;
        }
        if (GetTickCountMs() - start > timeoutMs) {
            *ioSize += got;
            return KA_ERR_DOWNLOAD_TIMEOUT;
        }
        if (got < missing / 10) SleepMs(kPollMs);
        *ioSize += got;
        position += got;
        if (position >= target) endedByRead = true;
    }

    if ((endedByRead || endedByStop) && queried && lastQuery == 1) return 1;
    return FlagValue(stopFlag) == 1 ? KA_ERR_DOWNLOAD_FAILED : 0;
}

uint32_t ReadSourceData(SourceIOApi* api, void* handle, uint8_t* dst, uint32_t* ioSize,
                        KA_BOOL* stopFlag, uint64_t maxRetries) {
    return ReadSourceData(api, handle, dst, ioSize, stopFlag, maxRetries, kNoTimeLimit);
}

uint32_t ka_download_by_url(char* url, unsigned char** data, uint32_t* size, char* workPath,
                            KA_BOOL* stopFlag) {
    return ka::DownloadDocument(url, data, size, workPath, stopFlag, nullptr);
}

namespace ka {

uint32_t DownloadDocument(char* url, unsigned char** data, uint32_t* size, char* workPath,
                          KA_BOOL* stopFlag, DocumentFetch* fetch) {
    if (url == nullptr) return KA_ERR_NULL_ARGUMENT;
    if (data == nullptr || size == nullptr) return KA_ERR_NULL_ARGUMENT;

    CLibLoader loader;
    strncpy(loader.mLibName, "kaSourceIO", sizeof(loader.mLibName) - 1);
    strncpy(loader.mEntryName, "kaGetSourceIOAPI", sizeof(loader.mEntryName) - 1);
    loader.SetWorkPath(workPath);
    if (loader.LoadLib(nullptr) == 0 || loader.mEntry == nullptr) return KA_ERR_LOAD_FAILED;

    SourceIOApi api;
    memset(&api, 0, sizeof(api));
    // Called through the entry's own type: the loader keeps it as a generic pointer.
    reinterpret_cast<KaGetSourceIOAPIFn>(loader.mEntry)(&api);
    // The table is the module's: the operations the loop calls unchecked must be there.
    if (api.SetParam == nullptr || api.GetSourceSize == nullptr || api.Read == nullptr ||
        api.GetParam == nullptr || (api.Init != nullptr && api.Uninit == nullptr) ||
        (api.Open != nullptr && api.Close == nullptr)) {
        return KA_ERR_LOAD_FAILED;
    }
    api.SetParam(nullptr, kSioWorkPath, workPath);

    void* handle = nullptr;
    uint64_t sourceSize = 0;
    uint32_t result = OpenSource(&api, url, &handle, nullptr, nullptr);
    if (result == 0) {
        result = PollSourceSize(&api, handle, stopFlag, &sourceSize, StopCheck::kBeforeEachAsk,
                                fetch != nullptr ? fetch->deadline : 0);
    }
    // Nothing of a document over the caller's limit is kept, not even its buffer.
    if (result == 0 && fetch != nullptr && fetch->maxBytes != 0 && sourceSize > fetch->maxBytes) {
        fetch->overLimit = true;
        result = KA_ERR_LOAD_FAILED;
    }
    if (result == 0) {
        uint32_t count = static_cast<uint32_t>(sourceSize);
        uint8_t* buffer = new (std::nothrow) uint8_t[count];
        if (buffer == nullptr) {
            result = KA_ERR_NO_MEMORY;
        } else {
            memset(buffer, 0, count);
            *data = buffer;
            *size = count;
            result = ReadWhole(&api, handle, buffer, size, stopFlag);
        }
    }
    if (result == 0 && fetch != nullptr) {
        // The module answers with the URL reached after redirects; a longer one is not used.
        char reached[kUrlSize] = {};
        SourceFinalUrlQuery query = {url, static_cast<uint32_t>(strlen(url)), reached, kUrlSize};
        const bool known = api.GetParam(handle, kSioFinalUrl, &query) == 0 &&
                           memchr(reached, '\0', kUrlSize) != nullptr;
        memcpy(fetch->finalUrl, known ? reached : "", known ? kUrlSize : 1);
    }
    ReleaseSource(&api, handle);
    return result;
}

}  // namespace ka

uint32_t DownloadToBuffer(SourceIOApi* api, void* request1, void* request2, void* request3,
                          void* request4, DownloadRecord* record, uint8_t** buffer,
                          uint32_t* capacity, uint32_t* bytesRead, KA_BOOL* stopFlag,
                          KA_BOOL useBase, void* outRecord, char* text) {
    void* const requests[] = {request1, request2, request3, request4};
    const HostRequest request = {requests, text, outRecord, stopFlag, useBase};
    const HostBuffer target = {buffer, capacity, bytesRead};
    return HostDownload(api, request, record, &target);
}

uint32_t DownloadWithAllocator(SourceIOApi* api, void* request1, void* request2, void* request3,
                               void* request4, DownloadRecord* record, KA_BOOL* stopFlag,
                               KA_BOOL useBase, void* outRecord, char* text) {
    void* const requests[] = {request1, request2, request3, request4};
    const HostRequest request = {requests, text, outRecord, stopFlag, useBase};
    return HostDownload(api, request, record, nullptr);
}
