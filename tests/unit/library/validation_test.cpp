// Tickets judged through the public interface, compared with the tool's own verdicts.
#include <gtest/gtest.h>
#include <pinwell/ticket.h>

#include <thread>

#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"
#include "trust/trust.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using base::Data;
using ticket::ByteView;
using ticket::Step;
using ticket::TrustedRoots;
using ticket::Validation;
using ticket::Verdict;

constexpr std::int64_t kNow = 1'795'000'000;            // 2026-11-18
constexpr std::int64_t kAfterEveryone = 2'840'140'800;  // 2060-01-01

TrustedRoots rootsOf(ByteView pemOrDer) {
    return TrustedRoots::fromCertificates(pemOrDer).value();
}

class Judging : public testing::Test {
  protected:
    SatchelBuilder ticketWith(const Data& contents) const { return SatchelBuilder::of(chain, contents); }

    Validation judge(ByteView bytes, std::int64_t at = kNow) const {
        const ByteView cdhashes[] = {cdhash};
        return ticket::validate(bytes, roots, at, cdhashes);
    }
    Validation judge(const SatchelBuilder& builder) const { return judge(builder.build()); }

    void expectRefusal(const Validation& validation, Step step, std::uint64_t offset) const {
        EXPECT_FALSE(validation.isGenuine);
        EXPECT_FALSE(validation.isAcceptable());
        EXPECT_EQ(validation.step, step) << validation.reason;
        EXPECT_EQ(validation.offset, offset) << validation.reason;
        EXPECT_FALSE(validation.reason.empty());
    }

    const IssuedChain chain = TicketChain().issue();
    const Data cdhash = hashOf(7);
    const Data payload = TicketPayloadBuilder().entry(2, hashOf(1)).entry(2, cdhash).build();
    const Data sound = ticketWith(payload).build();
    const TrustedRoots roots = rootsOf(chain.root.der);
};

TEST_F(Judging, AcceptsAGenuineTicketThatListsTheArtefact) {
    const Validation validation = judge(sound);
    EXPECT_TRUE(validation.isGenuine);
    EXPECT_TRUE(validation.isListed);
    EXPECT_FALSE(validation.isRevoked);
    EXPECT_TRUE(validation.isAcceptable());
    EXPECT_EQ(validation.step, Step::none);
    EXPECT_EQ(validation.verdict, Verdict::unspecified);
    EXPECT_EQ(validation.reason, "");
}

TEST_F(Judging, FindsAnyOfSeveralHashes) {
    const Data other = hashOf(99);
    const ByteView both[] = {other, cdhash};
    EXPECT_TRUE(ticket::validate(sound, roots, kNow, both).isListed);
    EXPECT_FALSE(ticket::validate(sound, roots, kNow, std::span(both).first(1)).isListed);
    EXPECT_FALSE(ticket::validate(sound, roots, kNow).isListed);
}

TEST_F(Judging, DistinguishesAGenuineTicketOfAnotherArtefactFromAForgery) {
    const Data other = hashOf(99);
    const ByteView cdhashes[] = {other};
    const Validation validation = ticket::validate(sound, roots, kNow, cdhashes);
    EXPECT_TRUE(validation.isGenuine);
    EXPECT_FALSE(validation.isAcceptable());
}

TEST_F(Judging, DoesNotTakePartOfAHashForTheHash) {
    const ByteView cdhashes[] = {ByteView(cdhash).first(19), ByteView{}};
    EXPECT_FALSE(ticket::validate(sound, roots, kNow, cdhashes).isListed);
}

TEST_F(Judging, SaysThatATicketIsRevokedAndStillGenuine) {
    const Validation validation =
        judge(ticketWith(TicketPayloadBuilder().revoked().entry(2, cdhash).build()));
    EXPECT_TRUE(validation.isGenuine);
    EXPECT_TRUE(validation.isRevoked);
    EXPECT_TRUE(validation.isListed);
    EXPECT_FALSE(validation.isAcceptable());
}

TEST_F(Judging, OutlivesTheCertificates) {
    EXPECT_TRUE(judge(sound, kAfterEveryone).isAcceptable());
}

TEST_F(Judging, RefusesABrokenFrame) {
    expectRefusal(judge(SatchelBuilder(ticketWith(payload)).version(2)), Step::container, 4);
    expectRefusal(judge(ByteView{}), Step::container, 0);
}

TEST_F(Judging, RefusesACertificateThatCannotBeRead) {
    const Validation validation =
        judge(SatchelBuilder().certificate(derElementOfSize(200)).payload(payload).signedBy(chain.leaf.key));
    expectRefusal(validation, Step::certificates, 16 + 3);
    EXPECT_EQ(validation.reason, "certificate 1 cannot be read");
    EXPECT_EQ(validation.verdict, Verdict::none);
}

TEST_F(Judging, RefusesAChainThatEndsInNoTrustedRoot) {
    const IssuedCertificate stranger = issueCertificate(
        {.subject = commonName("Stranger"), .key = SigningKey::cached(KeyKind::p256, "stranger")}, nullptr);
    const Validation validation = ticket::validate(sound, rootsOf(stranger.der), kNow);
    EXPECT_EQ(validation.step, Step::chain);
    EXPECT_EQ(validation.verdict, Verdict::recoverableFailure);
    EXPECT_FALSE(validation.reason.empty());
}

TEST_F(Judging, NamesTheCertificateThatThePolicyRefuses) {
    TicketChain fields;
    fields.leaf.markers.clear();
    const IssuedChain weak = fields.issue();
    const Validation validation =
        ticket::validate(SatchelBuilder::of(weak, payload).build(), rootsOf(weak.root.der), kNow);
    expectRefusal(validation, Step::chain, 16 + 4);
    EXPECT_EQ(validation.verdict, Verdict::recoverableFailure);
}

TEST_F(Judging, EscapesTheNamesOfCertificates) {
    TicketChain fields;
    fields.leaf.subject = commonName("Evil \x1b[2J signer");
    fields.leaf.markers.clear();
    const IssuedChain evil = fields.issue();
    const Validation validation =
        ticket::validate(SatchelBuilder::of(evil, payload).build(), rootsOf(evil.root.der), kNow);
    EXPECT_NE(validation.reason.find("Evil"), std::string::npos) << validation.reason;
    EXPECT_EQ(validation.reason.find('\x1b'), std::string::npos) << validation.reason;
}

TEST_F(Judging, RefusesASignatureOfAnotherKey) {
    const Data forged =
        SatchelBuilder(ticketWith(payload)).signedBy(SigningKey::cached(KeyKind::p256, "forger")).build();
    const Validation validation = judge(forged);
    expectRefusal(validation, Step::signature, forged.size() - 72);
    EXPECT_EQ(validation.reason, "the signature does not verify");
    EXPECT_EQ(validation.verdict, Verdict::unspecified);
}

TEST_F(Judging, RefusesASignedPayloadThatIsNone) {
    const Data bytes =
        ticketWith(TicketPayloadBuilder().hashLength(32).entry(2, hashOf(1, 32)).build()).build();
    const std::uint64_t payloadOffset = bytes.size() - 72 - (24 + 33);
    expectRefusal(judge(bytes), Step::payload, payloadOffset + 6);
}

TEST_F(Judging, AgreesWithTheToolWhicheverByteIsWrong) {
    TemporaryDirectory platform;
    writeFile(platform / "roots/root.pem", chain.root.pem());
    const auto service = trust::makeTrustService(
        config::PlatformDirectory(platform.path()), [](auto) {}, [] { return values::Date{kNow}; });
    const std::size_t certificatesEnd = sound.size() - 72 - payload.size();
    for (std::size_t i = 0; i<sound.size(); i += i> 24 && i < certificatesEnd ? 11 : 1) {
        Data damaged = sound;
        damaged[i] ^= std::byte{0x20};
        tm_ticket* decoded = nullptr;
        const bool isAccepted =
            satchel_get_validated_tm_ticket(damaged.data(), damaged.size(), &decoded, *service) == 0;
        const TicketPointer owner(decoded);
        const Validation validation = judge(damaged);
        EXPECT_EQ(validation.isGenuine, isAccepted) << "byte " << i;
        EXPECT_EQ(validation.reason.empty(), isAccepted) << "byte " << i;
        EXPECT_EQ(validation.step == Step::none, isAccepted) << "byte " << i;
        EXPECT_NE(validation.step, Step::memory) << "byte " << i;
        EXPECT_LE(validation.offset, damaged.size());
    }
}

TEST_F(Judging, RefusesEveryTruncation) {
    for (std::size_t length = 0; length < sound.size(); length += 13) {
        const Validation validation = judge(ByteView(sound).first(length));
        EXPECT_EQ(validation.step, Step::container) << length;
        EXPECT_LE(validation.offset, length);
    }
}

TEST_F(Judging, MayBeDoneByAnyNumberOfThreadsWithTheSameRoots) {
    std::vector<std::thread> threads;
    std::array<bool, 8> accepted{};
    for (bool& one : accepted) threads.emplace_back([&] { one = judge(sound).isAcceptable(); });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(accepted, (std::array<bool, 8>{true, true, true, true, true, true, true, true}));
}

TEST_F(Judging, TakesRootsInPem) {
    const TrustedRoots pem = rootsOf(asBytes(chain.root.pem() + chain.intermediate.pem()));
    EXPECT_EQ(pem.size(), 2U);
    EXPECT_TRUE(ticket::validate(sound, pem, kNow).isGenuine);
}

TEST(TrustedRootsOfATicket, AreRefusedWhenTheyAreNoCertificates) {
    for (const std::string_view text : {"", "certificates", "-----BEGIN CERTIFICATE-----\nAAAA\n"}) {
        const auto result = TrustedRoots::fromCertificates(asBytes(text));
        ASSERT_FALSE(result) << text;
        EXPECT_EQ(result.error().code, ticket::ErrorCode::noCertificates);
    }
}

class PlatformRoots : public Judging {
  protected:
    Validation judgeByPlatform() const {
        return ticket::validate(sound, TrustedRoots::fromPlatformDirectory(platform.path()), kNow);
    }

    TemporaryDirectory platform;
};

TEST_F(PlatformRoots, AreThoseOfTheDirectory) {
    writeFile(platform / "roots/root.pem", chain.root.pem());
    EXPECT_TRUE(judgeByPlatform().isGenuine);
}

TEST_F(PlatformRoots, AreNoneInAnEmptyDirectory) {
    EXPECT_EQ(TrustedRoots::fromPlatformDirectory(platform / "missing").size(), 0U);
    EXPECT_EQ(judgeByPlatform().step, Step::chain);
}

TEST_F(PlatformRoots, AreNotThoseThatTheUserAllows) {
    writeFile(platform / "user-trust/allow/root.pem", chain.root.pem());
    const Validation validation = judgeByPlatform();
    EXPECT_EQ(validation.step, Step::chain);
    EXPECT_EQ(validation.verdict, Verdict::proceed);
}

TEST_F(PlatformRoots, AreOverruledByTheUsersDistrust) {
    writeFile(platform / "roots/root.pem", chain.root.pem());
    writeFile(platform / "user-trust/deny/leaf.pem", chain.leaf.pem());
    const Validation validation = judgeByPlatform();
    EXPECT_EQ(validation.verdict, Verdict::deny);
    EXPECT_EQ(validation.offset, 16U + 4U);
}

TEST_F(PlatformRoots, NameAFileThatHadToBeLeftOut) {
    writeFile(platform / "roots/broken.pem", "nothing");
    writeFile(platform / "roots/root.pem", chain.root.pem());
    const TrustedRoots found = TrustedRoots::fromPlatformDirectory(platform.path());
    EXPECT_EQ(found.size(), 1U);
    ASSERT_EQ(found.problems().size(), 1U);
    EXPECT_NE(found.problems()[0].find("broken.pem"), std::string::npos) << found.problems()[0];
}

}  // namespace
}  // namespace pinwell::test
