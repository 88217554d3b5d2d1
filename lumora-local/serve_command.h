// Running the service: its listeners, its reports, and its end.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "base/handle.h"
#include "endpoint.h"
#include "service_directory.h"

namespace pinwell::lumora {

/// The listener for clients with certificates, and the authorities of these.
struct AdminOptions {
    Endpoint listen;
    std::string clientAuthorities;  // a PEM file
};

struct ServeOptions {
    std::string version;                    // of the program, for its metrics
    std::optional<Endpoint> metricsListen;  // no metrics, when absent
    std::optional<AdminOptions> admin;      // if absent, service.json decides
    std::optional<Endpoint> listen;         // if absent, the host in platform.json
    std::optional<std::string>
        readyFile;                // gets one line, "https://ADDRESS:PORT", once connections are accepted
    bool updatePlatform = false;  // writes the service's real place into platform.json
};

/// Takes whole lines, without a newline; from any thread, several at a time.
struct ServeOutput {
    std::function<void(std::string_view)> out;         // readiness and the access log
    std::function<void(std::string_view)> err;         // for errors and warnings
    std::function<void(std::string_view)> requests{};  // the access log, in its form already
};

/// Descriptors that become readable when signals arrive.
struct ServeSignals {
    base::FileDescriptor stop;    // SIGTERM, SIGINT
    base::FileDescriptor reload;  // SIGHUP
};

/// Blocks the signals for the calling thread and the threads that it starts from now on. Call it before any
/// other thread exists. Throws Failure.
ServeSignals catchServeSignals();

/// Serves until a signal ends it; on SIGHUP it reads certificates, keys and access.toml again. Throws Failure
/// if it cannot begin.
void serve(const ServiceDirectory& directory, const ServeOptions& options, const ServeOutput& output,
           const ServeSignals& signals);

}  // namespace pinwell::lumora
