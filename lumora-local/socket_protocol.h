// The protocol of a TCP socket, in Asio's form. For the .cpp files of this folder.
#pragma once

#include <sys/socket.h>

#include <boost/asio/ip/tcp.hpp>

namespace pinwell::lumora {

inline boost::asio::ip::tcp protocolOf(int socket) {
    sockaddr_storage address{};
    socklen_t length = sizeof address;
    const bool known = ::getsockname(socket, reinterpret_cast<sockaddr*>(&address), &length) == 0;
    return known && address.ss_family == AF_INET6 ? boost::asio::ip::tcp::v6() : boost::asio::ip::tcp::v4();
}

}  // namespace pinwell::lumora
