// A proxy on the loopback address that understands CONNECT, for one connection after another.
#pragma once

#include <atomic>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "base/handle.h"

namespace pinwell::test {

class ConnectProxy {
  public:
    /// The response to every CONNECT has this status. With 200 it connects to that port of the loopback
    /// address, whatever the requested host.
    explicit ConnectProxy(std::uint16_t targetPort, int status = 200);
    ~ConnectProxy();
    ConnectProxy(const ConnectProxy&) = delete;
    ConnectProxy& operator=(const ConnectProxy&) = delete;

    std::string url(const std::string& scheme = "http", const std::string& user = {}) const;

    /// The heads of the requests so far.
    std::vector<std::string> heads() const;

  private:
    void run();
    void serve(int client);

    std::uint16_t targetPort_;
    int status_;
    std::uint16_t port_ = 0;
    base::FileDescriptor listener_;
    base::FileDescriptor stop_;
    mutable std::mutex mutex_;
    std::vector<std::string> heads_;
    std::thread thread_;  // last: it uses all of the above
};

}  // namespace pinwell::test
