/* Export macro of libkaVMAPParser: the build hides every symbol; only entries marked KA_API are
 * visible to the player. */
#ifndef KA_EXPORT_H
#define KA_EXPORT_H

#if defined(KA_BUILDING_LIBRARY)
#define KA_API __attribute__((visibility("default")))
#else
#define KA_API
#endif

#ifdef __cplusplus
#define KA_EXTERN_C extern "C"
#else
#define KA_EXTERN_C
#endif

#endif /* KA_EXPORT_H */
