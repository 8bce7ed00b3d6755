// CLibLoader finds one auxiliary module at run time: it opens the module-loading service
// libkadl.so, asks it for the module under a fixed sequence of candidate file names, and
// resolves the module's single entry function.
#pragma once

#include "ka/cpu_info.h"
#include "module_service_api.h"
#include "platform/limits.h"
#include "platform/sdk_object.h"

struct ModuleContext;  // supplied by the host, never dereferenced here

// A module's entry function fills the module's table of operations; its result is not used.
typedef int (*KaModuleEntry)(void* api);

class CLibLoader : public CSDKObject {
public:
    CLibLoader();
    // The name only decides whether the CPU-dependent defaults apply; it is not stored.
    explicit CLibLoader(char* name);
    ~CLibLoader() override;

    // Virtual slots, in this order: derived classes add theirs after them.
    virtual unsigned int SetModuleContext(ModuleContext* context);
    // Stored by pointer: the caller keeps the path alive. It must end with "/".
    virtual unsigned int SetWorkPath(char* path);
    virtual unsigned int SetCpuCount(int count);
    virtual unsigned int SetCpuVersion(int version);
    // Loads mLibName through the service and resolves mEntryName; 1 when an entry is held.
    virtual int LoadLib(void* unused);
    virtual int FreeLib();
    // Tries the CPU variant of a codec module path; the module handle, or null.
    virtual void* LoadVariantLib(char* path);
    // 1 when all three service functions are held.
    virtual int LoadModuleService();
    // The dynamic loader's close result, or 0 when the service was not open.
    virtual int FreeModuleService();

    char mLibName[ka::kModuleNameSize];
    char mEntryName[ka::kEntryNameSize];
    KaModuleEntry mEntry;
    int mCpuCount;
    void* mLibHandle;
    ModuleContext* mModuleContext;
    char* mWorkPath;
    char mLibSuffix[ka::kLibSuffixSize];
    void* mServiceHandle;
    KaLoadLibraryFn mLoadLibrary;
    KaGetAddressSymbolFn mGetAddressSymbol;
    KaFreeLibraryFn mFreeLibrary;

private:
    void Init();
};

namespace ka {

// The loader's CPU-dependent defaults from a record: the "_v7.so" variants on ARM with NEON, and
// the core count.
void ApplyCpuRecord(CLibLoader& loader, const CpuInfoRecord& info);
// What both loader constructors do last; a name containing "VidDec" leaves the defaults alone.
void ApplyCpuDefaults(CLibLoader& loader, const char* name);

}  // namespace ka
