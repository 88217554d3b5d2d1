// Where the TLS library's own judgement of a server is replaced by ours.
//
// Installed in the TLS context of one connection, it is called in the handshake with the certificates that
// the server sent. Nothing else decides: no anchors are loaded, and a connection on which the judge was not
// asked counts as not accepted. Sessions are not resumed and not renegotiated, since neither would ask the
// judge.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::https {

/// A longer list is refused unseen. Real chains have 2 to 4.
inline constexpr std::size_t kMaximumPeerCertificates = 16;

class ServerTrust {
  public:
    /// Whether to go on with a server that sent these certificates (DER, the leaf first). Called on the
    /// thread that carries out the handshake.
    using Judge = std::function<bool(const std::vector<foundation::Data>& certificates)>;

    /// Makes one for a fresh context (an SSL_CTX), which shares it: the object lives at least as long as the
    /// connection does. Returns null if the context could not be made as strict as it has to be.
    static std::shared_ptr<ServerTrust> install(void* context, Judge judge) noexcept;

    explicit ServerTrust(Judge judge) : judge_(std::move(judge)) {}
    ServerTrust(const ServerTrust&) = delete;
    ServerTrust& operator=(const ServerTrust&) = delete;

    /// From now on every server is refused: whoever judged has gone.
    void forgetJudge() noexcept { judge_ = nullptr; }

    /// The judge was asked, and accepted each time.
    bool accepted() const noexcept { return asked_ && !refused_; }

    /// The server has said that it sends no more (close_notify). A connection that ends without was cut.
    bool sawOrderlyEnd() const noexcept { return sawOrderlyEnd_; }
    void noteOrderlyEnd() noexcept { sawOrderlyEnd_ = true; }

    /// What the server has against this client, in the TLS library's words ("unknown CA"): the alert about a
    /// client's certificate that it sent. Empty if it sent none.
    const std::string& objection() const noexcept { return objection_; }
    void noteAlert(int description) noexcept;

    /// How many bytes of TLS records have come since the judge was asked.
    std::size_t bytesArrived() const noexcept { return bytesArrived_; }
    void noteRecord(std::size_t length) noexcept { bytesArrived_ += length; }

    /// The last handshake agreed on HTTP/2 (ALPN, RFC 7301).
    bool agreedOnHTTP2() const noexcept { return agreedOnHTTP2_; }

    /// What the TLS library calls; the context is an X509_STORE_CTX.
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
