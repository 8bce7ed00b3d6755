#include "platform/lib_loader.h"

#include <dlfcn.h>

#include <cstring>

#include "platform/bounded_string.h"

namespace {

// Codec modules that come in a CPU variant ("_v7.so") on processors that can use it.
const char* const kVariantModules[] = {
    "kaVidDec", "kaH264Dec", "kaH265Dec", "kaMPEG4Dec", "kaVP9Dec",    "kaAACDec",
    "kaMP3Dec", "kaAC3Dec",  "kaAMRDec",  "kaWMADec",   "kaAudioProc",
};

bool IsVariantModule(const char* path) {
    for (const char* name : kVariantModules) {
        if (strstr(path, name) != nullptr) return true;
    }
    return false;
}

// Builds prefix + "lib" (unless name holds "lib") + name + ".so" (unless name holds ".so") into
// out; false when that does not fit, and nothing of it may then be loaded.
bool BuildModulePath(char* out, size_t size, const char* prefix, const char* name) {
    return ka::CopyBounded(out, size, prefix) &&
           (strstr(name, "lib") != nullptr || ka::AppendBounded(out, size, "lib")) &&
           ka::AppendBounded(out, size, name) &&
           (strstr(name, ".so") != nullptr || ka::AppendBounded(out, size, ".so"));
}

}  // namespace

namespace ka {

void ApplyCpuRecord(CLibLoader& loader, const CpuInfoRecord& info) {
    if (info.type == KA_CPU_TYPE_ARM && (info.features & KA_CPU_FEATURE_NEON) != 0) {
        // A constant that fits the suffix array; a failed copy would leave the suffix empty.
        (void)CopyBounded(loader.mLibSuffix, sizeof(loader.mLibSuffix), "_v7.so");
    }
    loader.mCpuCount = info.count;
}

void ApplyCpuDefaults(CLibLoader& loader, const char* name) {
    // Loaders of video decoders keep the plain defaults: one core, no variant suffix.
    if (name != nullptr && strstr(name, "VidDec") != nullptr) return;
    CpuInfoRecord info = {};
    if (get_cpu_info(&info) != 0) return;
    ApplyCpuRecord(loader, info);
}

}  // namespace ka

CLibLoader::CLibLoader() {
    Init();
    ka::ApplyCpuDefaults(*this, nullptr);
}

CLibLoader::CLibLoader(char* name) {
    Init();
    ka::ApplyCpuDefaults(*this, name);
}

void CLibLoader::Init() {
    mCpuCount = 1;
    mEntry = nullptr;
    mLibHandle = nullptr;
    mModuleContext = nullptr;
    mWorkPath = nullptr;
    mServiceHandle = nullptr;
    mLoadLibrary = nullptr;
    mGetAddressSymbol = nullptr;
    mFreeLibrary = nullptr;
    mLibName[0] = '\0';
    mEntryName[0] = '\0';
    mLibSuffix[0] = '\0';
}

CLibLoader::~CLibLoader() {
    if (mLibHandle != nullptr && mFreeLibrary != nullptr) mFreeLibrary(mLibHandle);
    mLibHandle = nullptr;
    // Qualified: a destructor must not reach a derived override.
    CLibLoader::FreeModuleService();
}

unsigned int CLibLoader::SetModuleContext(ModuleContext* context) {
    mModuleContext = context;
    return 0;
}

unsigned int CLibLoader::SetWorkPath(char* path) {
    mWorkPath = path;
    return 0;
}

unsigned int CLibLoader::SetCpuCount(int count) {
    mCpuCount = count;
    return 0;
}

unsigned int CLibLoader::SetCpuVersion(int version) {
    if (version == 7) (void)ka::CopyBounded(mLibSuffix, sizeof(mLibSuffix), "_v7.so");
    return 0;
}

int CLibLoader::LoadLib(void* /*unused*/) {
    if (mLibHandle != nullptr) FreeLib();

    char requested[ka::kModuleNameSize];
    if (!ka::CopyBounded(requested, sizeof(requested), mLibName)) return 0;

    LoadModuleService();
    if (mLoadLibrary == nullptr || mGetAddressSymbol == nullptr || mFreeLibrary == nullptr) {
        return 0;
    }

    // Each name is built in full before it is tried: a name cut to fit mLibName would load some
    // other file, so one that does not fit ends the load.
    char name[ka::kModuleNameSize];
    if (mWorkPath != nullptr && mWorkPath[0] != '\0') {
        if (!BuildModulePath(name, sizeof(name), mWorkPath, requested)) return 0;
        memcpy(mLibName, name, strlen(name) + 1);
        mLibHandle = LoadVariantLib(mLibName);
        if (mLibHandle == nullptr) mLibHandle = mLoadLibrary(mLibName, ka::kModuleLoadNow);
        if (mLibHandle == nullptr) return 0;
    } else {
        // A name with a directory in it is a path: nothing else is tried.
        const bool isPath = strchr(requested, '/') != nullptr;
        const char* const prefixes[] = {"", "lib", "/system/lib/", "/system/lib/lib"};
        for (const char* prefix : prefixes) {
            if (!ka::CopyBounded(name, sizeof(name), prefix) ||
                !ka::AppendBounded(name, sizeof(name), requested)) {
                break;
            }
            memcpy(mLibName, name, strlen(name) + 1);
            mLibHandle = mLoadLibrary(mLibName, ka::kModuleLoadNow);
            if (mLibHandle != nullptr || isPath) break;
        }
        if (mLibHandle == nullptr) return 0;
    }

    if (mEntryName[0] != '\0') {
        mEntry = reinterpret_cast<KaModuleEntry>(mGetAddressSymbol(mLibHandle, mEntryName));
    }
    return mEntry != nullptr ? 1 : 0;
}

int CLibLoader::FreeLib() {
    if (mLibHandle != nullptr && mFreeLibrary != nullptr) mFreeLibrary(mLibHandle);
    mLibHandle = nullptr;
    return 0;
}

void* CLibLoader::LoadVariantLib(char* path) {
    if (mLibSuffix[0] == '\0' || path == nullptr) return nullptr;

    // A variant name that does not fit is not tried; the caller then loads the plain one.
    char variant[ka::kModuleNameSize];
    if (!ka::CopyBounded(variant, sizeof(variant), path)) return nullptr;
    char* so = strstr(variant, ".so");
    if (so == nullptr) return nullptr;
    if (IsVariantModule(variant)) {
        *so = '\0';
        if (!ka::AppendBounded(variant, sizeof(variant), mLibSuffix)) return nullptr;
    }

    LoadModuleService();
    if (mLoadLibrary == nullptr) return nullptr;
    void* handle = mLoadLibrary(variant, ka::kModuleLoadNow);
    if (handle != nullptr) memcpy(mLibName, variant, strlen(variant) + 1);
    return handle;
}

int CLibLoader::LoadModuleService() {
    if (mLoadLibrary != nullptr && mGetAddressSymbol != nullptr && mFreeLibrary != nullptr) {
        return 1;
    }
    if (mServiceHandle == nullptr) {
        // A working path too long for the service's name opens nothing rather than a cut path.
        char path[ka::kModuleNameSize] = {};
        if (!ka::CopyBounded(path, sizeof(path), mWorkPath) ||
            !ka::AppendBounded(path, sizeof(path), "libkadl.so")) {
            return 0;
        }
        mServiceHandle = dlopen(path, RTLD_NOW);
        if (mServiceHandle == nullptr) return 0;
    }
    mLoadLibrary = reinterpret_cast<KaLoadLibraryFn>(dlsym(mServiceHandle, "kaLoadLibrary"));
    mGetAddressSymbol =
        reinterpret_cast<KaGetAddressSymbolFn>(dlsym(mServiceHandle, "kaGetAddressSymbol"));
    mFreeLibrary = reinterpret_cast<KaFreeLibraryFn>(dlsym(mServiceHandle, "kaFreeLibrary"));
    return mLoadLibrary != nullptr && mGetAddressSymbol != nullptr && mFreeLibrary != nullptr;
}

int CLibLoader::FreeModuleService() {
    if (mServiceHandle == nullptr) return 0;
    mLoadLibrary = nullptr;
    mGetAddressSymbol = nullptr;
    mFreeLibrary = nullptr;
    int result = dlclose(mServiceHandle);
    mServiceHandle = nullptr;
    return result;
}
