#include "commit_cutter.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <string_view>

#include "support/require.h"

namespace pinwell::lumora::test {
namespace {

using base::FileDescriptor;
using pinwell::test::require;

constexpr int kTick = 20;  // milliseconds between two checks for the end

sockaddr_un addressIn(const std::string& directory) {
    const std::string path = directory + "/.s.PGSQL.5432";
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    require(path.size() < sizeof address.sun_path, "a path that is short enough for a socket");
    path.copy(address.sun_path, path.size());
    return address;
}

FileDescriptor makeSocket() {
    FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    require(static_cast<bool>(socket), "socket");
    return socket;
}

bool isReadable(const FileDescriptor& socket) {
    pollfd state{socket.get(), POLLIN, 0};
    return ::poll(&state, 1, kTick) > 0;
}

/// Empty at the end of the connection.
std::string receive(const FileDescriptor& socket) {
    std::array<char, 65536> buffer{};
    const ssize_t count = ::recv(socket.get(), buffer.data(), buffer.size(), 0);
    return {buffer.data(), count > 0 ? static_cast<std::size_t>(count) : 0};
}

bool sendAll(const FileDescriptor& socket, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::send(socket.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
        if (count <= 0) return false;
        bytes.remove_prefix(static_cast<std::size_t>(count));
    }
    return true;
}

}  // namespace

CommitCutter::CommitCutter(std::string serverDirectory)
    : serverDirectory_(std::move(serverDirectory)), listener_(makeSocket()) {
    const sockaddr_un address = addressIn(directory_.path());
    require(::bind(listener_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0,
            "bind");
    require(::listen(listener_.get(), 16) == 0, "listen");
    thread_ = std::thread([this] { listen(); });
}

CommitCutter::~CommitCutter() {
    stopping_ = true;
    thread_.join();
    for (std::thread& connection : connections_) connection.join();
}

void CommitCutter::listen() {
    while (!stopping_) {
        if (!isReadable(listener_)) continue;
        FileDescriptor client(::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
        if (!client) continue;
        connections_.emplace_back([this, socket = client.release()] { pass(FileDescriptor(socket)); });
    }
}

void CommitCutter::pass(FileDescriptor client) {
    const FileDescriptor server = makeSocket();
    const sockaddr_un address = addressIn(serverDirectory_);
    require(::connect(server.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0,
            "connect");
    while (!stopping_) {
        if (next_ == Cut::all) {
            ::poll(nullptr, 0, kTick);
            continue;
        }
        std::array<pollfd, 2> states{{{client.get(), POLLIN, 0}, {server.get(), POLLIN, 0}}};
        if (::poll(states.data(), states.size(), kTick) <= 0) continue;
        if (states[1].revents != 0) {
            const std::string bytes = receive(server);
            if (bytes.empty() || !sendAll(client, bytes)) return;
        }
        if (states[0].revents == 0) continue;
        const std::string bytes = receive(client);
        if (bytes.empty()) return;
        const bool commits = bytes.find("COMMIT") != std::string::npos;
        const Cut cut = commits ? next_.exchange(Cut::nothing) : Cut::nothing;
        if (cut != Cut::nothing) ++cuts_;
        if (cut == Cut::commit) return;
        if (!sendAll(server, bytes)) return;
        if (cut == Cut::answer) {
            receive(server);
            return;
        }
    }
}

}  // namespace pinwell::lumora::test
