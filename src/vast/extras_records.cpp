// The index of extras records: an open-addressing table of (key, record) in the arena, doubled
// when half full (the old table stays behind in the arena until its Reset), so that making and
// finding extras costs the same however many records a Process builds.
#include "vast/extras_records.h"

#include <cstdint>

namespace ka {

namespace {

struct Slot {
    const void* key;
    void* record;
};

struct Index {
    Slot* slots;
    size_t capacity;  // a power of two
    size_t count;
};

constexpr size_t kFirstCapacity = 64;

size_t Hash(const void* key, size_t capacity) {
    // Records are at least 8-byte aligned: the low bits say nothing.
    const uint64_t bits = static_cast<uint64_t>(reinterpret_cast<uintptr_t>(key)) >> 3;
    return static_cast<size_t>((bits * 0x9E3779B97F4A7C15ull) >> 17) & (capacity - 1);
}

Slot* NewSlots(Arena& arena, size_t capacity) {
    void* memory = arena.Allocate(capacity * sizeof(Slot), alignof(Slot));
    memset(memory, 0, capacity * sizeof(Slot));
    return static_cast<Slot*>(memory);
}

void* Find(const Arena& arena, const void* key) {
    const Index* index = static_cast<const Index*>(arena.sideIndex);
    if (key == nullptr || index == nullptr) return nullptr;
    for (size_t i = Hash(key, index->capacity);; i = (i + 1) & (index->capacity - 1)) {
        const Slot& slot = index->slots[i];
        if (slot.key == key) return slot.record;
        if (slot.key == nullptr) return nullptr;
    }
}

void Put(Slot* slots, size_t capacity, const void* key, void* record) {
    size_t i = Hash(key, capacity);
    while (slots[i].key != nullptr) i = (i + 1) & (capacity - 1);
    slots[i] = {key, record};
}

void Add(Arena& arena, const void* key, void* record) {
    Index* index = static_cast<Index*>(arena.sideIndex);
    if (index == nullptr) {
        index = arena.New<Index>();
        index->slots = NewSlots(arena, kFirstCapacity);
        index->capacity = kFirstCapacity;
        arena.sideIndex = index;
    }
    if ((index->count + 1) * 2 > index->capacity) {
        const size_t capacity = index->capacity * 2;
        Slot* slots = NewSlots(arena, capacity);
        for (size_t i = 0; i < index->capacity; ++i) {
            if (index->slots[i].key != nullptr) {
                Put(slots, capacity, index->slots[i].key, index->slots[i].record);
            }
        }
        index->slots = slots;
        index->capacity = capacity;
    }
    Put(index->slots, index->capacity, key, record);
    ++index->count;
}

}  // namespace

const KaAdExtras* FindAdExtras(const Arena& arena, const void* body) {
    return static_cast<const KaAdExtras*>(Find(arena, body));
}

const KaCreativeExtras* FindCreativeExtras(const Arena& arena, const AdCreative* creative) {
    return static_cast<const KaCreativeExtras*>(Find(arena, creative));
}

KaAdExtras* AdExtrasFor(Arena& arena, const void* body) {
    if (void* found = Find(arena, body)) return static_cast<KaAdExtras*>(found);
    KaAdExtras* extras = arena.New<KaAdExtras>();
    extras->followAdditionalWrappers = KA_FLAG_ABSENT;
    extras->allowMultipleAds = KA_FLAG_ABSENT;
    extras->fallbackOnNoAd = KA_FLAG_ABSENT;
    Add(arena, body, extras);
    return extras;
}

KaCreativeExtras* CreativeExtrasFor(Arena& arena, const AdCreative* creative) {
    if (void* found = Find(arena, creative)) return static_cast<KaCreativeExtras*>(found);
    KaCreativeExtras* extras = arena.New<KaCreativeExtras>();
    Add(arena, creative, extras);
    return extras;
}

}  // namespace ka
