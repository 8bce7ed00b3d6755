// Stand-in for the platform's module-loading service: every module is a shared object loaded
// with the dynamic loader.
#include <dlfcn.h>

#define KADL_API extern "C" __attribute__((visibility("default")))

KADL_API void* kaLoadLibrary(const char* name, int flags) {
    if (name == nullptr || name[0] == '\0') return nullptr;
    return dlopen(name, flags);
}

KADL_API void* kaGetAddressSymbol(void* handle, const char* symbol) {
    if (handle == nullptr || symbol == nullptr) return nullptr;
    return dlsym(handle, symbol);
}

KADL_API int kaFreeLibrary(void* handle) {
    if (handle == nullptr) return -1;
    return dlclose(handle);
}
