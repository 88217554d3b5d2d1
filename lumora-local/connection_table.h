// The open connections, and the one to close if a peer has too many.
//
// A connection is silent while it has no request: before and during the handshake, and between requests. It
// waits while only a part of a request has arrived. If a peer exceeds the bound, it loses one connection: the
// oldest one without a complete handshake, else the oldest silent one, else the one that has waited longest.
// So nobody at an address can keep others out by silent connections or partial requests.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <list>
#include <mutex>
#include <string>
#include <unordered_map>

namespace pinwell::lumora {

/// For any thread.
class ConnectionTable {
  public:
    using Identifier = std::uint64_t;

    explicit ConnectionTable(std::size_t perAddress) : perAddress_(perAddress) {}

    /// Enters a silent connection of the peer at `address`. `close` ends the connection soon, unless it has
    /// become busy. It is called without a lock held, from any thread, at most once, and never after leave()
    /// has returned. If the peer has too many connections, one of them is closed. If all are busy, returns 0
    /// and enters nothing.
    Identifier enter(const std::string& address, std::function<void()> close);

    /// The first bytes of a request have arrived.
    void becomeWaiting(Identifier connection);

    /// The request is whole.
    void becomeBusy(Identifier connection);

    /// The response is complete: the connection becomes the peer's newest silent one.
    void becomeSilent(Identifier connection);

    void leave(Identifier connection);

    /// Closes every connection that was entered before `time` and has no complete handshake yet. Returns
    /// their number.
    std::size_t closeHandshakesBefore(std::chrono::steady_clock::time_point time);

    /// Closes every silent connection.
    void closeSilent();

    std::size_t count() const;

  private:
    enum class State { handshaking, silent, waiting, busy };
    struct Entry {
        Identifier identifier = 0;
        State state = State::handshaking;
        std::function<void()> close;
        std::chrono::steady_clock::time_point entered = std::chrono::steady_clock::now();
    };
    using Peer = std::list<Entry>;  // entries of one state are in the order in which they reached it

    struct Place {
        std::string address;
        Peer::iterator entry;
    };

    void change(Identifier connection, State state);

    /// Closes every connection whose entry fits. Returns their number.
    template <class Condition>
    std::size_t closeIf(Condition fits);

    const std::size_t perAddress_;
    mutable std::mutex mutex_;
    Identifier last_ = 0;
    std::unordered_map<std::string, Peer> peers_;
    std::unordered_map<Identifier, Place> places_;
};

}  // namespace pinwell::lumora
