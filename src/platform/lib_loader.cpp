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

}  // namespace

namespace ka {

void ApplyCpuRecord(CLibLoader& loader, const CpuInfoRecord& info) {
    if (info.type == KA_CPU_TYPE_ARM && (info.features & KA_CPU_FEATURE_NEON) != 0) {
        CopyBounded(loader.mLibSuffix, sizeof(loader.mLibSuffix), "_v7.so");
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
    if (version == 7) ka::CopyBounded(mLibSuffix, sizeof(mLibSuffix), "_v7.so");
    return 0;
}

int CLibLoader::LoadLib(void* /*unused*/) {
    if (mLibHandle != nullptr) FreeLib();

    char requested[ka::kModuleNameSize];
    ka::CopyBounded(requested, sizeof(requested), mLibName);

    LoadModuleService();
    if (mLoadLibrary == nullptr || mGetAddressSymbol == nullptr || mFreeLibrary == nullptr) {
        return 0;
    }

    if (mWorkPath != nullptr && mWorkPath[0] != '\0') {
        ka::CopyBounded(mLibName, sizeof(mLibName), mWorkPath);
        if (strstr(requested, "lib") == nullptr)
            ka::AppendBounded(mLibName, sizeof(mLibName), "lib");
        ka::AppendBounded(mLibName, sizeof(mLibName), requested);
        if (strstr(requested, ".so") == nullptr)
            ka::AppendBounded(mLibName, sizeof(mLibName), ".so");
        mLibHandle = LoadVariantLib(mLibName);
        if (mLibHandle == nullptr) mLibHandle = mLoadLibrary(mLibName, ka::kModuleLoadNow);
        if (mLibHandle == nullptr) return 0;
    } else {
        // A name with a directory in it is a path: nothing else is tried.
        const bool isPath = strchr(requested, '/') != nullptr;
        const char* const prefixes[] = {"", "lib", "/system/lib/", "/system/lib/lib"};
        for (const char* prefix : prefixes) {
            ka::CopyBounded(mLibName, sizeof(mLibName), prefix);
            ka::AppendBounded(mLibName, sizeof(mLibName), requested);
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

    char variant[ka::kModuleNameSize];
    ka::CopyBounded(variant, sizeof(variant), path);
    char* so = strstr(variant, ".so");
    if (so == nullptr) return nullptr;
    if (IsVariantModule(variant)) {
        *so = '\0';
        ka::AppendBounded(variant, sizeof(variant), mLibSuffix);
    }

    LoadModuleService();
    if (mLoadLibrary == nullptr) return nullptr;
    void* handle = mLoadLibrary(variant, ka::kModuleLoadNow);
    if (handle != nullptr) ka::CopyBounded(mLibName, sizeof(mLibName), variant);
    return handle;
}

int CLibLoader::LoadModuleService() {
    if (mLoadLibrary != nullptr && mGetAddressSymbol != nullptr && mFreeLibrary != nullptr) {
        return 1;
    }
    if (mServiceHandle == nullptr) {
        char path[ka::kModuleNameSize] = {};
        ka::CopyBounded(path, sizeof(path), mWorkPath);
        ka::AppendBounded(path, sizeof(path), "libkadl.so");
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
