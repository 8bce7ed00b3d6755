// The index of extras records: newest first, so the record being read is found at once.
#include "vast/extras_records.h"

namespace ka {

namespace {

struct Entry {
    const void* key;
    void* record;
    Entry* next;
};

void* Find(const Arena& arena, const void* key) {
    if (key == nullptr) return nullptr;
    for (const Entry* e = static_cast<const Entry*>(arena.sideIndex); e != nullptr; e = e->next) {
        if (e->key == key) return e->record;
    }
    return nullptr;
}

void Index(Arena& arena, const void* key, void* record) {
    Entry* entry = arena.New<Entry>();
    entry->key = key;
    entry->record = record;
    entry->next = static_cast<Entry*>(arena.sideIndex);
    arena.sideIndex = entry;
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
    Index(arena, body, extras);
    return extras;
}

KaCreativeExtras* CreativeExtrasFor(Arena& arena, const AdCreative* creative) {
    if (void* found = Find(arena, creative)) return static_cast<KaCreativeExtras*>(found);
    KaCreativeExtras* extras = arena.New<KaCreativeExtras>();
    Index(arena, creative, extras);
    return extras;
}

}  // namespace ka
