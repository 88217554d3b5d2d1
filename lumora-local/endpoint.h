// Hosts and ports as people and platform.json write them: "localhost", "localhost:8443", "[::1]:8443"; and a
// socket that listens at one.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/handle.h"

namespace pinwell::lumora {

/// The port that `init` writes by default.
inline constexpr std::uint16_t kDefaultPort = 8443;

/// The default port of metrics.
inline constexpr std::uint16_t kDefaultMetricsPort = 9464;

/// The port of the administration listener, unless another one is given.
inline constexpr std::uint16_t kDefaultAdminPort = 8444;

/// The port that an https address without a port means.
inline constexpr std::uint16_t kHttpsPort = 443;

/// A DNS name (RFC 1123 labels, 253 characters at most) in lower case, or an IPv4 or IPv6 address in its
/// canonical text form and without brackets; `nullopt` for any other text.
std::optional<std::string> canonicalHost(std::string_view text);

/// Whether a canonical host is an address, not a name.
bool isAddress(const std::string& host);

/// Whether a canonical host is the address of all interfaces.
bool isWildcard(const std::string& host);

struct Endpoint {
    std::string host;  // canonical
    std::uint16_t port = 0;

    bool operator==(const Endpoint&) const = default;
};

/// "HOST:PORT", "[ADDRESS]:PORT", or either without the port, which is then `defaultPort`. A bare IPv6
/// address is a host without a port. Port 0 is allowed here: it requests a free port.
std::optional<Endpoint> parseEndpoint(std::string_view text, std::uint16_t defaultPort);

/// "HOST:PORT", an IPv6 address in brackets.
std::string toString(const Endpoint& endpoint);

/// A listening TCP socket. One thread at a time.
class Listener {
  public:
    /// Binds and listens; port 0 lets the system choose one. A name is resolved, and its first usable address
    /// is taken. Throws Failure (EX_UNAVAILABLE), which names the address.
    explicit Listener(const Endpoint& endpoint);

    /// The requested host, with the bound port.
    const Endpoint& endpoint() const noexcept { return endpoint_; }

    bool isIPv6() const noexcept { return isIPv6_; }

    /// Hands the socket to the caller. It is non-blocking.
    base::FileDescriptor release() noexcept { return std::move(socket_); }

  private:
    Endpoint endpoint_;
    base::FileDescriptor socket_;
    bool isIPv6_ = false;
};

}  // namespace pinwell::lumora
