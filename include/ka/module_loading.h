/* Thin functions over the dynamic loader, exported for the host's own module loading. The
 * library itself finds its modules through libkadl.so. */
#ifndef KA_MODULE_LOADING_H
#define KA_MODULE_LOADING_H

#include "ka/export.h"

#ifdef __cplusplus
extern "C" {
#endif

/* dlopen(name, RTLD_NOW): the module's handle, or null. */
KA_API void* kaLoadLib0x010d0000(char* name);
/* The symbol's address, or null for a null handle or a null or empty symbol name. */
KA_API void* kaGetAddress0x010d0000(void* handle, char* symbol);
/* dlclose's result, or -1 for a null handle. */
KA_API int kaFreeLib0x010d0000(void* handle);

#ifdef __cplusplus
}
#endif

#endif /* KA_MODULE_LOADING_H */
