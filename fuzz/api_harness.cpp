#include "api_harness.h"

#include <cstdio>
#include <cstdlib>
#include <string>

#include "ka/chain_limits.h"
#include "ka/vmap_parser_ext.h"
#include "no_network.h"
#include "record_walk.h"

namespace kafuzz {
namespace {

std::string gWorkPath = KA_MODULES_DIR;
// Already set: a VAST-only Process gives up each wrapper download before it starts.
KA_BOOL gStop = 1;
KA_BOOL gNeverStop = 0;

}  // namespace

const VMAPParserAPI& Setup(const char* fileDir) {
    static const VMAPParserAPI api = [fileDir] {
        // The filter is the second guard; the module's limits alone already fail every
        // download, so a kernel without seccomp only loses that guard.
        if (!kanonet::BlockNetworkSockets()) {
            fprintf(stderr, "fuzz: cannot install the socket filter (errno %d)\n", errno);
        }
        if (!kanonet::LimitSourceIO(KA_MODULES_DIR, fileDir)) {
            fprintf(stderr, "fuzz: cannot limit the source-IO module\n");
            abort();
        }
        VMAPParserAPI table = {};
        if (kaGetVMAPParserAPI(&table) != 0 || table.Open == nullptr) abort();
        // A handle held for the whole run keeps the XML module loaded between inputs.
        static void* keeper = nullptr;
        if (table.Open(&keeper, &gWorkPath[0]) != 0) {
            fprintf(stderr, "fuzz: Open failed on %s\n", gWorkPath.c_str());
            abort();
        }
        return table;
    }();
    return api;
}

namespace {

// Process in one mode and read everything it built.
uint32_t ProcessAndWalk(const VMAPParserAPI& api, void* handle, const uint8_t* data, size_t size,
                        bool vastOnly) {
    api.SetParam(handle, KA_PID_VMAP_VAST_ONLY, vastOnly ? &gStop : nullptr);
    // The table takes a mutable buffer it promises not to keep.
    const uint32_t result =
        api.Process(handle, const_cast<uint8_t*>(data), static_cast<uint32_t>(size));
    static const VMAPParserExtAPI ext = [] {
        VMAPParserExtAPI table = {};
        table.size = sizeof(table);
        if (kaGetVMAPParserExtAPI(&table) != 0) abort();
        return table;
    }();
    const kawalk::Walk walk = kawalk::WalkHandle(api, handle, &ext);
    if (!walk.countsAgree) {
        fprintf(stderr, "fuzz: a record count disagrees with its list\n");
        abort();
    }
    return result;
}

}  // namespace

uint32_t RunDocument(const uint8_t* data, size_t size, const RunOptions& options) {
    const VMAPParserAPI& api = Setup();
    void* handle = nullptr;
    if (api.Open(&handle, &gWorkPath[0]) != 0) abort();
    api.SetParam(handle, KA_PID_VMAP_STOP_FLAG, options.stopped ? &gStop : &gNeverStop);
    api.SetParam(handle, KA_PID_VMAP_MERGE_WRAPPERS, options.merge ? &gStop : nullptr);
    api.SetParam(handle, KA_PID_VMAP_FETCH_BYTES, reinterpret_cast<void*>(options.fetchBytes));
    api.SetParam(handle, KA_PID_VMAP_DEADLINE_MS,
                 reinterpret_cast<void*>(static_cast<uintptr_t>(options.deadlineMs)));
    api.SetParam(handle, KA_PID_VMAP_BASE_URL, const_cast<char*>(options.baseUrl));
    api.SetParam(handle, KA_PID_VMAP_LENIENT, options.lenient ? &gStop : nullptr);
    const uint32_t result = ProcessAndWalk(api, handle, data, size, options.vastOnly);
    // The same bytes once more in the other mode: switching modes must release exactly what
    // the first Process built.
    ProcessAndWalk(api, handle, data, size, !options.vastOnly);
    if (api.Close(handle) != 0) abort();
    return result;
}

}  // namespace kafuzz
