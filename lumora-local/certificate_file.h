// Certificates that exist already: reading them from PEM files, their names and dates, and the conditions of
// ticket readers on a signer's chain. Includes OpenSSL's headers: for .cpp files of this folder.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

/// The first certificate of a file. Throws Failure: EX_NOINPUT if it cannot be read, EX_CONFIG if there is
/// none in it.
CertificateHandle readCertificateFile(const std::string& path);

/// All certificates of a file, at least one and at most `limit`. Throws Failure as above.
std::vector<CertificateHandle> readCertificateFiles(const std::string& path, std::size_t limit);

std::string encodeCertificate(X509* certificate);

/// Seconds since 1970. A certificate without a date that can be read has expired: 0.
std::int64_t expiryOf(X509* certificate);

/// The subject's common name, for messages; the whole subject if it has none.
std::string nameOf(X509* certificate);

/// The fault of the chain signer, intermediate, root; `nullopt` if clients that trust the root accept its
/// tickets. Dates do not count, as for tickets.
std::optional<std::string> faultOfSignerChain(const std::vector<CertificateHandle>& chain);

/// The fault of `certificate` as a certificate issued by `issuer`; `nullopt` if it has none.
std::optional<std::string> faultOfIssue(X509* certificate, X509* issuer);

bool carriesMarker(X509* certificate, std::string_view oid);

}  // namespace pinwell::lumora
