#include "connect_proxy.h"

#include <arpa/inet.h>
#include <sys/eventfd.h>
#include <sys/poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <stdexcept>

namespace pinwell::test {
namespace {

using base::FileDescriptor;

sockaddr_in loopback(std::uint16_t port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return address;
}

// Passes on the available bytes; returns false at the end of either side.
bool pass(int from, int to) {
    std::array<char, 16384> buffer{};
    const ssize_t count = ::recv(from, buffer.data(), buffer.size(), 0);
    return count > 0 && ::send(to, buffer.data(), static_cast<std::size_t>(count), MSG_NOSIGNAL) == count;
}

}  // namespace

ConnectProxy::ConnectProxy(std::uint16_t targetPort, int status)
    : targetPort_(targetPort),
      status_(status),
      listener_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)),
      stop_(::eventfd(0, EFD_CLOEXEC)) {
    sockaddr_in address = loopback(0);
    socklen_t length = sizeof address;
    void* const raw = &address;
    if (::bind(listener_.get(), static_cast<sockaddr*>(raw), length) != 0 ||
        ::listen(listener_.get(), 8) != 0 ||
        ::getsockname(listener_.get(), static_cast<sockaddr*>(raw), &length) != 0)
        throw std::runtime_error("no proxy");
    port_ = ntohs(address.sin_port);
    thread_ = std::thread([this] { run(); });
}

ConnectProxy::~ConnectProxy() {
    const std::uint64_t one = 1;
    if (::write(stop_.get(), &one, sizeof one) < 0) std::terminate();
    thread_.join();
}

std::string ConnectProxy::url(const std::string& scheme, const std::string& user) const {
    return scheme + "://" + (user.empty() ? "" : user + "@") + "127.0.0.1:" + std::to_string(port_);
}

std::vector<std::string> ConnectProxy::heads() const {
    const std::lock_guard lock(mutex_);
    return heads_;
}

void ConnectProxy::run() {
    while (true) {
        std::array<pollfd, 2> waiting{pollfd{listener_.get(), POLLIN, 0}, pollfd{stop_.get(), POLLIN, 0}};
        ::poll(waiting.data(), waiting.size(), -1);
        if (waiting[1].revents != 0) return;
        const FileDescriptor client(::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
        if (client) serve(client.get());
    }
}

void ConnectProxy::serve(int client) {
    std::string head;
    char c = '\0';
    while (!head.ends_with("\r\n\r\n") && head.size() < 65536 && ::recv(client, &c, 1, 0) == 1) head += c;
    {
        const std::lock_guard lock(mutex_);
        heads_.push_back(head);
    }
    const std::string answer = "HTTP/1.1 " + std::to_string(status_) + " Status\r\nX-Proxy: 1\r\n\r\n";
    ::send(client, answer.data(), answer.size(), MSG_NOSIGNAL);
    if (status_ != 200) return;

    const FileDescriptor target(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_in address = loopback(targetPort_);
    void* const raw = &address;
    if (::connect(target.get(), static_cast<sockaddr*>(raw), sizeof address) != 0) return;
    while (true) {
        std::array<pollfd, 3> waiting{pollfd{client, POLLIN, 0}, pollfd{target.get(), POLLIN, 0},
                                      pollfd{stop_.get(), POLLIN, 0}};
        ::poll(waiting.data(), waiting.size(), -1);
        if (waiting[2].revents != 0) return;
        if (waiting[0].revents != 0 && !pass(client, target.get())) return;
        if (waiting[1].revents != 0 && !pass(target.get(), client)) return;
    }
}

}  // namespace pinwell::test
