// Which connections are open, and which one makes room when a peer has too many.
//
// A connection is silent while it has no request under way: before and during the handshake, and between
// requests. A peer's silent connections beyond the bound cost it its oldest one, so that nobody keeps others
// out by opening connections and saying nothing.
#pragma once

#include <cstdint>
#include <functional>
#include <list>
#include <mutex>
#include <string>
#include <unordered_map>

namespace pinwell::lumora {

/// May be used from any thread.
class ConnectionTable {
  public:
    using Identifier = std::uint64_t;

    explicit ConnectionTable(std::size_t perAddress) : perAddress_(perAddress) {}

    /// Enters a silent connection of the peer at `address`. `close` ends the connection soon; it is called
    /// without a lock held, from any thread, at most once, and not after leave() has returned. If the peer
    /// has too many connections, its oldest silent one is closed; if none is silent, nothing is entered and
    /// the result is 0.
    Identifier enter(const std::string& address, std::function<void()> close);

    /// A request begins.
    void becomeBusy(Identifier connection);

    /// The request is answered; the connection counts as the peer's newest silent one.
    void becomeSilent(Identifier connection);

    void leave(Identifier connection);

    /// Closes every silent connection.
    void closeSilent();

    std::size_t count() const;

  private:
    struct Entry {
        Identifier identifier = 0;
        bool silent = true;
        std::function<void()> close;
    };
    using Peer = std::list<Entry>;  // the silent ones are in the order in which they fell silent

    struct Place {
        std::string address;
        Peer::iterator entry;
    };

    const std::size_t perAddress_;
    mutable std::mutex mutex_;
    Identifier last_ = 0;
    std::unordered_map<std::string, Peer> peers_;
    std::unordered_map<Identifier, Place> places_;
};

}  // namespace pinwell::lumora
