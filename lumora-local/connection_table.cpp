#include "lumora-local/connection_table.h"

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
            const auto oldest =
                std::find_if(peer.begin(), peer.end(), [](const Entry& e) { return e.silent; });
            if (oldest == peer.end()) return 0;
            evicted = std::move(oldest->close);
            places_.erase(oldest->identifier);
            peer.erase(oldest);
        }
        identifier = ++last_;
        peer.push_back({identifier, true, std::move(close)});
        places_.emplace(identifier, Place{address, std::prev(peer.end())});
    }
    if (evicted) evicted();
    return identifier;
}

void ConnectionTable::becomeBusy(Identifier connection) {
    const std::lock_guard lock(mutex_);
    const auto place = places_.find(connection);
    if (place != places_.end()) place->second.entry->silent = false;
}

void ConnectionTable::becomeSilent(Identifier connection) {
    const std::lock_guard lock(mutex_);
    const auto place = places_.find(connection);
    if (place == places_.end()) return;
    Peer& peer = peers_[place->second.address];
    place->second.entry->silent = true;
    peer.splice(peer.end(), peer, place->second.entry);
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

void ConnectionTable::closeSilent() {
    std::vector<std::function<void()>> closing;
    {
        const std::lock_guard lock(mutex_);
        for (auto& [address, peer] : peers_) {
            for (Entry& entry : peer) {
                if (entry.silent && entry.close) closing.push_back(std::exchange(entry.close, nullptr));
            }
        }
    }
    for (const auto& close : closing) close();
}

std::size_t ConnectionTable::count() const {
    const std::lock_guard lock(mutex_);
    return places_.size();
}

}  // namespace pinwell::lumora
