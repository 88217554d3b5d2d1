#include "connection_table.h"

#include <algorithm>
#include <utility>
#include <vector>

namespace pinwell::lumora {

ConnectionTable::Identifier ConnectionTable::enter(const std::string& address, std::function<void()> close) {
    std::function<void()> evicted;
    Identifier identifier = 0;
    {
        const std::lock_guard lock(mutex_);
        Peer& peer = peers_[address];
        if (peer.size() >= perAddress_) {
            const auto first = [&peer](State state) {
                return std::find_if(peer.begin(), peer.end(),
                                    [&](const Entry& e) { return e.state == state; });
            };
            auto oldest = first(State::handshaking);
            if (oldest == peer.end()) oldest = first(State::silent);
            if (oldest == peer.end()) oldest = first(State::waiting);
            if (oldest == peer.end()) return 0;
            evicted = std::move(oldest->close);
            places_.erase(oldest->identifier);
            peer.erase(oldest);
        }
        identifier = ++last_;
        peer.push_back({.identifier = identifier, .close = std::move(close)});
        places_.emplace(identifier, Place{address, std::prev(peer.end())});
    }
    if (evicted) evicted();
    return identifier;
}

void ConnectionTable::change(Identifier connection, State state) {
    const std::lock_guard lock(mutex_);
    const auto place = places_.find(connection);
    if (place == places_.end()) return;
    Peer& peer = peers_[place->second.address];
    place->second.entry->state = state;
    peer.splice(peer.end(), peer, place->second.entry);
}

void ConnectionTable::becomeWaiting(Identifier connection) {
    change(connection, State::waiting);
}

void ConnectionTable::becomeBusy(Identifier connection) {
    change(connection, State::busy);
}

void ConnectionTable::becomeSilent(Identifier connection) {
    change(connection, State::silent);
}

void ConnectionTable::leave(Identifier connection) {
    const std::lock_guard lock(mutex_);
    const auto place = places_.find(connection);
    if (place == places_.end()) return;
    const auto peer = peers_.find(place->second.address);
    peer->second.erase(place->second.entry);
    if (peer->second.empty()) peers_.erase(peer);
    places_.erase(place);
}

template <class Condition>
std::size_t ConnectionTable::closeIf(Condition fits) {
    std::vector<std::function<void()>> closing;
    {
        const std::lock_guard lock(mutex_);
        for (auto& [address, peer] : peers_) {
            for (Entry& entry : peer) {
                if (fits(entry) && entry.close) closing.push_back(std::exchange(entry.close, nullptr));
            }
        }
    }
    for (const auto& close : closing) close();
    return closing.size();
}

std::size_t ConnectionTable::closeHandshakesBefore(std::chrono::steady_clock::time_point time) {
    return closeIf(
        [time](const Entry& entry) { return entry.state == State::handshaking && entry.entered < time; });
}

void ConnectionTable::closeSilent() {
    closeIf([](const Entry& entry) { return entry.state <= State::silent; });
}

std::size_t ConnectionTable::count() const {
    const std::lock_guard lock(mutex_);
    return places_.size();
}

}  // namespace pinwell::lumora
