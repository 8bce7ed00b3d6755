// The second table's entry. Each slot is filled only when it lies inside the caller's table,
// so a player compiled against an older, shorter table gets no write past its end.
#include <cstddef>

#include "ka/result_codes.h"
#include "ka/vmap_parser_ext.h"
#include "vast/extras_records.h"
#include "vast/vast_parser.h"
#include "vmap/vmap_parser.h"

namespace {

// Lends records and allocates nothing: no exception to guard against.
uint32_t GetChainOutcomes(void* handle, KaChainOutcome** out) {
    if (handle == nullptr) return KA_ERR_NULL_ARGUMENT;
    return static_cast<CVMAPParser*>(handle)->GetChainOutcomes(out);
}

// The extras lookups read the index in the records' arena: no allocation, no exception.
const ka::Arena* HandleArena(void* handle) { return &static_cast<CVMAPParser*>(handle)->Records(); }
const ka::Arena* ParserArena(void* parser) { return static_cast<CVASTParser*>(parser)->mArena; }

template <const ka::Arena* (*ArenaOf)(void*)>
uint32_t AdExtras(void* owner, const AdData* ad, const KaAdExtras** out) {
    if (owner == nullptr || out == nullptr) return KA_ERR_NULL_ARGUMENT;
    const ka::Arena* arena = ArenaOf(owner);
    *out = ad != nullptr && arena != nullptr ? ka::FindAdExtras(*arena, ad->body) : nullptr;
    return KA_OK;
}

template <const ka::Arena* (*ArenaOf)(void*)>
uint32_t CreativeExtras(void* owner, const AdCreative* creative, const KaCreativeExtras** out) {
    if (owner == nullptr || out == nullptr) return KA_ERR_NULL_ARGUMENT;
    const ka::Arena* arena = ArenaOf(owner);
    *out = arena != nullptr ? ka::FindCreativeExtras(*arena, creative) : nullptr;
    return KA_OK;
}

constexpr uint32_t kFirstSlot = offsetof(VMAPParserExtAPI, GetChainOutcomes);

template <typename Slot>
void Fill(VMAPParserExtAPI* api, uint32_t room, Slot VMAPParserExtAPI::*slot, Slot value,
          uint32_t& filled) {
    const uint32_t end = static_cast<uint32_t>(reinterpret_cast<const char*>(&(api->*slot)) -
                                               reinterpret_cast<const char*>(api) + sizeof(Slot));
    if (end > room) return;
    api->*slot = value;
    if (end > filled) filled = end;
}

}  // namespace

uint32_t kaGetVMAPParserExtAPI(VMAPParserExtAPI* api) {
    if (api == nullptr || api->size < kFirstSlot + sizeof(void*)) return KA_ERR_NULL_ARGUMENT;
    const uint32_t room = api->size;
    uint32_t filled = kFirstSlot;
    Fill(api, room, &VMAPParserExtAPI::GetChainOutcomes, &GetChainOutcomes, filled);
    Fill(api, room, &VMAPParserExtAPI::ExpandMacros, &kaExpandVASTMacros, filled);
    Fill(api, room, &VMAPParserExtAPI::GetAdExtras, &AdExtras<HandleArena>, filled);
    Fill(api, room, &VMAPParserExtAPI::GetCreativeExtras, &CreativeExtras<HandleArena>, filled);
    Fill(api, room, &VMAPParserExtAPI::GetNestedAdExtras, &AdExtras<ParserArena>, filled);
    Fill(api, room, &VMAPParserExtAPI::GetNestedCreativeExtras, &CreativeExtras<ParserArena>,
         filled);
    api->size = filled;
    return KA_OK;
}
