// The exported loader functions the host may use for modules of its own.
#include <dlfcn.h>

#include "ka/module_loading.h"

void* kaLoadLib0x010d0000(char* name) { return dlopen(name, RTLD_NOW); }

void* kaGetAddress0x010d0000(void* handle, char* symbol) {
    if (handle == nullptr || symbol == nullptr || symbol[0] == '\0') return nullptr;
    return dlsym(handle, symbol);
}

int kaFreeLib0x010d0000(void* handle) {
    if (handle == nullptr) return -1;
    return dlclose(handle);
}
