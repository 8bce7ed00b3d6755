// Stand-in for the platform's module-loading service: every module is a shared object loaded
// with the dynamic loader.
#include <dlfcn.h>

#include <type_traits>

#include "module_service_api.h"

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

// The entries have the types the library resolves them as.
static_assert(std::is_same<decltype(&kaLoadLibrary), KaLoadLibraryFn>::value, "kaLoadLibrary");
static_assert(std::is_same<decltype(&kaGetAddressSymbol), KaGetAddressSymbolFn>::value,
              "kaGetAddressSymbol");
static_assert(std::is_same<decltype(&kaFreeLibrary), KaFreeLibraryFn>::value, "kaFreeLibrary");
