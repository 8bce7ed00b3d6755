// The module-loading service libkadl.so: the three entries the library resolves by name in it
// and reaches every other module through. Shared by the library and the stand-in service.
#pragma once

// Loads a module by file name or path; its handle, or null. flags is kModuleLoadNow.
typedef void* (*KaLoadLibraryFn)(const char* name, int flags);
// The address of an exported symbol of a loaded module, or null.
typedef void* (*KaGetAddressSymbolFn)(void* handle, const char* symbol);
// Unloads a module; 0 on success, -1 for a null handle.
typedef int (*KaFreeLibraryFn)(void* handle);

namespace ka {

// The flags of every load: the dynamic loader's RTLD_NOW.
constexpr int kModuleLoadNow = 2;

}  // namespace ka
