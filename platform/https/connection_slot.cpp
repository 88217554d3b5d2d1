#include "https/connection_slot.h"

#include <curl/curl.h>
#include <poll.h>

#include <utility>

namespace pinwell::https {

void ConnectionSlot::HandleDeleter::operator()(void* handle) const noexcept {
    curl_multi_cleanup(handle);
}

ConnectionSlot::ConnectionSlot() = default;
ConnectionSlot::~ConnectionSlot() = default;

void* ConnectionSlot::handleFor(const Target& target) {
    if (!handle_ || target.host != host_ || target.port != port_ || !isQuiet()) drop();
    if (!handle_) {
        handle_.reset(curl_multi_init());
        host_ = target.host;
        port_ = target.port;
        if (handle_ && curl_multi_setopt(handle_.get(), CURLMOPT_MAXCONNECTS, 1L) != CURLM_OK) drop();
    }
    socket_ = -1;
    return handle_.get();
}

// Between two exchanges of HTTP/1 a server must not send anything. Readable bytes are its end, or would be
// read as the next response. HTTP/2 numbers its responses, and the library checks for its end itself.
bool ConnectionSlot::isQuiet() const noexcept {
    if (socket_ < 0 || !trust_) return false;
    if (trust_->agreedOnHTTP2()) return true;
    pollfd connection{socket_, POLLIN, 0};
    return ::poll(&connection, 1, 0) == 0;
}

bool ConnectionSlot::prepare(void* tlsContext, ServerTrust::Judge judge) noexcept {
    localPort_ = 0;
    trust_ = ServerTrust::install(tlsContext, std::move(judge));
    return trust_ != nullptr;
}

bool ConnectionSlot::confirm(int localPort) noexcept {
    if (!trust_ || !trust_->accepted()) return false;
    if (localPort_ == 0) localPort_ = localPort;
    return localPort_ == localPort;
}

void ConnectionSlot::keep(int socket) noexcept {
    if (trust_) trust_->forgetJudge();
    socket_ = socket;
    if (socket_ < 0) drop();
}

void ConnectionSlot::drop() noexcept {
    handle_.reset();
    trust_.reset();
    localPort_ = 0;
    socket_ = -1;
}

}  // namespace pinwell::https
