#include "endpoint.h"

#include <arpa/inet.h>
#include <netdb.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <system_error>

#include "base/handle.h"
#include "failure.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::FileDescriptor;
using values::format;

constexpr std::size_t kMaximumHostLength = 253;
constexpr std::size_t kMaximumLabelLength = 63;

std::optional<std::string> canonicalAddress(const std::string& text) {
    std::array<unsigned char, 16> address{};
    std::array<char, INET6_ADDRSTRLEN> canonical{};
    for (const int family : {AF_INET, AF_INET6}) {
        if (inet_pton(family, text.c_str(), address.data()) == 1 &&
            inet_ntop(family, address.data(), canonical.data(), canonical.size()) != nullptr) {
            return std::string(canonical.data());
        }
    }
    return std::nullopt;
}

bool isLetterOrDigit(char c) {
    return (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9');
}

bool isLabel(std::string_view label) {
    return !label.empty() && label.size() <= kMaximumLabelLength && isLetterOrDigit(label.front()) &&
           isLetterOrDigit(label.back()) &&
           std::all_of(label.begin(), label.end(), [](char c) { return isLetterOrDigit(c) || c == '-'; });
}

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

bool isName(std::string_view text) {
    if (text.empty() || text.size() > kMaximumHostLength) return false;
    std::string_view lastLabel;
    for (std::size_t start = 0; start <= text.size();) {
        const std::size_t end = std::min(text.find('.', start), text.size());
        lastLabel = text.substr(start, end - start);
        if (!isLabel(lastLabel)) return false;
        start = end + 1;
    }
    // "300.1.1.1" is a mistyped address, not a name.
    return !std::all_of(lastLabel.begin(), lastLabel.end(), isDigit);
}

std::optional<std::uint16_t> parsePort(std::string_view text) {
    std::uint16_t port = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), port);
    if (error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
    return port;
}

std::optional<Endpoint> makeEndpoint(std::string_view host, std::optional<std::uint16_t> port) {
    std::optional<std::string> canonical = canonicalHost(host);
    if (!canonical || !port) return std::nullopt;
    return Endpoint{*std::move(canonical), *port};
}

}  // namespace

std::optional<std::string> canonicalHost(std::string_view text) {
    std::string host(text);
    if (host.find('\0') != std::string::npos) return std::nullopt;
    if (auto address = canonicalAddress(host)) return address;
    std::transform(host.begin(), host.end(), host.begin(),
                   [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; });
    if (!isName(host)) return std::nullopt;
    return host;
}

bool isAddress(const std::string& host) {
    return canonicalAddress(host).has_value();
}

bool isWildcard(const std::string& host) {
    return host == "0.0.0.0" || host == "::";
}

std::optional<Endpoint> parseEndpoint(std::string_view text, std::uint16_t defaultPort) {
    if (text.starts_with('[')) {
        const std::size_t close = text.find(']');
        if (close == std::string_view::npos) return std::nullopt;
        const std::string_view host = text.substr(1, close - 1);
        const std::string_view rest = text.substr(close + 1);
        if (host.find(':') == std::string_view::npos) return std::nullopt;
        if (rest.empty()) return makeEndpoint(host, defaultPort);
        if (!rest.starts_with(':')) return std::nullopt;
        return makeEndpoint(host, parsePort(rest.substr(1)));
    }
    const std::size_t colon = text.find(':');
    const bool bareAddress =
        colon != std::string_view::npos && text.find(':', colon + 1) != std::string_view::npos;
    if (colon == std::string_view::npos || bareAddress) return makeEndpoint(text, defaultPort);
    return makeEndpoint(text.substr(0, colon), parsePort(text.substr(colon + 1)));
}

std::string toString(const Endpoint& endpoint) {
    const bool brackets = endpoint.host.find(':') != std::string::npos;
    const std::string host = brackets ? "[" + endpoint.host + "]" : endpoint.host;
    return host + ":" + std::to_string(endpoint.port);
}

namespace {

constexpr int kBacklog = 1024;  // the kernel cuts it to its own limit

using AddressList = base::Handle<addrinfo, ::freeaddrinfo>;

AddressList resolve(const Endpoint& endpoint) {
    addrinfo hints{};
    hints.ai_family = AF_UNSPEC;
    hints.ai_socktype = SOCK_STREAM;
    hints.ai_flags = AI_PASSIVE | AI_NUMERICSERV;
    addrinfo* list = nullptr;
    const std::string service = std::to_string(endpoint.port);
    const int status = ::getaddrinfo(endpoint.host.c_str(), service.c_str(), &hints, &list);
    if (status != 0) {
        throw Failure(EX_UNAVAILABLE, format("cannot resolve %@: %s", endpoint.host, ::gai_strerror(status)));
    }
    return AddressList(list);
}

FileDescriptor listenAt(const addrinfo& address) {
    FileDescriptor socket(::socket(address.ai_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!socket) return {};
    const int yes = 1;
    // Lets a restarted service use its port while old connections time out. Two services never share a port.
    ::setsockopt(socket.get(), SOL_SOCKET, SO_REUSEADDR, &yes, sizeof yes);
    if (::bind(socket.get(), address.ai_addr, address.ai_addrlen) != 0) return {};
    if (::listen(socket.get(), kBacklog) != 0) return {};
    return socket;
}

Endpoint endpointOf(const sockaddr_storage& address, socklen_t length) {
    std::array<char, NI_MAXHOST> host{};
    std::array<char, NI_MAXSERV> port{};
    // The socket interface's own cast: every address family shares this header.
    const auto* generic = reinterpret_cast<const sockaddr*>(&address);
    if (::getnameinfo(generic, length, host.data(), host.size(), port.data(), port.size(),
                      NI_NUMERICHOST | NI_NUMERICSERV) != 0) {
        return {};
    }
    return {host.data(), static_cast<std::uint16_t>(std::stoul(port.data()))};
}

}  // namespace

Listener::Listener(const Endpoint& endpoint) : endpoint_(endpoint) {
    const AddressList addresses = resolve(endpoint);
    int error = 0;
    for (const addrinfo* address = addresses.get(); address != nullptr && !socket_;
         address = address->ai_next) {
        socket_ = listenAt(*address);
        if (!socket_) error = errno;
    }
    if (!socket_) {
        throw Failure(EX_UNAVAILABLE, format("cannot listen on %@: %@", toString(endpoint),
                                             std::generic_category().message(error)));
    }
    sockaddr_storage bound{};
    socklen_t length = sizeof bound;
    if (::getsockname(socket_.get(), reinterpret_cast<sockaddr*>(&bound), &length) == 0) {
        endpoint_.port = endpointOf(bound, length).port;
        isIPv6_ = bound.ss_family == AF_INET6;
    }
}

}  // namespace pinwell::lumora
