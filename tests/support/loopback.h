// An HTTP server on 127.0.0.1 run by the test process.
#pragma once

#include <httplib.h>

#include <atomic>
#include <map>
#include <mutex>
#include <string>
#include <thread>

namespace loopback {

// Serves what Put registers (404 otherwise), N spaces at /size/N, a redirect to the "to"
// parameter at /redirect and the User-Agent at /agent; holds /stall... requests until the server
// is destroyed (ten seconds at most). Counts requests by path as they arrive.
class Server {
public:
    Server() {
        server_.Get(".*", [this](const httplib::Request& req, httplib::Response& res) {
            std::unique_lock<std::mutex> lock(mutex_);
            const std::string& path = req.path;
            counts_[path]++;
            if (docs_.count(path) != 0) res.set_content(docs_[path], "application/xml");
            res.status = docs_.count(path) != 0 || path.rfind("/d/", 0) != 0 ? 200 : 404;
            lock.unlock();
            if (path.rfind("/size/", 0) == 0)
                res.set_content(std::string(std::stoul(path.substr(6)), ' '), "text/xml");
            if (path == "/redirect") res.set_redirect(req.get_param_value("to"));
            if (path == "/agent") res.set_content(req.get_header_value("User-Agent"), "text/plain");
            for (int ms = 0; path.rfind("/stall", 0) == 0 && !ending_ && ms < 10000; ms += 2) {
                std::this_thread::sleep_for(std::chrono::milliseconds(2));
            }
        });
        port_ = server_.bind_to_any_port("127.0.0.1");
        if (port_ > 0) thread_ = std::thread([this] { server_.listen_after_bind(); });
        // stop() only reaches a server that is already running.
        for (int ms = 0; port_ > 0 && !server_.is_running() && ms < 5000; ++ms) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
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
        docs_["/d/" + name] = body;
        return Url("/d/" + name);
    }
    // Requests of a path so far; "" sums every path.
    int Requests(const std::string& path = "") {
        std::lock_guard<std::mutex> lock(mutex_);
        int total = 0;
        for (const auto& e : counts_) total += path.empty() || e.first == path ? e.second : 0;
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

}  // namespace loopback
