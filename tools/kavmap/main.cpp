// Placeholder host: loads the library as a player would and reports what it found.
#include <dlfcn.h>

#include <cstdio>

int main(int argc, char** argv) {
    const char* lib = argc > 1 ? argv[1] : "libkaVMAPParser.so";
    void* handle = dlopen(lib, RTLD_NOW);
    if (handle == nullptr) {
        std::fprintf(stderr, "kavmap: cannot load %s: %s\n", lib, dlerror());
        return 1;
    }
    std::printf("kavmap: loaded %s\n", lib);
    dlclose(handle);
    return 0;
}
