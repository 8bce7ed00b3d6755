// ka::Arena: where a handle's records and strings live. Everything one Process builds goes into
// the handle's arena and is given back at once when the next Process, Reset or Close releases
// the records; nothing is freed record by record. The memory comes in chunks that the next
// Process reuses, so a handle that reads documents of similar size allocates nothing for its
// records after the first one.
//
// Records are plain C structures: New<T>() gives a zero-filled one and nothing is ever
// destroyed. Objects with destructors (nested parsers, extension objects) stay on the heap.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>

#include "platform/limits.h"

namespace ka {

class Arena {
public:
    Arena() = default;
    // Frees every chunk: whatever still points into the arena dies with it.
    ~Arena();
    Arena(const Arena&) = delete;
    Arena& operator=(const Arena&) = delete;

    // A zero-filled T; throws std::bad_alloc when memory runs out.
    template <typename T>
    T* New() {
        static_assert(std::is_trivially_destructible<T>::value,
                      "arena objects are never destroyed");
        static_assert(alignof(T) <= kAlignment, "arena objects need at most kAlignment");
        void* p = Allocate(sizeof(T), alignof(T));
        memset(p, 0, sizeof(T));
        return static_cast<T*>(p);
    }

    // A copy of the first length characters of text, terminated; throws std::bad_alloc.
    char* CopyText(const char* text, size_t length) {
        char* copy = AllocateText(length);
        CopyBytes(copy, text, length);
        copy[length] = '\0';
        return copy;
    }
    // A copy of a terminated string; null for null.
    char* CopyString(const char* text) {
        return text == nullptr ? nullptr : CopyText(text, strlen(text));
    }
    // Room for a string of up to length characters and its terminator, unaligned.
    char* AllocateText(size_t length) { return static_cast<char*>(Allocate(length + 1, 1)); }

    // size bytes (at least 1) aligned to align, a power of two up to kAlignment; throws
    // std::bad_alloc.
    void* Allocate(size_t size, size_t align) {
        const size_t pad = (0 - reinterpret_cast<uintptr_t>(mCursor)) & (align - 1);
        if (mCursor != nullptr && pad <= static_cast<size_t>(mEnd - mCursor) &&
            size <= static_cast<size_t>(mEnd - mCursor) - pad) {
            char* at = mCursor + pad;
            mCursor = at + size;
            return at;
        }
        return AllocateSlow(size, align);
    }

    // Forgets every allocation. The chunks stay for the next ones, up to kKeptBytes of them;
    // the rest and every block of its own are freed. Allocates nothing.
    void Reset();

    // Bytes of the chunks and own blocks held now, headers left out.
    size_t HeldBytes() const;

    // The side records keyed by record pointers (vast/extras_records.h), kept in this arena;
    // Reset forgets them with everything else.
    void* sideIndex = nullptr;

    // The largest alignment handed out: that of every record.
    static constexpr size_t kAlignment = 16;
    // Chunk sizes and what Reset keeps: platform/limits.h.
    static constexpr size_t kFirstChunk = kArenaFirstChunk;
    static constexpr size_t kMaxChunk = kArenaMaxChunk;
    static constexpr size_t kOwnBlockBytes = kArenaOwnBlockBytes;
    static constexpr size_t kKeptBytes = kArenaKeptBytes;

private:
    // memcpy for the short names and values most copies are, without a call: two overlapping
    // words cover 4 to 16 bytes.
    static void CopyBytes(char* to, const char* from, size_t length) {
        if (length > 16) {
            memcpy(to, from, length);
        } else if (length >= 8) {
            CopyEnds<uint64_t>(to, from, length);
        } else if (length >= 4) {
            CopyEnds<uint32_t>(to, from, length);
        } else {
            for (size_t i = 0; i < length; ++i) to[i] = from[i];
        }
    }
    // The first and the last Word of length bytes (at least one Word), overlapping.
    template <typename Word>
    static void CopyEnds(char* to, const char* from, size_t length) {
        Word head, tail;
        memcpy(&head, from, sizeof(Word));
        memcpy(&tail, from + length - sizeof(Word), sizeof(Word));
        memcpy(to, &head, sizeof(Word));
        memcpy(to + length - sizeof(Word), &tail, sizeof(Word));
    }

    // The header of a chunk or own block; its memory follows, aligned to kAlignment.
    struct alignas(kAlignment) Block {
        Block* next;
        size_t size;  // bytes after the header
        char* Data() { return reinterpret_cast<char*>(this + 1); }
    };

    // A request the chunk being filled cannot hold: a block of its own, or the next chunk.
    void* AllocateSlow(size_t size, size_t align);
    static Block* NewBlock(size_t size);
    static void FreeList(Block* list);

    Block* mChunks = nullptr;     // every chunk, in the order they are filled
    Block* mLastChunk = nullptr;  // the end of that list, where a new chunk goes
    Block* mCurrent = nullptr;    // the chunk being filled; those after it are empty
    Block* mOwn = nullptr;        // blocks of one request each
    char* mCursor = nullptr;      // the next free byte of mCurrent
    char* mEnd = nullptr;         // the end of mCurrent
    size_t mChunkBytes = 0;       // of all chunks together, headers left out
};

}  // namespace ka
