// What the download and wrapper-chain tests share: an HTTP server on 127.0.0.1 run by this
// process, and the source-IO stand-in as the host holds it (the same loaded object the library
// reaches, so its module-wide settings apply to the library's downloads).
#pragma once

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <httplib.h>

#include <atomic>
#include <chrono>
#include <cstring>
#include <functional>
#include <string>
#include <thread>

#include "net/source_io_api.h"

namespace loopback {

// Routes are registered before the server starts. A handler that stalls polls Ending(), which
// turns true when the server is being destroyed; every wait here is bounded.
class Server {
public:
    explicit Server(const std::function<void(httplib::Server&, const Server&)>& routes) {
        routes(server_, *this);
        port_ = server_.bind_to_any_port("127.0.0.1");
        if (port_ > 0) {
            thread_ = std::thread([this] { server_.listen_after_bind(); });
            // stop() only reaches a server that is already running.
            const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
            while (!server_.is_running() && std::chrono::steady_clock::now() < deadline) {
                std::this_thread::sleep_for(std::chrono::milliseconds(1));
            }
        }
    }
    ~Server() {
        ending_ = true;
        server_.stop();
        if (thread_.joinable()) thread_.join();
    }
    bool Running() const { return port_ > 0 && server_.is_running(); }
    bool Ending() const { return ending_; }
    std::string Url(const std::string& path) const {
        return "http://127.0.0.1:" + std::to_string(port_) + path;
    }

private:
    httplib::Server server_;
    std::thread thread_;
    int port_ = -1;
    std::atomic<bool> ending_{false};
};

// Holds a stalled request until the server ends, ten seconds at the most.
inline void Stall(const Server& server) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    while (!server.Ending() && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
}

// The source-IO module's table, loaded once from the modules folder.
inline SourceIOApi& SourceIo() {
    static SourceIOApi api = [] {
        SourceIOApi table;
        memset(&table, 0, sizeof(table));
        void* module = dlopen(KA_MODULES_DIR "libkaSourceIO.so", RTLD_NOW);
        auto entry = module == nullptr ? nullptr
                                       : reinterpret_cast<KaGetSourceIOAPIFn>(
                                             dlsym(module, "kaGetSourceIOAPI"));
        if (entry != nullptr) entry(&table);
        return table;
    }();
    return api;
}

// A module-wide setting of the source-IO module.
inline void SetModule(uint32_t id, uint32_t value) {
    ASSERT_NE(nullptr, SourceIo().SetParam);
    ASSERT_EQ(0u, SourceIo().SetParam(nullptr, id, &value));
}

}  // namespace loopback
