// The source-IO stand-in as the host holds it: the same loaded object the library reaches, so its
// module-wide settings (file access, time limits) apply to the library's downloads.
#pragma once

#include <dlfcn.h>

#include <cstdlib>

#include "source_io_api.h"

namespace katest {

// The module's table, loaded once from the modules folder; it stays loaded.
inline SourceIOApi& SourceIo() {
    static SourceIOApi api = [] {
        SourceIOApi table = {};
        void* module = dlopen(KA_MODULES_DIR "libkaSourceIO.so", RTLD_NOW | RTLD_LOCAL);
        void* entry = module != nullptr ? dlsym(module, "kaGetSourceIOAPI") : nullptr;
        if (entry == nullptr || reinterpret_cast<KaGetSourceIOAPIFn>(entry)(&table) != 0) abort();
        return table;
    }();
    return api;
}

}  // namespace katest
