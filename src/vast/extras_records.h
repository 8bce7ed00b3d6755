// The records of ka/vast_extras.h beside the records of ka/vast_records.h: an index in the
// handle's arena maps an ad's body (AdInLine* or AdWrapper*) or an AdCreative* to its extras.
// Bodies are the keys because the wrapper merge moves the InLine's body into the wrapper's
// AdData node: the extras follow the body. Arena memory is never reused before a Reset, which
// forgets the index too, so a released record's key can never stand for another record.
#pragma once

#include "ka/vast_extras.h"
#include "platform/arena.h"
#include "xml/record_lists.h"

namespace ka {

// The extras of a body or creative; null when it has none (or key is null).
const KaAdExtras* FindAdExtras(const Arena& arena, const void* body);
const KaCreativeExtras* FindCreativeExtras(const Arena& arena, const AdCreative* creative);
// The extras of key, created (zero-filled, flags absent) and indexed when it has none.
KaAdExtras* AdExtrasFor(Arena& arena, const void* body);
KaCreativeExtras* CreativeExtrasFor(Arena& arena, const AdCreative* creative);

// One ad and one creative being read: their extras (made on first need) and list ends.
struct AdExtrasBuild {
    const void* body = nullptr;
    KaAdExtras* extras = nullptr;
    Tail<KaCategory> categories, blocked;
    Tail<KaUrl> viewable, notViewable, undetermined;
    Tail<KaVerification> verifications;
};
struct CreativeExtrasBuild {
    const AdCreative* creative = nullptr;
    KaCreativeExtras* extras = nullptr;
    Tail<KaUniversalAdId> ids;
    Tail<KaIcon> icons;
    Tail<KaMediaAsset> mezzanines, interactive, captions;
    Tail<KaMediaFileExtras> mediaFiles;
    Tail<KaNonLinear> nonLinears;
    Tail<KaCompanion> companions;
};

}  // namespace ka
