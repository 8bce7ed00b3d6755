#include "platform/arena.h"

#include <cstdint>
#include <new>

namespace ka {

// Chunks come from operator new, whose blocks are aligned for every record.
static_assert(__STDCPP_DEFAULT_NEW_ALIGNMENT__ >= Arena::kAlignment, "blocks are aligned");

Arena::~Arena() {
    FreeList(mChunks);
    FreeList(mOwn);
}

Arena::Block* Arena::NewBlock(size_t size) {
    if (size > SIZE_MAX - sizeof(Block)) throw std::bad_alloc();
    // operator new, like every allocation of the library: a failure throws std::bad_alloc.
    Block* block = static_cast<Block*>(::operator new(sizeof(Block) + size));
    block->next = nullptr;
    block->size = size;
    return block;
}

void Arena::FreeList(Block* list) {
    while (list != nullptr) {
        Block* next = list->next;
        ::operator delete(list);
        list = next;
    }
}

void* Arena::AllocateSlow(size_t size, size_t align) {
    if (size == 0) size = 1;
    if (size > kOwnBlockBytes) {
        Block* block = NewBlock(size);
        block->next = mOwn;
        mOwn = block;
        return block->Data();
    }
    // The chunks after the current one are empty; one too small for this request stays unused
    // until the next Reset.
    Block* next = mCurrent != nullptr ? mCurrent->next : mChunks;
    while (next != nullptr && next->size < size) next = next->next;
    if (next == nullptr) {
        // Each new chunk doubles what there is, so a large set of records takes few chunks.
        size_t chunk = mChunkBytes < kFirstChunk ? kFirstChunk : mChunkBytes;
        if (chunk > kMaxChunk) chunk = kMaxChunk;
        if (chunk < size) chunk = size;
        next = NewBlock(chunk);
        if (mLastChunk != nullptr) {
            mLastChunk->next = next;
        } else {
            mChunks = next;
        }
        mLastChunk = next;
        mChunkBytes += chunk;
    }
    mCurrent = next;
    mEnd = next->Data() + next->size;
    // A chunk's start is aligned for any request.
    (void)align;
    char* at = next->Data();
    mCursor = at + size;
    return at;
}

void Arena::Reset() {
    sideIndex = nullptr;
    FreeList(mOwn);
    mOwn = nullptr;
    // The first chunks stay, up to kKeptBytes; a Process that needed more builds the rest anew.
    size_t kept = 0;
    Block* last = nullptr;
    Block* block = mChunks;
    while (block != nullptr && kept + block->size <= kKeptBytes) {
        kept += block->size;
        last = block;
        block = block->next;
    }
    FreeList(block);
    if (last != nullptr) {
        last->next = nullptr;
    } else {
        mChunks = nullptr;
    }
    mLastChunk = last;
    mChunkBytes = kept;
    mCurrent = nullptr;
    mCursor = nullptr;
    mEnd = nullptr;
}

size_t Arena::HeldBytes() const {
    size_t own = 0;
    for (const Block* block = mOwn; block != nullptr; block = block->next) own += block->size;
    return mChunkBytes + own;
}

}  // namespace ka
