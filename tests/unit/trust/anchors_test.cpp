#include "trust/anchors.h"

#include <gtest/gtest.h>

#include "support/certificate_builder.h"

namespace pinwell::trust {
namespace {

using foundation::asBytes;

const test::IssuedChain& chain() {
    static const test::IssuedChain issued = test::TicketChain().issue();
    return issued;
}

TEST(AnchorFile, MayHoldSeveralCertificates) {
    const auto read = readPem(asBytes(chain().root.pem() + chain().leaf.pem()));
    ASSERT_TRUE(read);
    ASSERT_EQ(read->size(), 2U);
    EXPECT_EQ((*read)[1]->der(), chain().leaf.der);
}

TEST(AnchorFile, MayHoldTextAndOtherBlocks) {
    const auto read = readPem(asBytes(
        "Our root\n" + test::toPem("PUBLIC KEY", chain().leaf.key.publicKeyInfo()) + chain().root.pem()));
    ASSERT_TRUE(read);
    EXPECT_EQ(read->size(), 1U);
}

TEST(AnchorFile, CountsForNothingWithoutACertificate) {
    EXPECT_FALSE(readPem({}));
    EXPECT_FALSE(readPem(asBytes("no certificate at all\n")));
    EXPECT_FALSE(readPem(asBytes(test::toPem("PUBLIC KEY", chain().leaf.key.publicKeyInfo()))));
}

TEST(AnchorFile, CountsForNothingWhenOneBlockIsBroken) {
    std::string text = chain().root.pem() + chain().leaf.pem();
    EXPECT_FALSE(readPem(asBytes(text.substr(0, text.size() - 40))));
    EXPECT_FALSE(readPem(asBytes(chain().root.pem() + test::toPem("CERTIFICATE", asBytes("not DER")))));
}

TEST(AnchorFile, HasALimitOnItsSize) {
    EXPECT_FALSE(readPem(asBytes(chain().root.pem() + std::string(kMaximumPemFileSize, '\n'))));
}

TEST(AnchorList, ContainsACertificateByteForByte) {
    const CertificateList list{X509Certificate::parse(chain().root.der)};
    EXPECT_TRUE(contains(list, *X509Certificate::parse(chain().root.der)));
    Data other = chain().root.der;
    other.back() ^= std::byte{1};
    EXPECT_FALSE(contains(list, *X509Certificate::parse(other)));
}

}  // namespace
}  // namespace pinwell::trust
