// Replaces the TLS library's judgement of a server by ours.
//
// Installed in the TLS context of one connection. The handshake calls it with the server's
// certificates. Nothing else decides: no anchors are loaded, and a connection without a call of the
// judge is not accepted. Sessions are not resumed or renegotiated, because neither would call the
// judge.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::https {

/// A longer list is refused without judging. Real chains have 2 to 4.
inline constexpr std::size_t kMaximumPeerCertificates = 16;

class ServerTrust {
  public:
    /// Whether to go on with a server that sent these certificates (DER, the leaf first). Called on the
    /// thread of the handshake.
    using Judge = std::function<bool(const std::vector<foundation::Data>& certificates)>;

    /// Makes one for a new context (an SSL_CTX), which shares it: the object lives at least as long as the
    /// connection. Returns null if the context cannot be made strict enough.
    static std::shared_ptr<ServerTrust> install(void* context, Judge judge) noexcept;

    explicit ServerTrust(Judge judge) : judge_(std::move(judge)) {}
    ServerTrust(const ServerTrust&) = delete;
    ServerTrust& operator=(const ServerTrust&) = delete;

    /// Refuses every server from now on, because the judge no longer exists.
    void forgetJudge() noexcept { judge_ = nullptr; }

    /// Whether the judge was called, and accepted each time.
    bool accepted() const noexcept { return asked_ && !refused_; }

    /// Whether the server has announced the end of its data (close_notify). Without it, the connection was
    /// cut.
    bool sawOrderlyEnd() const noexcept { return sawOrderlyEnd_; }
    void noteOrderlyEnd() noexcept { sawOrderlyEnd_ = true; }

    /// The server's alert about the client's certificate, in the TLS library's words ("unknown CA"). Empty if
    /// it sent none.
    const std::string& objection() const noexcept { return objection_; }
    void noteAlert(int description) noexcept;

    /// Number of bytes in TLS records since the judge was called.
    std::size_t bytesArrived() const noexcept { return bytesArrived_; }
    void noteRecord(std::size_t length) noexcept { bytesArrived_ += length; }

    /// Whether the last handshake agreed on HTTP/2 (ALPN, RFC 7301).
    bool agreedOnHTTP2() const noexcept { return agreedOnHTTP2_; }

    /// Called by the TLS library; the context is an X509_STORE_CTX.
    bool verify(void* storeContext) noexcept;

  private:
    Judge judge_;
    bool asked_ = false;
    bool refused_ = false;
    bool sawOrderlyEnd_ = false;
    bool agreedOnHTTP2_ = false;
    std::string objection_;
    std::size_t bytesArrived_ = 0;
};

}  // namespace pinwell::https
