#include "lumora-local/ticket_maker.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "base/byte_io.h"
#include "certificates.h"
#include "lumora-local/authority.h"
#include "lumora-local/failure.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using base::ByteReader;
using base::ByteView;
using base::Data;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using values::Date;

CodeHash shortHash(std::uint32_t algorithm, int fill) {
    return {algorithm, Data(20, static_cast<std::byte>(fill))};
}
CodeHash longHash(int fill) {
    return {4, Data(48, static_cast<std::byte>(fill))};
}

int refusalOf(const TicketContents& contents) {
    try {
        encodeTicketPayload(contents);
    } catch (const Failure& failure) {
        return failure.exitStatus();
    }
    return 0;
}

TEST(TicketPayload, ListsItsHashesWithTheirDigestTypes) {
    const Data payload =
        encodeTicketPayload({{shortHash(2, 0xA1), shortHash(1, 0xB2)}, false, Date{0x65432100}});
    ByteReader reader(payload);
    EXPECT_EQ(base::toString(reader.bytes(4, "magic")), "m8tk");
    EXPECT_EQ(reader.le16("version"), 2);
    EXPECT_EQ(reader.le16("hash length"), 20);
    EXPECT_EQ(reader.le32("count"), 2U);
    EXPECT_EQ(reader.le32("flags"), 0U);
    EXPECT_EQ(reader.le64("time"), 0x65432100U);
    EXPECT_EQ(reader.u8("algorithm"), 2);
    EXPECT_EQ(base::toData(reader.bytes(20, "hash")), shortHash(2, 0xA1).hash);
    EXPECT_EQ(reader.u8("algorithm"), 1);
    EXPECT_EQ(base::toData(reader.bytes(20, "hash")), shortHash(1, 0xB2).hash);
    EXPECT_TRUE(reader.atEnd());
}

TEST(TicketPayload, PadsShortHashesBesideLongOnes) {
    const Data payload = encodeTicketPayload({{shortHash(2, 0xA1), longHash(0xC3)}, false, Date{1}});
    ByteReader reader(payload);
    reader.skip(6, "magic and version");
    EXPECT_EQ(reader.le16("hash length"), 48);
    reader.seek(24, "entries");
    EXPECT_EQ(reader.u8("algorithm"), 2);
    EXPECT_EQ(base::toData(reader.bytes(20, "hash")), shortHash(2, 0xA1).hash);
    EXPECT_EQ(base::toData(reader.bytes(28, "padding")), Data(28));
    EXPECT_EQ(reader.u8("algorithm"), 4);
    EXPECT_EQ(base::toData(reader.bytes(48, "hash")), longHash(0xC3).hash);
    EXPECT_TRUE(reader.atEnd());
}

TEST(TicketPayload, SetsTheRevokedFlag) {
    const Data payload = encodeTicketPayload({{shortHash(2, 1)}, true, Date{1}});
    ByteReader reader(payload);
    reader.seek(12, "flags");
    EXPECT_EQ(reader.le32("flags"), 1U);
}

TEST(TicketPayload, IsOfTheFirstVersionForAHashOfUnknownDigestType) {
    const Data payload = encodeTicketPayload({{shortHash(0, 0xA1)}, false, Date{1}});
    ByteReader reader(payload);
    reader.skip(4, "magic");
    EXPECT_EQ(reader.le16("version"), 1);
    reader.seek(24, "entries");
    EXPECT_EQ(base::toData(reader.bytes(20, "hash")), shortHash(0, 0xA1).hash);
    EXPECT_TRUE(reader.atEnd());
}

TEST(TicketPayload, RefusesHashesThatNoTicketCanList) {
    EXPECT_EQ(refusalOf({{}, false, Date{1}}), EX_DATAERR);
    EXPECT_EQ(refusalOf({{shortHash(5, 1)}, false, Date{1}}), EX_DATAERR);
    EXPECT_EQ(refusalOf({{{2, Data(32)}}, false, Date{1}}), EX_DATAERR);
    EXPECT_EQ(refusalOf({{{4, Data(20)}}, false, Date{1}}), EX_DATAERR);
    EXPECT_EQ(refusalOf({{shortHash(2, 1), shortHash(0, 1)}, false, Date{1}}), EX_DATAERR);
    EXPECT_EQ(refusalOf({{shortHash(0, 1), longHash(1)}, false, Date{1}}), EX_DATAERR);
}

TEST(TicketPayload, IsBoundedBySixteenMebibytes) {
    constexpr std::size_t kMost = (16 * 1024 * 1024 - 24) / 21;
    std::vector<CodeHash> hashes(kMost, shortHash(2, 7));
    EXPECT_LE(encodeTicketPayload({hashes, false, Date{1}}).size(), kMaximumPayloadSize);
    hashes.push_back(shortHash(2, 7));
    EXPECT_EQ(refusalOf({hashes, false, Date{1}}), EX_DATAERR);
}

class TicketSignerTest : public testing::Test {
  protected:
    TicketSignerTest() {
        write("signer", authority_.ticketSigner);
        write("intermediate", authority_.ticketIntermediate);
        write("root", authority_.root);
    }

    void write(const std::string& name, const Identity& identity) {
        writeFile(directory_ / (name + ".pem"), identity.certificate);
        writeFile(directory_ / (name + ".key"), identity.privateKey);
    }

    TicketSigner signer() const {
        return {directory_ / "signer.key",
                {directory_ / "signer.pem", directory_ / "intermediate.pem", directory_ / "root.pem"}};
    }

    const Authority authority_ = createAuthority({"localhost"}, Date::now());
    const TemporaryDirectory directory_;
};

/// The parts of a container.
struct Container {
    Data certificates, payload, signedData, signature;
};

Container takeApart(const Data& ticket) {
    ByteReader reader(ticket);
    EXPECT_EQ(base::toString(reader.bytes(4, "magic")), "s8ch");
    EXPECT_EQ(reader.le16("version"), 1);
    EXPECT_EQ(reader.le16("reserved"), 0);
    const std::uint32_t certificatesLength = reader.le32("certificates");
    const std::uint32_t payloadLength = reader.le32("payload");
    Container parts;
    parts.certificates = base::toData(reader.bytes(certificatesLength, "certificates"));
    parts.payload = base::toData(reader.bytes(payloadLength, "payload"));
    parts.signedData = Data(ticket.begin(), ticket.begin() + static_cast<std::ptrdiff_t>(reader.position()));
    parts.signature = base::toData(reader.bytes(72, "signature"));
    EXPECT_TRUE(reader.atEnd());
    return parts;
}

/// Length of the DER element at the front of a signature field.
std::size_t derLength(const Data& signature) {
    ByteReader reader(signature);
    EXPECT_EQ(reader.u8("tag"), 0x30);
    const std::uint8_t length = reader.u8("length");
    EXPECT_LT(length, 0x80);
    return 2U + length;
}

bool verifies(const Container& parts, const std::string& certificate) {
    const lumora::test::CertificateHandle signer = lumora::test::certificateFromPem(certificate);
    EVP_MD_CTX* context = EVP_MD_CTX_new();
    EVP_DigestVerifyInit(context, nullptr, EVP_sha256(), nullptr, X509_get0_pubkey(signer.get()));
    const int result =
        EVP_DigestVerify(context, crypto::unsignedBytes(parts.signature), derLength(parts.signature),
                         crypto::unsignedBytes(parts.signedData), parts.signedData.size());
    EVP_MD_CTX_free(context);
    return result == 1;
}

TEST_F(TicketSignerTest, SignsHeaderCertificatesAndPayload) {
    const TicketContents contents{{shortHash(2, 1), longHash(2)}, false, Date{1'795'000'000}};
    const Container parts = takeApart(signer().makeTicket(contents));
    EXPECT_EQ(parts.payload, encodeTicketPayload(contents));
    EXPECT_TRUE(verifies(parts, authority_.ticketSigner.certificate));
    Container changed = parts;
    changed.signedData[6] ^= std::byte{1};
    EXPECT_FALSE(verifies(changed, authority_.ticketSigner.certificate));
}

TEST_F(TicketSignerTest, FillsTheSignatureFieldWithZeroBytes) {
    // Signatures differ in length by chance: over this many, short ones are among them.
    const TicketSigner ticketSigner = signer();
    std::size_t shortOnes = 0;
    for (int i = 0; i < 64; ++i) {
        const Container parts = takeApart(ticketSigner.makeTicket({{shortHash(2, i)}, false, Date{i}}));
        const std::size_t length = derLength(parts.signature);
        ASSERT_LE(length, 72U);
        shortOnes += length < 72 ? 1U : 0U;
        EXPECT_TRUE(std::all_of(parts.signature.begin() + static_cast<std::ptrdiff_t>(length),
                                parts.signature.end(), [](std::byte byte) { return byte == std::byte{0}; }));
        EXPECT_TRUE(verifies(parts, authority_.ticketSigner.certificate));
    }
    EXPECT_GT(shortOnes, 0U);
}

TEST_F(TicketSignerTest, ContainsItsChainLeafFirst) {
    const Container parts = takeApart(signer().makeTicket({{shortHash(2, 1)}, false, Date{1}}));
    ByteReader reader(parts.certificates);
    EXPECT_EQ(reader.u8("tag"), 0x30);
    EXPECT_EQ(reader.u8("length of length"), 0x82);
    const std::uint16_t length = reader.be16("length");
    EXPECT_EQ(length, reader.remaining());
    const unsigned char* at = crypto::unsignedBytes(parts.certificates) + reader.position();
    const unsigned char* end = crypto::unsignedBytes(parts.certificates) + parts.certificates.size();
    for (const Identity* identity :
         {&authority_.ticketSigner, &authority_.ticketIntermediate, &authority_.root}) {
        const lumora::test::CertificateHandle found(d2i_X509(nullptr, &at, end - at));
        ASSERT_NE(found, nullptr);
        EXPECT_EQ(X509_cmp(found.get(), lumora::test::certificateFromPem(identity->certificate).get()), 0);
    }
    EXPECT_EQ(at, end);
}

TEST_F(TicketSignerTest, RefusesAKeyThatIsNotTheCertificates) {
    EXPECT_THROW(TicketSigner(directory_ / "root.key", {directory_ / "signer.pem"}), Failure);
}

TEST_F(TicketSignerTest, RefusesFilesThatAreMissingOrNotPem) {
    writeFile(directory_ / "garbage.pem", "garbage");
    EXPECT_THROW(TicketSigner(directory_ / "none.key", {directory_ / "signer.pem"}), Failure);
    EXPECT_THROW(TicketSigner(directory_ / "garbage.pem", {directory_ / "signer.pem"}), Failure);
    EXPECT_THROW(TicketSigner(directory_ / "signer.key", {directory_ / "garbage.pem"}), Failure);
}

}  // namespace
}  // namespace pinwell::lumora
