// The service's own certificate authority: who signs its tickets and who speaks for its host names.
//
//   root                 self-signed, CA; the one anchor of the platform directory
//   ├─ intermediate      CA, path length 0, extension 1.2.840.177245.100.6.2.17
//   │  └─ ticket signer  extension 1.2.840.177245.100.6.1.30, digitalSignature
//   └─ server            extension 1.2.840.177245.100.6.27.2, serverAuth, subject alternative names
//
// All keys are EC P-256, all signatures ECDSA with SHA-256; every certificate carries key identifiers
// (RFC 5280, 4.2.1.1 and 4.2.1.2), basic constraints, key usage and a non-empty subject.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "foundation/date.h"

namespace pinwell::lumora {

inline constexpr std::string_view kTicketIntermediateMarkerOid = "1.2.840.177245.100.6.2.17";
inline constexpr std::string_view kTicketSignerMarkerOid = "1.2.840.177245.100.6.1.30";
inline constexpr std::string_view kServerMarkerOid = "1.2.840.177245.100.6.27.2";

/// A certificate and its private key, both PEM. The key is wiped when the identity goes.
struct Identity {
    Identity(std::string itsCertificate, std::string itsPrivateKey)
        : certificate(std::move(itsCertificate)), privateKey(std::move(itsPrivateKey)) {}
    Identity(Identity&&) noexcept = default;
    Identity(const Identity&) = delete;
    Identity& operator=(const Identity&) = delete;
    ~Identity();

    std::string certificate;
    std::string privateKey;
};

struct Authority {
    Identity root;
    Identity ticketIntermediate;
    Identity ticketSigner;
    Identity server;
};

/// Fresh keys and certificates, valid from a day before `now` (clocks differ) for ten years: an isolated site
/// has nobody to renew them. `hosts` are canonical (endpoint.h) and not empty; the first is the server's
/// common name. Throws Failure when the cryptographic library fails.
Authority createAuthority(const std::vector<std::string>& hosts, foundation::Date now);

}  // namespace pinwell::lumora
