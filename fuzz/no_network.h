// Keeps a process that parses untrusted documents off the network: wrapper ads name arbitrary
// URLs, and neither fuzzing nor replaying fuzz findings may fetch them. Header-only: the fuzz
// targets and the regression test share it.
#pragma once

#include <dlfcn.h>
#include <errno.h>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/syscall.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <string>

#include "ka/download.h"
#include "source_io_api.h"

namespace kanonet {

#if defined(__x86_64__)
constexpr uint32_t kAuditArch = AUDIT_ARCH_X86_64;
#elif defined(__aarch64__)
constexpr uint32_t kAuditArch = AUDIT_ARCH_AARCH64;
#else
constexpr uint32_t kAuditArch = 0;
#endif

// From here on socket() fails with EACCES for every family but local and netlink ones, in
// every thread of the process: no name lookup or connection can leave the machine. False when
// the kernel refused the filter.
inline bool BlockNetworkSockets() {
    if (kAuditArch == 0) return false;
    struct sock_filter filter[] = {
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, arch)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, kAuditArch, 1, 0),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_KILL_PROCESS),
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, nr)),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, __NR_socket, 1, 0),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
        BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(struct seccomp_data, args[0])),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, AF_UNIX, 2, 0),
        BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, AF_NETLINK, 1, 0),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | (EACCES & SECCOMP_RET_DATA)),
        BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
    };
    struct sock_fprog program = {static_cast<unsigned short>(sizeof(filter) / sizeof(filter[0])),
                                 filter};
    return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
           prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

// Opens the source-IO module by the path the library loads it from, hence the same instance,
// and gives every later download 1 ms to connect and to finish and no redirects, so a network
// download fails within a poll or two. Files stay refused unless fileDir is given: then
// relative references are read from that folder. The module stays loaded. False when the
// module or one of its settings is missing.
inline bool LimitSourceIO(const std::string& modulesDir, const char* fileDir = nullptr) {
    const std::string path = modulesDir + "libkaSourceIO.so";
    void* module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) {
        fprintf(stderr, "cannot load %s: %s\n", path.c_str(), dlerror());
        return false;
    }
    auto entry = reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
    SourceIOApi table = {};
    if (entry == nullptr || entry(&table) != 0 || table.SetParam == nullptr) return false;
    uint32_t oneMs = 1;
    uint32_t noRedirects = 0;
    uint32_t allowFiles = fileDir != nullptr ? 1 : 0;
    return table.SetParam(nullptr, ka::kSioConnectTimeoutMs, &oneMs) == 0 &&
           table.SetParam(nullptr, ka::kSioTotalTimeoutMs, &oneMs) == 0 &&
           table.SetParam(nullptr, ka::kSioMaxRedirects, &noRedirects) == 0 &&
           table.SetParam(nullptr, ka::kSioAllowFiles, &allowFiles) == 0 &&
           (fileDir == nullptr ||
            table.SetParam(nullptr, ka::kSioFileBaseDir, const_cast<char*>(fileDir)) == 0);
}

}  // namespace kanonet
