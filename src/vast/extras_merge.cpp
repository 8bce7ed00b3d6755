// The wrapper merge of the extras: a wrapper's verifications, viewability pings, and the
// tracking of its companion and non-linear creatives are appended to those of the InLine it
// leads to. Merges run innermost first, as for the linear tracking, so each list ends with the
// InLine's own entries, then its nearest wrapper's, then each outer one's. Every copy is
// charged to the Process's merge budget; past it a list is copied only in part.
#include "ka/vast_extras.h"
#include "vast/extras_records.h"
#include "vast/vast_parser.h"
#include "xml/text.h"

namespace {

bool HasAdExtrasToCopy(const KaAdExtras* e) {
    return e != nullptr && (e->viewable != nullptr || e->notViewable != nullptr ||
                            e->viewUndetermined != nullptr || e->verifications != nullptr);
}

}  // namespace

void CVASTParser::CopyUrlList(const KaUrl* list, ka::Tail<KaUrl>& end) {
    for (; list != nullptr; list = list->next) {
        if (!TakeCopy(sizeof(KaUrl) + ka::CopySize(list->id), list->url)) break;
        KaUrl* copy = mArena->New<KaUrl>();
        end.Add(copy);
        copy->id = mArena->CopyString(list->id);
        copy->url = mArena->CopyString(list->url);
    }
}

void CVASTParser::CopyVerifications(const KaVerification* list, ka::Tail<KaVerification>& end) {
    for (; list != nullptr; list = list->next) {
        if (!TakeCopy(sizeof(KaVerification) + ka::CopySize(list->vendor),
                      list->verificationParameters))
            break;
        KaVerification* copy = mArena->New<KaVerification>();
        end.Add(copy);
        copy->vendor = mArena->CopyString(list->vendor);
        copy->verificationParameters = mArena->CopyString(list->verificationParameters);
        const KaVerificationResource* const sources[2] = {list->javaScriptResources,
                                                          list->executableResources};
        KaVerificationResource** const targets[2] = {&copy->javaScriptResources,
                                                     &copy->executableResources};
        for (int kind = 0; kind < 2; ++kind) {
            ka::Tail<KaVerificationResource> resources;
            resources.Start(targets[kind]);
            for (const KaVerificationResource* r = sources[kind]; r != nullptr; r = r->next) {
                if (!TakeCopy(sizeof(*r) + ka::CopySize(r->apiFramework) + ka::CopySize(r->type),
                              r->url))
                    break;
                KaVerificationResource* c = mArena->New<KaVerificationResource>();
                resources.Add(c);
                c->apiFramework = mArena->CopyString(r->apiFramework);
                c->browserOptional = r->browserOptional;
                c->type = mArena->CopyString(r->type);
                c->url = mArena->CopyString(r->url);
            }
        }
        ka::ListEnd<AdTracking> events = ka::FindEnd(&copy->trackingEvents);
        CopyTrackingList(list->trackingEvents, events, copy->trackingCount);
    }
}

void CVASTParser::MergeExtras(const AdWrapper* wrapper, const AdInLine* inLine) {
    if (wrapper == nullptr || inLine == nullptr || mArena->sideIndex == nullptr) return;
    const KaAdExtras* from = ka::FindAdExtras(*mArena, wrapper);
    if (HasAdExtrasToCopy(from)) {
        KaAdExtras* to = ka::AdExtrasFor(*mArena, inLine);
        ka::Tail<KaUrl> end;
        end.Start(&to->viewable);
        CopyUrlList(from->viewable, end);
        end.Start(&to->notViewable);
        CopyUrlList(from->notViewable, end);
        end.Start(&to->viewUndetermined);
        CopyUrlList(from->viewUndetermined, end);
        ka::Tail<KaVerification> verifications;
        verifications.Start(&to->verifications);
        CopyVerifications(from->verifications, verifications);
    }

    for (const AdCreative* w = wrapper->creatives; w != nullptr; w = w->next) {
        const KaCreativeExtras* source = ka::FindCreativeExtras(*mArena, w);
        if (source == nullptr) continue;
        for (const AdCreative* c = inLine->creatives; c != nullptr; c = c->next) {
            // Only creatives that have such content receive their tracking.
            KaCreativeExtras* target =
                const_cast<KaCreativeExtras*>(ka::FindCreativeExtras(*mArena, c));
            if (target == nullptr) continue;
            if (source->companionAds != nullptr && target->companionAds != nullptr) {
                for (KaCompanion* to = target->companionAds->companions; to != nullptr;
                     to = to->next) {
                    ka::ListEnd<AdTracking> events = ka::FindEnd(&to->trackingEvents);
                    ka::Tail<KaUrl> clicks;
                    clicks.Start(&to->clickTrackings);
                    for (const KaCompanion* f = source->companionAds->companions; f != nullptr;
                         f = f->next) {
                        CopyTrackingList(f->trackingEvents, events, to->trackingCount);
                        CopyUrlList(f->clickTrackings, clicks);
                    }
                }
            }
            if (source->nonLinearAds != nullptr && target->nonLinearAds != nullptr) {
                KaNonLinearAds* to = target->nonLinearAds;
                ka::ListEnd<AdTracking> events = ka::FindEnd(&to->trackingEvents);
                CopyTrackingList(source->nonLinearAds->trackingEvents, events, to->trackingCount);
                for (KaNonLinear* n = to->nonLinears; n != nullptr; n = n->next) {
                    ka::Tail<KaUrl> clicks;
                    clicks.Start(&n->clickTrackings);
                    for (const KaNonLinear* f = source->nonLinearAds->nonLinears; f != nullptr;
                         f = f->next) {
                        CopyUrlList(f->clickTrackings, clicks);
                    }
                }
            }
        }
    }
}
