/* Downloads into memory through the platform's source-IO module (entry "kaGetSourceIOAPI"). The
 * host obtains the module's table itself and hands it to DownloadToBuffer or
 * DownloadWithAllocator; each call opens, reads and closes its own source handle on the
 * caller's thread. */
#ifndef KA_DOWNLOAD_H
#define KA_DOWNLOAD_H

#include <stdint.h>

#include "ka/export.h"
#include "ka/types.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Size of every URL field of DownloadRecord. */
#define KA_DOWNLOAD_URL_SIZE 2048
/* Largest source the host operations accept, in bytes. */
#define KA_DOWNLOAD_MAX_SIZE 0x800000u

/* The source-IO module's table of operations, thirteen slots, zero-filled by the caller before
 * the entry function fills it. Handles are opaque; every operation returns 0 on success. */
typedef struct SourceIOApi {
    /* Unused. */
    uint32_t (*Reserved0)(void* handle);
    /* Creates a handle for url into *handle; flags is 1 and init null in every call made here. */
    uint32_t (*Init)(void** handle, char* url, uint32_t flags, void* init);
    /* Destroys the handle and everything it holds. */
    uint32_t (*Uninit)(void* handle);
    /* Starts the transfer without blocking; mode is 1. */
    uint32_t (*Open)(void* handle, uint32_t mode);
    /* Stops the transfer; the handle stays until Uninit. */
    uint32_t (*Close)(void* handle);
    /* Copies up to wanted bytes into dst and their count into *got. 0: data; 1: the source
     * ended, these are its last bytes; 2: nothing yet, try again; else failure. */
    uint32_t (*Read)(void* handle, uint8_t* dst, uint32_t wanted, uint32_t* got);
    /* Unused. */
    uint32_t (*Reserved6)(void* handle);
    uint32_t (*Reserved7)(void* handle);
    uint32_t (*Reserved8)(void* handle);
    /* Total size in bytes into *size: 0 once known; 0x91127000 when the transfer failed; any
     * other code means not known yet, ask again. */
    uint32_t (*GetSourceSize)(void* handle, uint64_t* size);
    /* Unused. */
    uint32_t (*Reserved10)(void* handle);
    /* Reads a parameter of the handle (or of the module, for a null handle) into value. */
    uint32_t (*GetParam)(void* handle, uint32_t id, void* value);
    /* Sets a parameter of the handle, or a module-wide one for a null handle. */
    uint32_t (*SetParam)(void* handle, uint32_t id, void* value);
} SourceIOApi;

/* The module's entry function. */
typedef int (*KaGetSourceIOAPIFn)(SourceIOApi* api);

struct DownloadRecord;

/* Supplies the buffer of DownloadWithAllocator. */
typedef struct BufferAllocator {
    void* context; /* passed back to Allocate unchanged */
    /* Stores a buffer of at least size bytes into *buffer; the host owns and frees it. */
    void (*Allocate)(void* context, uint8_t** buffer, uint32_t size);
} BufferAllocator;

/* One download of the host operations. */
typedef struct DownloadRecord {
    char baseURL[KA_DOWNLOAD_URL_SIZE];  /* the document that named url */
    char url[KA_DOWNLOAD_URL_SIZE];      /* the URL to fetch, possibly relative to baseURL */
    char finalURL[KA_DOWNLOAD_URL_SIZE]; /* out: the URL reached after redirects */
    uint8_t* buffer;                     /* out: the data; owned by the host */
    uint32_t size;                       /* out: bytes read */
    uint32_t capacity;                   /* out: bytes in buffer (three times the source size) */
    BufferAllocator* allocator;          /* DownloadWithAllocator only; null otherwise */
} DownloadRecord;

/* Downloads record->url (joined to record->baseURL with CombineURL when useBase is non-zero)
 * into the caller's reusable *buffer of *capacity bytes, grown with array new / array delete
 * to three times the source size when too small; *bytesRead receives the count. The four
 * request records, outRecord and text are handed to the module when non-null. stopFlag (may be
 * null) ends waiting when set by another thread. 0 on success, or a result code. */
KA_API uint32_t DownloadToBuffer(SourceIOApi* api, void* request1, void* request2, void* request3,
                                 void* request4, struct DownloadRecord* record, uint8_t** buffer,
                                 uint32_t* capacity, uint32_t* bytesRead, KA_BOOL* stopFlag,
                                 KA_BOOL useBase, void* outRecord, char* text);

/* As DownloadToBuffer, but the buffer comes from record->allocator and the count goes to
 * record->size. */
KA_API uint32_t DownloadWithAllocator(SourceIOApi* api, void* request1, void* request2,
                                      void* request3, void* request4, struct DownloadRecord* record,
                                      KA_BOOL* stopFlag, KA_BOOL useBase, void* outRecord,
                                      char* text);

#ifdef __cplusplus
}
#endif

#endif /* KA_DOWNLOAD_H */
