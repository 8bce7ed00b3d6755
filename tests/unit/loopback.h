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
#include <map>
#include <mutex>
#include <string>
#include <thread>

#include "source_io_api.h"

namespace loopback {

// Serves what Put registers at /d/NAME (404 otherwise) and N spaces at /size/N; holds /stall...
// requests until the server is destroyed (ten seconds at most). Counts requests by path.
class Server {
public:
    explicit Server(const std::function<void(httplib::Server&)>& moreRoutes = nullptr) {
        using Req = const httplib::Request&;
        using Res = httplib::Response&;
        server_.Get("/d/(.*)", [this](Req req, Res res) {
            std::lock_guard<std::mutex> lock(mutex_);
            counts_[req.path]++;
            auto found = docs_.find(req.matches[1]);
            if (found == docs_.end())
                res.status = 404;
            else
                res.set_content(found->second, "application/xml");
        });
        server_.Get("/stall(/.*)?", [this](Req req, Res res) {
            Requests(req.path, 1);
            const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
            while (!ending_ && std::chrono::steady_clock::now() < deadline) {
                std::this_thread::sleep_for(std::chrono::milliseconds(2));
            }
            res.set_content("late", "text/plain");
        });
        server_.Get("/size/(\\d+)", [](Req req, Res res) {
            res.set_content(std::string(std::stoul(req.matches[1]), ' '), "application/xml");
        });
        if (moreRoutes) moreRoutes(server_);
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
    std::string Url(const std::string& path) const {
        return "http://127.0.0.1:" + std::to_string(port_) + path;
    }
    // Registers a document; returns its URL.
    std::string Put(const std::string& name, const std::string& body) {
        std::lock_guard<std::mutex> lock(mutex_);
        docs_[name] = body;
        return Url("/d/" + name);
    }
    // Requests of a path so far (after adding more); "" sums every path.
    int Requests(const std::string& path, int more = 0) {
        std::lock_guard<std::mutex> lock(mutex_);
        int total = counts_[path] += more;
        if (path.empty()) {
            for (const auto& entry : counts_) total += entry.second;
        }
        return total;
    }

private:
    httplib::Server server_;
    std::thread thread_;
    int port_ = -1;
    std::atomic<bool> ending_{false};
    std::mutex mutex_;
    std::map<std::string, std::string> docs_;
    std::map<std::string, int> counts_;
};

// A URL on a 127.0.0.1 port that nothing listens on any more.
inline std::string RefusedUrl() { return Server().Url("/d/x"); }

// The source-IO module's table, loaded once from the modules folder.
inline SourceIOApi& SourceIo() {
    static SourceIOApi api = [] {
        SourceIOApi table;
        memset(&table, 0, sizeof(table));
        void* module = dlopen(KA_MODULES_DIR "libkaSourceIO.so", RTLD_NOW);
        auto entry = module == nullptr
                         ? nullptr
                         : reinterpret_cast<KaGetSourceIOAPIFn>(dlsym(module, "kaGetSourceIOAPI"));
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
