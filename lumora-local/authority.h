// The service's own certificate authority, for its tickets and its host names.
//
//   root                 self-signed, CA; the one anchor of the platform directory
//   ├─ intermediate      CA, path length 0, extension 1.2.840.177245.100.6.2.17
//   │  └─ ticket signer  extension 1.2.840.177245.100.6.1.30, digitalSignature
//   └─ server            extension 1.2.840.177245.100.6.27.2, serverAuth, subject alternative names
//
// All keys are EC P-256, all signatures ECDSA with SHA-256. Every certificate has key identifiers (RFC 5280,
// 4.2.1.1 and 4.2.1.2), basic constraints, key usage and a non-empty subject.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "values/date.h"

namespace pinwell::lumora {

inline constexpr std::string_view kTicketIntermediateMarkerOid = "1.2.840.177245.100.6.2.17";
inline constexpr std::string_view kTicketSignerMarkerOid = "1.2.840.177245.100.6.1.30";
inline constexpr std::string_view kServerMarkerOid = "1.2.840.177245.100.6.27.2";

/// A certificate and its private key, both PEM. The destructor wipes the key.
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

/// Fresh keys and certificates, valid from a day before `now` (clocks differ) for ten years, because nobody
/// renews them at an isolated site. `hosts` are canonical (endpoint.h) and not empty; the first is the
/// server's common name. The keys are encrypted unless `passphrase` is empty. Throws Failure if the
/// cryptographic library fails.
Authority createAuthority(const std::vector<std::string>& hosts, values::Date now,
                          std::string_view passphrase = {});

/// The paths of an issuer's certificate and key.
struct IssuerFiles {
    std::string certificate;
    std::string key;
    std::string passphraseFile;  // key_file.h; empty: the key is in the clear
};

/// A fresh signer. Throws Failure, also if key and certificate of the issuer do not belong together.
Identity issueSigner(const IssuerFiles& intermediate, values::Date now, std::string_view passphrase);

/// A signer's certificate, in PEM, for the key with this SubjectPublicKeyInfo. Throws Failure.
std::string certifySigner(const IssuerFiles& intermediate, base::ByteView publicKey, values::Date now);

/// A fresh server certificate. Throws Failure as issueSigner does.
Identity issueServer(const IssuerFiles& root, const std::vector<std::string>& hosts, values::Date now,
                     std::string_view passphrase);

/// An authority for certificates of clients only, separate from the service's own. The key is encrypted
/// unless `passphrase` is empty.
Identity createClientAuthority(values::Date now, std::string_view passphrase);

/// A client's certificate (clientAuth) with this common name, and its key in the clear.
Identity issueClient(const IssuerFiles& authority, const std::string& commonName, values::Date now);

/// A fresh signer's key, with a certificate request (RFC 2986, PEM) instead of the certificate.
Identity requestSigner(std::string_view passphrase);

}  // namespace pinwell::lumora
