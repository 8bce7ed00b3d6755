/* Offsets and widths on LP64 of every public record and of the API table, and the values of the
 * public constants, shared by the C and the C++ side of the layout test. */
#ifndef KA_TEST_LAYOUT_FIELDS_H
#define KA_TEST_LAYOUT_FIELDS_H

/* clang-format off */
/* X(record, field, offset, size) */
#define KA_LAYOUT_FIELDS(X) \
    X(VastAdData, adCount, 0, 4) X(VastAdData, firstAd, 8, 8) X(VastAdData, errorUrl, 16, 8) \
    X(VastAdData, depth, 24, 4) \
    X(AdData, id, 0, 8) X(AdData, sequence, 8, 4) X(AdData, type, 12, 4) X(AdData, body, 16, 8) \
    X(AdData, next, 24, 8) \
    X(AdInLine, adSystem, 0, 8) X(AdInLine, adTitle, 8, 8) X(AdInLine, impressionCount, 16, 4) \
    X(AdInLine, impressions, 24, 8) X(AdInLine, description, 32, 8) \
    X(AdInLine, advertiser, 40, 8) X(AdInLine, survey, 48, 8) X(AdInLine, error, 56, 8) \
    X(AdInLine, extensions, 64, 8) X(AdInLine, creativeCount, 72, 4) \
    X(AdInLine, creatives, 80, 8) \
    X(AdWrapper, adSystem, 0, 8) X(AdWrapper, vastAdTagUri, 8, 8) X(AdWrapper, error, 16, 8) \
    X(AdWrapper, impressions, 24, 8) X(AdWrapper, creatives, 32, 8) \
    X(AdWrapper, extensions, 40, 8) X(AdWrapper, nestedParser, 48, 8) \
    X(AdImpression, url, 0, 8) X(AdImpression, next, 8, 8) \
    X(AdCreative, id, 0, 8) X(AdCreative, sequence, 8, 4) X(AdCreative, adId, 16, 8) \
    X(AdCreative, kind, 24, 4) X(AdCreative, content, 32, 96) X(AdCreative, next, 128, 8) \
    X(AdLinear, duration, 0, 8) X(AdLinear, skipOffset, 8, 8) \
    X(AdLinear, mediaFileCount, 16, 4) X(AdLinear, mediaFiles, 24, 8) \
    X(AdLinear, videoClicksCount, 32, 4) X(AdLinear, videoClicks, 40, 8) \
    X(AdLinear, adParametersCount, 48, 4) X(AdLinear, adParameters, 56, 8) \
    X(AdLinear, trackingCount, 64, 4) X(AdLinear, trackingEvents, 72, 8) \
    X(AdLinear, iconCount, 80, 4) X(AdLinear, icons, 88, 8) \
    X(AdVideoClicks, clickThroughCount, 0, 4) X(AdVideoClicks, clickThroughs, 8, 8) \
    X(AdVideoClicks, clickTrackingCount, 16, 4) X(AdVideoClicks, clickTrackings, 24, 8) \
    X(AdVideoClicks, customClickCount, 32, 4) X(AdVideoClicks, customClicks, 40, 8) \
    X(AdVideoClicks, next, 48, 8) \
    X(AdClick, id, 0, 8) X(AdClick, url, 8, 8) X(AdClick, next, 16, 8) \
    X(AdMediaFile, delivery, 0, 4) X(AdMediaFile, type, 8, 8) X(AdMediaFile, width, 16, 4) \
    X(AdMediaFile, height, 20, 4) X(AdMediaFile, codec, 24, 8) X(AdMediaFile, id, 32, 4) \
    X(AdMediaFile, bitrate, 36, 4) X(AdMediaFile, minBitrate, 40, 4) \
    X(AdMediaFile, maxBitrate, 44, 4) X(AdMediaFile, scalable, 48, 4) \
    X(AdMediaFile, maintainAspectRatio, 52, 4) X(AdMediaFile, url, 56, 8) \
    X(AdMediaFile, next, 64, 8) \
    X(AdTracking, event, 0, 8) X(AdTracking, offsetKind, 8, 4) X(AdTracking, offset, 16, 8) \
    X(AdTracking, url, 24, 8) X(AdTracking, next, 32, 8) \
    X(AdParameters, next, 0, 8) X(AdIcon, next, 0, 8) \
    X(AdInfo, adBreakCount, 0, 4) X(AdInfo, adBreaks, 8, 8) \
    X(AdBreak, timeOffsetType, 0, 4) X(AdBreak, timeOffset, 8, 8) \
    X(AdBreak, linearDuration, 16, 8) X(AdBreak, breakType, 24, 4) X(AdBreak, breakId, 32, 8) \
    X(AdBreak, repeatAfter, 40, 8) X(AdBreak, adSource, 48, 8) X(AdBreak, trackings, 56, 8) \
    X(AdBreak, next, 64, 8) \
    X(AdSource, id, 0, 4) X(AdSource, allowMultipleAds, 4, 4) \
    X(AdSource, followRedirects, 8, 4) X(AdSource, adTagUri, 16, 8) \
    X(AdSource, reservedText, 24, 8) X(AdSource, vastAdData, 32, 8) \
    X(AdBreakTracking, event, 0, 8) X(AdBreakTracking, url, 8, 8) \
    X(AdBreakTracking, next, 16, 8) \
    X(VMAPParserAPI, Open, 0, 8) X(VMAPParserAPI, Close, 8, 8) X(VMAPParserAPI, Process, 16, 8) \
    X(VMAPParserAPI, GetAdInfo, 24, 8) X(VMAPParserAPI, GetVastAdData, 32, 8) \
    X(VMAPParserAPI, GetVastParserVastAdData, 40, 8) X(VMAPParserAPI, SetParam, 48, 8) \
    X(VMAPParserAPI, GetParam, 56, 8) \
    X(KaMacroValues, size, 0, 4) X(KaMacroValues, errorCode, 4, 4) \
    X(KaMacroValues, timestampMs, 8, 8) X(KaMacroValues, utcOffsetMinutes, 16, 4) \
    X(KaMacroValues, breakPosition, 20, 4) X(KaMacroValues, mediaPlayheadMs, 24, 8) \
    X(KaMacroValues, adPlayheadMs, 32, 8) X(KaMacroValues, adCount, 40, 4) \
    X(KaMacroValues, podSequence, 44, 4) X(KaMacroValues, breakMaxDuration, 48, 4) \
    X(KaMacroValues, breakMinDuration, 52, 4) X(KaMacroValues, breakMaxAdLength, 56, 4) \
    X(KaMacroValues, breakMinAdLength, 60, 4) X(KaMacroValues, breakMaxAds, 64, 4) \
    X(KaMacroValues, reason, 68, 4) X(KaMacroValues, limitAdTracking, 72, 4) \
    X(KaMacroValues, serverSide, 76, 4) X(KaMacroValues, placementType, 80, 4) \
    X(KaMacroValues, clickType, 84, 4) X(KaMacroValues, playerWidth, 88, 4) \
    X(KaMacroValues, playerHeight, 92, 4) X(KaMacroValues, clickX, 96, 4) \
    X(KaMacroValues, clickY, 100, 4) X(KaMacroValues, assetUri, 104, 8) \
    X(KaMacroValues, contentId, 112, 8) X(KaMacroValues, contentUri, 120, 8) \
    X(KaMacroValues, ifa, 128, 8) X(KaMacroValues, ifaType, 136, 8) \
    X(KaMacroValues, clientUa, 144, 8) X(KaMacroValues, serverUa, 152, 8) \
    X(KaMacroValues, deviceUa, 160, 8) X(KaMacroValues, deviceIp, 168, 8) \
    X(KaMacroValues, latLong, 176, 8) X(KaMacroValues, domain, 184, 8) \
    X(KaMacroValues, pageUrl, 192, 8) X(KaMacroValues, appBundle, 200, 8) \
    X(KaMacroValues, storeId, 208, 8) X(KaMacroValues, storeUrl, 216, 8) \
    X(KaMacroValues, inventoryState, 224, 8) X(KaMacroValues, playerState, 232, 8) \
    X(KaMacroValues, playerCapabilities, 240, 8) X(KaMacroValues, regulations, 248, 8) \
    X(KaMacroValues, gdprConsent, 256, 8) X(KaMacroValues, transactionId, 264, 8) \
    X(KaMacroValues, universalAdId, 272, 8) X(KaMacroValues, adServingId, 280, 8) \
    X(KaMacroValues, adType, 288, 8) X(KaMacroValues, adCategories, 296, 8) \
    X(KaMacroValues, blockedAdCategories, 304, 8) X(KaMacroValues, apiFrameworks, 312, 8) \
    X(KaMacroValues, extensions, 320, 8) X(KaMacroValues, mediaMime, 328, 8) \
    X(KaMacroValues, vastVersions, 336, 8) X(KaMacroValues, verificationVendors, 344, 8) \
    X(KaMacroValues, omidPartner, 352, 8) \
    X(KaChainHop, url, 0, 8) X(KaChainHop, finalUrl, 8, 8) X(KaChainHop, depth, 16, 4) \
    X(KaChainHop, result, 20, 4) X(KaChainHop, bytes, 24, 8) X(KaChainHop, milliseconds, 32, 4) \
    X(KaChainHop, onPath, 36, 4) \
    X(KaChainOutcome, ad, 0, 8) X(KaChainOutcome, state, 8, 4) X(KaChainOutcome, vastError, 12, 4) \
    X(KaChainOutcome, reason, 16, 4) X(KaChainOutcome, hopCount, 20, 4) \
    X(KaChainOutcome, hops, 24, 8) X(KaChainOutcome, errorUrlCount, 32, 4) \
    X(KaChainOutcome, errorUrls, 40, 8) X(KaChainOutcome, next, 48, 8) \
    X(VMAPParserExtAPI, size, 0, 4) X(VMAPParserExtAPI, GetChainOutcomes, 8, 8) \
    X(VMAPParserExtAPI, ExpandMacros, 16, 8) \
    X(KaUrl, id, 0, 8) X(KaUrl, url, 8, 8) X(KaUrl, next, 16, 8) X(KaResource, kind, 0, 4) \
    X(KaResource, creativeType, 8, 8) X(KaResource, content, 16, 8) X(KaResource, next, 24, 8) \
    X(KaCategory, authority, 0, 8) X(KaCategory, code, 8, 8) X(KaCategory, next, 16, 8) \
    X(KaPricing, model, 0, 8) X(KaPricing, currency, 8, 8) X(KaPricing, value, 16, 8) \
    X(KaVerificationResource, apiFramework, 0, 8) \
    X(KaVerificationResource, browserOptional, 8, 4) X(KaVerificationResource, type, 16, 8) \
    X(KaVerificationResource, url, 24, 8) X(KaVerificationResource, next, 32, 8) \
    X(KaVerification, vendor, 0, 8) X(KaVerification, javaScriptResources, 8, 8) \
    X(KaVerification, executableResources, 16, 8) \
    X(KaVerification, verificationParameters, 24, 8) X(KaVerification, trackingCount, 32, 4) \
    X(KaVerification, trackingEvents, 40, 8) X(KaVerification, next, 48, 8) \
    X(KaAdExtras, adType, 0, 8) X(KaAdExtras, adServingId, 8, 8) \
    X(KaAdExtras, categories, 16, 8) X(KaAdExtras, blockedAdCategories, 24, 8) \
    X(KaAdExtras, pricing, 32, 8) X(KaAdExtras, expires, 40, 4) X(KaAdExtras, viewable, 48, 8) \
    X(KaAdExtras, notViewable, 56, 8) X(KaAdExtras, viewUndetermined, 64, 8) \
    X(KaAdExtras, verifications, 72, 8) X(KaAdExtras, followAdditionalWrappers, 80, 4) \
    X(KaAdExtras, allowMultipleAds, 84, 4) X(KaAdExtras, fallbackOnNoAd, 88, 4) \
    X(KaUniversalAdId, idRegistry, 0, 8) X(KaUniversalAdId, idValue, 8, 8) \
    X(KaUniversalAdId, value, 16, 8) X(KaUniversalAdId, next, 24, 8) \
    X(KaFallbackImage, width, 0, 4) X(KaFallbackImage, height, 4, 4) \
    X(KaFallbackImage, altText, 8, 8) X(KaFallbackImage, creativeType, 16, 8) \
    X(KaFallbackImage, url, 24, 8) X(KaFallbackImage, next, 32, 8) X(KaIcon, program, 0, 8) \
    X(KaIcon, width, 8, 4) X(KaIcon, height, 12, 4) X(KaIcon, xPosition, 16, 8) \
    X(KaIcon, yPosition, 24, 8) X(KaIcon, duration, 32, 8) X(KaIcon, offset, 40, 8) \
    X(KaIcon, apiFramework, 48, 8) X(KaIcon, pxratio, 56, 8) X(KaIcon, resources, 64, 8) \
    X(KaIcon, clickThrough, 72, 8) X(KaIcon, clickTrackings, 80, 8) \
    X(KaIcon, fallbackImages, 88, 8) X(KaIcon, viewTrackings, 96, 8) X(KaIcon, next, 104, 8) \
    X(KaMediaAsset, type, 0, 8) X(KaMediaAsset, delivery, 8, 8) X(KaMediaAsset, width, 16, 4) \
    X(KaMediaAsset, height, 20, 4) X(KaMediaAsset, codec, 24, 8) X(KaMediaAsset, id, 32, 8) \
    X(KaMediaAsset, fileSize, 40, 8) X(KaMediaAsset, mediaType, 48, 8) \
    X(KaMediaAsset, apiFramework, 56, 8) X(KaMediaAsset, variableDuration, 64, 4) \
    X(KaMediaAsset, language, 72, 8) X(KaMediaAsset, url, 80, 8) X(KaMediaAsset, next, 88, 8) \
    X(KaMediaFileExtras, mediaFile, 0, 8) X(KaMediaFileExtras, fileSize, 8, 8) \
    X(KaMediaFileExtras, mediaType, 16, 8) X(KaMediaFileExtras, apiFramework, 24, 8) \
    X(KaMediaFileExtras, next, 32, 8) X(KaNonLinear, id, 0, 8) X(KaNonLinear, width, 8, 4) \
    X(KaNonLinear, height, 12, 4) X(KaNonLinear, expandedWidth, 16, 4) \
    X(KaNonLinear, expandedHeight, 20, 4) X(KaNonLinear, scalable, 24, 4) \
    X(KaNonLinear, maintainAspectRatio, 28, 4) X(KaNonLinear, minSuggestedDuration, 32, 8) \
    X(KaNonLinear, apiFramework, 40, 8) X(KaNonLinear, resources, 48, 8) \
    X(KaNonLinear, adParameters, 56, 8) X(KaNonLinear, clickThrough, 64, 8) \
    X(KaNonLinear, clickTrackings, 72, 8) X(KaNonLinear, next, 80, 8) \
    X(KaNonLinearAds, nonLinears, 0, 8) X(KaNonLinearAds, trackingCount, 8, 4) \
    X(KaNonLinearAds, trackingEvents, 16, 8) X(KaCompanion, id, 0, 8) \
    X(KaCompanion, width, 8, 4) X(KaCompanion, height, 12, 4) X(KaCompanion, assetWidth, 16, 4) \
    X(KaCompanion, assetHeight, 20, 4) X(KaCompanion, expandedWidth, 24, 4) \
    X(KaCompanion, expandedHeight, 28, 4) X(KaCompanion, apiFramework, 32, 8) \
    X(KaCompanion, adSlotId, 40, 8) X(KaCompanion, pxratio, 48, 8) \
    X(KaCompanion, renderingMode, 56, 8) X(KaCompanion, resources, 64, 8) \
    X(KaCompanion, adParameters, 72, 8) X(KaCompanion, altText, 80, 8) \
    X(KaCompanion, clickThrough, 88, 8) X(KaCompanion, clickTrackings, 96, 8) \
    X(KaCompanion, trackingCount, 104, 4) X(KaCompanion, trackingEvents, 112, 8) \
    X(KaCompanion, next, 120, 8) X(KaCompanionAds, required, 0, 8) \
    X(KaCompanionAds, companions, 8, 8) X(KaCreativeExtras, universalAdIds, 0, 8) \
    X(KaCreativeExtras, apiFramework, 8, 8) X(KaCreativeExtras, legacyAdId, 16, 8) \
    X(KaCreativeExtras, icons, 24, 8) X(KaCreativeExtras, mezzanines, 32, 8) \
    X(KaCreativeExtras, interactiveFiles, 40, 8) X(KaCreativeExtras, closedCaptionFiles, 48, 8) \
    X(KaCreativeExtras, mediaFiles, 56, 8) X(KaCreativeExtras, nonLinearAds, 64, 8) \
    X(KaCreativeExtras, companionAds, 72, 8) X(VMAPParserExtAPI, GetAdExtras, 24, 8) \
    X(VMAPParserExtAPI, GetCreativeExtras, 32, 8) X(VMAPParserExtAPI, GetNestedAdExtras, 40, 8) \
    X(VMAPParserExtAPI, GetNestedCreativeExtras, 48, 8)

/* X(record, size) */
#define KA_LAYOUT_SIZES(X) \
    X(VastAdData, 32) X(AdData, 32) X(AdInLine, 88) X(AdWrapper, 56) X(AdImpression, 16) \
    X(AdCreative, 136) X(AdLinear, 96) X(AdVideoClicks, 56) X(AdClick, 24) X(AdMediaFile, 72) \
    X(AdTracking, 40) X(AdParameters, 8) X(AdIcon, 8) X(AdInfo, 16) X(AdBreak, 72) \
    X(AdSource, 40) X(AdBreakTracking, 24) X(VMAPParserAPI, 64) \
    X(KaMacroValues, 360) \
    X(KaChainHop, 40) X(KaChainOutcome, 56) \
    X(KaUrl, 24) X(KaResource, 32) X(KaCategory, 24) X(KaPricing, 24) \
    X(KaVerificationResource, 40) X(KaVerification, 56) X(KaAdExtras, 96) X(KaUniversalAdId, 32) \
    X(KaFallbackImage, 40) X(KaIcon, 112) X(KaMediaAsset, 96) X(KaMediaFileExtras, 40) \
    X(KaNonLinear, 88) X(KaNonLinearAds, 24) X(KaCompanion, 128) X(KaCompanionAds, 16) \
    X(KaCreativeExtras, 80) X(VMAPParserExtAPI, 56)

/* X(constant, value) */
#define KA_LAYOUT_CONSTANTS(X) \
    X(AD_TYPE_UNKNOWN, 0u) X(AD_TYPE_INLINE, 1u) X(AD_TYPE_WRAPPER, 2u) \
    X(AD_CREATIVE_NONE, 0u) X(AD_CREATIVE_LINEAR, 1u) \
    X(AD_DELIVERY_PROGRESSIVE, 0u) X(AD_DELIVERY_STREAMING, 1u) \
    X(AD_OFFSET_NONE, 0u) X(AD_OFFSET_TIME, 1u) X(AD_OFFSET_PERCENT, 2u) \
    X(KA_PID_VAST_EXTENSION_PARSER, 0x45000001u) \
    X(TIME_OFFSET_NONE, 0u) X(TIME_OFFSET_CLOCK, 1u) X(TIME_OFFSET_PERCENT, 2u) \
    X(TIME_OFFSET_START_END, 3u) X(TIME_OFFSET_POSITION, 4u) \
    X(BREAK_TYPE_LINEAR, 1u) X(BREAK_TYPE_NONLINEAR, 2u) X(BREAK_TYPE_COMPANION, 4u) \
    X(BREAK_TYPE_SKIPPABLE, 8u) X(BREAK_TYPE_ADPODS, 16u) \
    X(KA_PID_VMAP_CONTENT_URI, 0x44000001u) X(KA_PID_VMAP_VAST_ONLY, 0x44000002u) \
    X(KA_PID_VMAP_MERGE_WRAPPERS, 0x44000003u) X(KA_PID_VMAP_STOP_FLAG, 0x44000004u) \
    X(KA_ERR_NULL_ARGUMENT, 0x9100100bu) X(KA_ERR_LOAD_FAILED, 0x91001000u) \
    X(KA_ERR_MODULE_NOT_LOADED, 0x90000001u) \
    X(KA_ERR_BUFFER_TOO_SMALL, 0x91003001u) \
    X(KA_CHAIN_NOT_WRAPPED, 0u) X(KA_CHAIN_RESOLVED, 1u) X(KA_CHAIN_WRAPPER, 2u) \
    X(KA_CHAIN_EMPTIED, 3u) X(KA_VAST_ERROR_NONE, 0u) X(KA_VAST_ERROR_XML, 100u) \
    X(KA_VAST_ERROR_SCHEMA, 101u) X(KA_VAST_ERROR_VERSION, 102u) X(KA_VAST_ERROR_WRAPPER, 300u) \
    X(KA_VAST_ERROR_TIMEOUT, 301u) X(KA_VAST_ERROR_LIMIT, 302u) X(KA_VAST_ERROR_NO_AD, 303u) \
    X(KA_VAST_ERROR_UNDEFINED, 900u) X(KA_CHAIN_REASON_NONE, 0u) X(KA_CHAIN_REASON_NO_URI, 1u) \
    X(KA_CHAIN_REASON_NO_BODY, 2u) X(KA_CHAIN_REASON_URL_REFUSED, 3u) \
    X(KA_CHAIN_REASON_DOWNLOAD, 4u) X(KA_CHAIN_REASON_DEADLINE, 5u) \
    X(KA_CHAIN_REASON_STOPPED, 6u) X(KA_CHAIN_REASON_NOT_XML, 7u) \
    X(KA_CHAIN_REASON_VERSION, 8u) X(KA_CHAIN_REASON_NO_AD, 9u) X(KA_CHAIN_REASON_DEPTH, 10u) \
    X(KA_CHAIN_REASON_FETCHES, 11u) X(KA_CHAIN_REASON_BYTES, 12u) \
    X(KA_CHAIN_REASON_MERGE_SHARE, 13u) \
    X(KA_PID_VMAP_READ_EXTRAS, 0x44000201u) X(KA_PID_VMAP_LENIENT, 0x44000202u) \
    X(KA_RESOURCE_STATIC, 1u) X(KA_RESOURCE_IFRAME, 2u) X(KA_RESOURCE_HTML, 3u)
/* clang-format on */

/* One measured item as the C compiler sees it: a field (offset, size), a record's sizeof (offset
 * 0) or a constant (offset 0, size holding the value). */
typedef struct KaFieldLayout {
    const char* name;
    unsigned long offset;
    unsigned long size;
} KaFieldLayout;

#define KA_MEASURE_FIELD(T, f, off, size) {#T "." #f, offsetof(T, f), sizeof(((T*)0)->f)},
#define KA_MEASURE_SIZE(T, size) {#T, 0, sizeof(T)},
#define KA_MEASURE_CONSTANT(name, value) {#name, 0, (name)},
#define KA_LAYOUT_MEASURED             \
    KA_LAYOUT_FIELDS(KA_MEASURE_FIELD) \
    KA_LAYOUT_SIZES(KA_MEASURE_SIZE) KA_LAYOUT_CONSTANTS(KA_MEASURE_CONSTANT)

#ifdef __cplusplus
extern "C" {
#endif
/* The C compiler's view, in list order: every field, every record's sizeof, every constant. */
const KaFieldLayout* ka_layout_c(unsigned long* count);
#ifdef __cplusplus
}
#endif

#endif /* KA_TEST_LAYOUT_FIELDS_H */
