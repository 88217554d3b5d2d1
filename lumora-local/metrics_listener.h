// GET /metrics over plain HTTP, on a socket and a thread of its own.
//
// Whoever reaches the socket may read the metrics: they name no client and no record. A connection brings one
// request. Few connections are served at a time, each for a few seconds; others wait in the kernel's queue,
// and never in the way of lookups.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "lumora-local/listener.h"

namespace pinwell::lumora {

class MetricsListener {
  public:
    /// Takes the listener's socket. `text` returns the metrics; it is called on the thread of this class, one
    /// call at a time, and may throw.
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
