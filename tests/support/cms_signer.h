// CMS messages like those of code signers, and time-stamp tokens like those of authorities, each with the one
// fault of a test. There is one key for each kind in a process. The certificates are self-signed, so their
// readers must not check the issuer.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"

namespace pinwell::test {

using base::ByteView;
using base::Data;

enum class TestKey { ecP256, rsa2048 };

/// A time-stamp token (RFC 3161) over a signature value.
class TimestampBuilder {
  public:
    /// GeneralizedTime; by default 2026-11-20 19:55:00 UTC, which is 1795204500 seconds.
    TimestampBuilder& time(std::string value);

    /// The imprint is of these bytes instead of the signature value.
    TimestampBuilder& imprintOf(Data bytes);

    /// Another SHA-2 digest for the imprint (2: SHA-256, 4: SHA-384).
    TimestampBuilder& imprintDigest(std::uint8_t type);

    /// One bit of the token's own signature is wrong.
    TimestampBuilder& brokenSignature();

    TimestampBuilder& withoutCertificate();

    /// The content is called plain data instead of a time stamp.
    TimestampBuilder& asPlainData();

    /// The token for this signature value, DER.
    Data build(ByteView signatureValue) const;

  private:
    std::string time_ = "20261120195500Z";
    std::optional<Data> imprinted_;
    std::uint8_t imprintDigest_ = 2;
    bool broken_ = false;
    bool certificate_ = true;
    bool plainData_ = false;
};

/// A detached SignedData with one signer, his certificate inside; DER unless ber() is called.
class CmsBuilder {
  public:
    /// The signed content: the code directory of slot 0.
    explicit CmsBuilder(Data content);

    CmsBuilder& key(TestKey value);

    /// Indefinite lengths in the outer four levels.
    CmsBuilder& ber();

    CmsBuilder& withoutCertificate();

    /// The content travels inside the message.
    CmsBuilder& attached();

    /// No signed attributes: the signature is over the content itself.
    CmsBuilder& withoutSignedAttributes();

    /// The signer is named by the key identifier in the certificate.
    CmsBuilder& byKeyIdentifier();

    /// RSASSA-PSS; of an RSA key only. The salt is the longest for 2048 bits and SHA-256: 256 - 32 - 2 bytes.
    static constexpr int kPssSaltLength = 222;
    CmsBuilder& pss();

    /// One bit of the signature value is wrong.
    CmsBuilder& brokenSignature();

    /// One more time-stamp token among the unsigned attributes.
    CmsBuilder& timestamp(TimestampBuilder token);

    Data build() const;

  private:
    Data content_;
    TestKey key_ = TestKey::ecP256;
    bool ber_ = false;
    bool certificate_ = true;
    bool attached_ = false;
    bool signedAttributes_ = true;
    bool keyIdentifier_ = false;
    bool pss_ = false;
    bool broken_ = false;
    std::vector<TimestampBuilder> timestamps_;
};

}  // namespace pinwell::test
