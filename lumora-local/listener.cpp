#include "lumora-local/listener.h"

#include <arpa/inet.h>
#include <netdb.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "foundation/format.h"
#include "foundation/handle.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

using foundation::FileDescriptor;
using foundation::format;

constexpr int kBacklog = 1024;  // the kernel cuts it to its own limit

using AddressList = foundation::Handle<addrinfo, ::freeaddrinfo>;

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
    }
}

}  // namespace pinwell::lumora
