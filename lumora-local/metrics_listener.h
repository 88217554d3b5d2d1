// GET /metrics over plain HTTP, with its own socket and thread.
//
// Everybody who reaches the socket may read the metrics: they name no client and no record. A connection has
// one request. Few connections are served at a time, each for a few seconds. Others wait in the kernel's
// queue, and never delay lookups.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "lumora-local/listener.h"

namespace pinwell::lumora {

class MetricsListener {
  public:
    /// Takes the listener's socket. `text` returns the metrics. This class's thread calls it, one call at a
    /// time; it may throw.
    MetricsListener(Listener& listener, std::function<std::string()> text);

    /// Ends the thread, and the connections that are open.
    ~MetricsListener();
    MetricsListener(const MetricsListener&) = delete;
    MetricsListener& operator=(const MetricsListener&) = delete;

  private:
    class Loop;
    std::unique_ptr<Loop> loop_;
};

}  // namespace pinwell::lumora
