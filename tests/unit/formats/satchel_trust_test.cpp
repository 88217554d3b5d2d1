// Containers with real certificates and signatures, judged by the platform's own trust service.
#include <gtest/gtest.h>

#include <memory>
#include <stdexcept>

#include "base/bytes.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"
#include "trust/trust.h"
#include "values/date.h"

namespace pinwell {
namespace {

namespace status = satchel_status;

using base::ByteView;
using base::Data;
using test::hashOf;
using test::IssuedChain;
using test::KeyKind;
using test::SatchelBuilder;
using test::SigningKey;
using test::TicketChain;
using test::TicketPayloadBuilder;
using values::Date;

constexpr Date kNow{1795000000};            // 2026-11-18
constexpr Date kAfterEveryone{2840140800};  // 2060-01-01

class SatchelTrust : public testing::Test {
  protected:
    void trustAsPlatformRoot(const IssuedChain& chain) {
        test::writeFile(platform_ / "roots/root.pem", chain.root.pem());
    }
    void trustAsUser(const IssuedChain& chain) {
        test::writeFile(platform_ / "user-trust/allow/root.pem", chain.root.pem());
    }

    trust::Status verify(const Data& container) {
        if (service_ == nullptr) {
            service_ = trust::makeTrustService(
                config::PlatformDirectory(platform_.path()),
                [](std::string_view line) { ADD_FAILURE() << "logged: " << line; }, [this] { return now; });
        }
        satchel_view view;
        EXPECT_EQ(satchel_decode_header(container.data(), container.size(), &view), 0);
        return verifySatchel(&view, *service_);
    }
    trust::Status verify(const SatchelBuilder& builder) { return verify(builder.build()); }

    // Null when it is refused. Once verify() has made the service.
    TicketPointer validatedTicket(ByteView container) {
        tm_ticket* ticket = nullptr;
        const std::int32_t result =
            satchel_get_validated_tm_ticket(container.data(), container.size(), &ticket, *service_);
        EXPECT_EQ(result, ticket != nullptr ? 0 : -1);
        return TicketPointer(ticket);
    }

    Date now = kNow;
    const Data payload = TicketPayloadBuilder().entry(2, hashOf(1)).build();

  private:
    test::TemporaryDirectory platform_;
    std::unique_ptr<trust::TrustService> service_;
};

TEST_F(SatchelTrust, AcceptsAChainOfThePlatformsOwnRootAndHandsOutItsTicket) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    const Data container = SatchelBuilder::of(chain, payload).build();
    ASSERT_EQ(verify(container), status::kSuccess);
    const TicketPointer ticket = validatedTicket(container);
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_get_cdhash_count(ticket.get()), 1U);
}

TEST_F(SatchelTrust, AcceptsAChainWhoseRootIsLeftOutOfTheContainer) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload).certificates(chain.list(false))), status::kSuccess);
}

TEST_F(SatchelTrust, AcceptsATicketWhoseCertificatesHaveExpiredSince) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    now = kAfterEveryone;
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kSuccess);
}

TEST_F(SatchelTrust, RefusesAChainOfAnUnknownRoot) {
    EXPECT_EQ(verify(SatchelBuilder::of(TicketChain().issue(), payload)), status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesAChainThatOnlyTheUserTrusts) {
    const IssuedChain chain = TicketChain().issue();
    trustAsUser(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesALeafWithoutItsMarker) {
    TicketChain fields;
    fields.leaf.markers.clear();
    const IssuedChain chain = fields.issue();
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesAnIntermediateWithoutItsMarker) {
    TicketChain fields;
    fields.intermediate.markers.clear();
    const IssuedChain chain = fields.issue();
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesAKeyOfFewerThan256Bits) {
    TicketChain fields;
    fields.leaf.key = SigningKey::cached(KeyKind::p224, "short");
    const IssuedChain chain = fields.issue();
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesTheSignatureOfAnotherKey) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    const trust::Status result =
        verify(SatchelBuilder::of(chain, payload).signedBy(SigningKey::generate(KeyKind::p256)));
    EXPECT_NE(result, status::kSuccess);
    EXPECT_NE(result, status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesALeafWithAnRSAKeyThoughItsChainIsTrusted) {
    TicketChain fields;
    fields.leaf.key = SigningKey::cached(KeyKind::rsa2048, "leaf");
    const IssuedChain chain = fields.issue();
    trustAsPlatformRoot(chain);
    const trust::Status result = verify(
        SatchelBuilder::of(chain, payload).signedBy(SigningKey::cached(KeyKind::p256, "in its place")));
    EXPECT_NE(result, status::kSuccess);
    EXPECT_NE(result, status::kNotTrusted);
}

TEST_F(SatchelTrust, RefusesAnEmptySignatureField) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    EXPECT_NE(verify(SatchelBuilder::of(chain, payload).signature({})), status::kSuccess);
}

TEST_F(SatchelTrust, AcceptsSignaturesOf70To72Bytes) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    for (const std::size_t size : {70U, 71U, 72U}) {
        EXPECT_EQ(verify(SatchelBuilder::of(chain, payload).signatureSize(size)), status::kSuccess) << size;
    }
}

TEST_F(SatchelTrust, RefusesPaddingThatIsNotZero) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    for (const std::size_t size : {70U, 71U}) {
        EXPECT_NE(verify(SatchelBuilder::of(chain, payload).signatureSize(size).lastSignatureByte(1)),
                  status::kSuccess)
            << size;
    }
}

TEST_F(SatchelTrust, SignsTheReservedField) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    Data container = SatchelBuilder::of(chain, payload).reserved(0xABCD).build();
    EXPECT_EQ(verify(container), status::kSuccess);
    for (const std::size_t offset : {std::size_t{6}, std::size_t{7}}) {
        Data changed = container;
        changed[offset] ^= std::byte{1};
        EXPECT_NE(verify(changed), status::kSuccess) << offset;
    }
}

TEST_F(SatchelTrust, RefusesAChangeOfAnyByte) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    const Data container = SatchelBuilder::of(chain, payload).build();
    ASSERT_EQ(verify(container), status::kSuccess);
    for (std::size_t offset = 0; offset < container.size(); ++offset) {
        Data changed = container;
        changed[offset] ^= std::byte{1} << (offset % 8);
        ASSERT_EQ(validatedTicket(changed), nullptr) << offset;
    }
}

TEST_F(SatchelTrust, RefusesEveryPrefix) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    const Data container = SatchelBuilder::of(chain, payload).build();
    ASSERT_EQ(verify(container), status::kSuccess);
    for (std::size_t size = 0; size < container.size(); ++size) {
        // In its own buffer, so that a read after its end is detected.
        const Data prefix(container.begin(), container.begin() + static_cast<std::ptrdiff_t>(size));
        ASSERT_EQ(validatedTicket(prefix), nullptr) << size;
    }
}

TEST_F(SatchelTrust, RefusesFourCertificatesAndNone) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload).certificate(chain.root.der)),
              status::kBadCertificates);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload).certificates({})), status::kBadCertificates);
}

TEST_F(SatchelTrust, RefusesALeafThatIsNotFirst) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    EXPECT_NE(verify(SatchelBuilder::of(chain, payload)
                         .certificates({chain.intermediate.der, chain.leaf.der, chain.root.der})),
              status::kSuccess);
}

TEST_F(SatchelTrust, RefusesAnElementThatIsNoCertificate) {
    const IssuedChain chain = TicketChain().issue();
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)
                         .certificates({chain.leaf.der, test::derElementOfSize(200), chain.root.der})),
              status::kBadCertificates);
}

// A chain whose leaf has exactly that many bytes. An extension grows until it does. The length of a signature
// varies, so this may need several tries.
IssuedChain chainWithLeafOf(std::size_t size) {
    TicketChain fields;
    std::size_t filler = size - 1000;
    for (int attempt = 0; attempt < 100; ++attempt) {
        fields.leaf.extensions = {
            {.oid = "1.2.840.177245.100.6.99", .value = test::derElementOfSize(filler)}};
        const IssuedChain chain = fields.issue();
        if (chain.leaf.der.size() == size) return chain;
        filler += size - chain.leaf.der.size();  // modulo 2^64, so it shrinks as well
    }
    throw std::runtime_error("no leaf of the wanted size came up");
}

TEST_F(SatchelTrust, AcceptsALeafOf131072Bytes) {
    const IssuedChain chain = chainWithLeafOf(131072);
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kSuccess);
}

TEST_F(SatchelTrust, RefusesALeafOf131073Bytes) {
    const IssuedChain chain = chainWithLeafOf(131073);
    trustAsPlatformRoot(chain);
    EXPECT_EQ(verify(SatchelBuilder::of(chain, payload)), status::kBadCertificates);
}

}  // namespace
}  // namespace pinwell
