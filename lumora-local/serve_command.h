// Running the service: where it listens, whom it tells, and how it is stopped.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/file_io.h"
#include "lumora-local/endpoint.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// Where clients with certificates are served, and whose certificates they have.
struct AdminOptions {
    Endpoint listen;
    std::string clientAuthorities;  // a PEM file
};

struct ServeOptions {
    std::string version;                    // of the program, for its metrics
    std::optional<Endpoint> metricsListen;  // no metrics, when absent
    std::optional<AdminOptions> admin;      // what service.json says, when absent
    std::optional<Endpoint> listen;         // where platform.json sends clients, when absent
    std::optional<std::string>
        readyFile;                // gets one line, "https://ADDRESS:PORT", once connections are accepted
    bool updatePlatform = false;  // platform.json is rewritten to where the service really is
};

/// Takes whole lines, without a newline; from any thread, several at a time.
struct ServeOutput {
    std::function<void(std::string_view)> out;         // readiness and the access log
    std::function<void(std::string_view)> err;         // what went wrong, or will
    std::function<void(std::string_view)> requests{};  // the access log, in its form already
};

/// Descriptors that become readable when signals arrive.
struct ServeSignals {
    foundation::FileDescriptor stop;    // SIGTERM, SIGINT
    foundation::FileDescriptor reload;  // SIGHUP
};

/// Blocks the signals for the calling thread and the threads that it starts from now on. Call it before any
/// other thread exists. Throws Failure.
ServeSignals catchServeSignals();

/// Serves until it is asked to stop; SIGHUP makes it read certificates, keys and access.toml again. Throws
/// Failure when it cannot begin.
void serve(const ServiceDirectory& directory, const ServeOptions& options, const ServeOutput& output,
           const ServeSignals& signals);

}  // namespace pinwell::lumora
