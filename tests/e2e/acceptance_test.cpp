// Which tickets are accepted for a file, and how the outcome is reported.
#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

constexpr const char* kRevoked =
    "The ticket for Sample.app has been revoked. Tollmark will prevent it from running.";

class Acceptance : public EndToEndTest {
  protected:
    ProcessResult stapleTicket(const Data& offered) {
        serveTicket(offered);
        return staple();
    }
    ProcessResult validateAgainst(const Data& offered) {
        serveTicket(offered);
        return validate();
    }
    testing::Matcher<const ProcessResult&> Worked() const {
        return Ended(0, ElementsAre(processing(), processing(), kWorked));
    }
    std::string refusal() const { return "Could not validate ticket for " + bundle; }
    testing::Matcher<const ProcessResult&> Refused() const {
        return Ended(65, ElementsAre(processing(), refusal(), stapleFailed(65)));
    }
    testing::Matcher<const ProcessResult&> RefusedAsRevoked() const {
        return Ended(77, ElementsAre(processing(), refusal(), kRevoked));
    }
    std::string keptTicket() const { return readFile(temporaryPath("REQUEST.ticket")); }

    SatchelBuilder container(const Data& contents) const { return SatchelBuilder::of(ticketChain, contents); }
};

// The hashes of a ticket.

TEST_F(Acceptance, ATicketThatListsOtherSoftwareIsRefused) {
    EXPECT_THAT(stapleTicket(ticketForOthers()), Refused());
    EXPECT_EQ(stapled(), std::nullopt);
    EXPECT_EQ(keptTicket().substr(0, 4), "s8ch");
}

TEST_F(Acceptance, ATicketThatListsNothingIsRefused) {
    EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder())), Refused());
}

TEST_F(Acceptance, AnyEntryOfATicketWillDo) {
    TicketPayloadBuilder many;
    for (std::uint8_t i = 0; i < 200; ++i) many.entry(2, hashOf(i));
    EXPECT_THAT(stapleTicket(sealed(many.entry(2, hash))), Worked());
}

TEST_F(Acceptance, TheAlgorithmOfATwentyByteEntryDoesNotMatter) {
    for (const std::uint8_t algorithm : std::initializer_list<std::uint8_t>{1, 2, 3})
        EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().entry(algorithm, hash))), Worked())
            << int{algorithm};
    EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().version(1).entry(0, hash))), Worked());
}

TEST_F(Acceptance, AnUnreadableEntryIsSkipped) {
    for (const std::uint8_t algorithm : std::initializer_list<std::uint8_t>{0, 4, 5, 255}) {
        EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().entry(algorithm, hash))), Refused())
            << int{algorithm};
        EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().entry(algorithm, hash).entry(2, hash))),
                    Worked())
            << int{algorithm};
    }
}

TEST_F(Acceptance, AFortyEightByteEntryMatchesNoTwentyByteHash) {
    Data longer = hash;
    longer.resize(48);
    EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().hashLength(48).entry(4, longer))), Refused());
    EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().hashLength(48).entry(2, longer))), Worked());
}

// The signer of a ticket.

TEST_F(Acceptance, ATicketOfAnotherAuthorityIsRefused) {
    TicketChain stranger;
    stranger.root.key = SigningKey::generate(KeyKind::p256);
    const IssuedChain chain = stranger.issue();
    EXPECT_THAT(stapleTicket(SatchelBuilder::of(chain, payload().build()).build()), Refused());
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(Acceptance, ATicketSignedByAnOrdinaryServerIsRefused) {
    trust(serverChain.root);
    EXPECT_THAT(stapleTicket(SatchelBuilder::of(serverChain, payload().build()).build()), Refused());
}

TEST_F(Acceptance, ATicketWhoseSignerTheUserDeniesIsRefused) {
    trust(ticketChain.leaf, "user-trust/deny");
    EXPECT_THAT(stapleTicket(ticket()), Refused());
}

TEST_F(Acceptance, ATicketStaysGoodWhenItsCertificatesHaveExpired) {
    TicketChain aged;
    for (CertificateFields* fields : {&aged.root, &aged.intermediate, &aged.leaf})
        fields->notAfter = {1600000000};
    ticketChain = aged.issue();
    trust(ticketChain.root);
    EXPECT_THAT(stapleTicket(ticket()), Worked());
    EXPECT_THAT(validate(), Ended(0, ElementsAre(processing(), kValidated)));
}

TEST_F(Acceptance, NoByteOfATicketMayChange) {
    const Data genuine =
        container(payload().build()).signatureSize(72).build();  // no padding: every byte counts
    ASSERT_THAT(stapleTicket(genuine), Worked());
    std::filesystem::remove(ticketPath());
    for (std::size_t at = 0; at < genuine.size(); at += 41) {
        Data changed = genuine;
        changed[at] ^= std::byte{0x10};
        EXPECT_THAT(stapleTicket(changed), Refused()) << "byte " << at;
    }
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(Acceptance, ATicketMustBeWhole) {
    const Data genuine = ticket();
    for (const std::size_t size : {std::size_t{1}, std::size_t{16}, genuine.size() / 2, genuine.size() - 1})
        EXPECT_THAT(stapleTicket({genuine.begin(), genuine.begin() + static_cast<std::ptrdiff_t>(size)}),
                    Refused());
    Data longer = genuine;
    longer.push_back(std::byte{0});
    EXPECT_THAT(stapleTicket(longer), Refused());
}

TEST_F(Acceptance, LengthsBeyondTheTicketAreRefused) {
    for (const std::uint32_t length : {0xFFFFFFFFU, 0x80000000U, 0U}) {
        EXPECT_THAT(stapleTicket(container(payload().build()).certificateBlockLength(length).build()),
                    Refused());
        EXPECT_THAT(stapleTicket(container(payload().build()).payloadLength(length).build()), Refused());
        EXPECT_THAT(stapleTicket(sealed(payload().count(length == 0 ? 2 : length))), Refused());
    }
}

// Revocation.

TEST_F(Acceptance, ARevokedTicketIsReportedInsteadOfTheActionsOutcome) {
    EXPECT_THAT(stapleTicket(revokedTicket()), RefusedAsRevoked());
    EXPECT_EQ(stapled(), std::nullopt);
}

TEST_F(Acceptance, ARevokedTicketNeedNotListTheFile) {
    EXPECT_THAT(stapleTicket(sealed(TicketPayloadBuilder().revoked())), RefusedAsRevoked());
}

TEST_F(Acceptance, AForgedRevocationRevokesNothing) {
    const Data genuine = payload().revoked().build();
    EXPECT_THAT(stapleTicket(container(genuine).signature(Data(70, std::byte{1})).build()), Refused());
}

TEST_F(Acceptance, OtherFlagsMeanNothing) {
    EXPECT_THAT(stapleTicket(sealed(payload().flags(0xFFFFFFFE))), Worked());
    EXPECT_THAT(stapleTicket(sealed(payload().flags(0xFFFFFFFF))), RefusedAsRevoked());
}

TEST_F(Acceptance, AStapleThatIsRefusedLeavesTheOlderTicketInPlace) {
    const Data older = ticket();
    stapleByHand(older);
    EXPECT_THAT(stapleTicket(revokedTicket()), RefusedAsRevoked());
    EXPECT_THAT(stapleTicket(ticketForOthers()), Refused());
    EXPECT_EQ(stapled(), older);
}

// Validation: the stapled ticket and the service's.

TEST_F(Acceptance, AValidationAsksTheServiceTooAndChangesNothing) {
    const Data old = ticket();
    const Data current = sealed(payload().signatureTime(1));
    stapleByHand(old);
    EXPECT_THAT(validateAgainst(current), Ended(0, ElementsAre(processing(), kValidated)));
    EXPECT_EQ(service().requests().size(), 1U);
    EXPECT_EQ(stapled(), old);
    EXPECT_EQ(keptTicket(), base::toString(current));
}

TEST_F(Acceptance, ATicketThatWasRevokedSinceItWasStapledFailsTheValidation) {
    const Data old = ticket();
    stapleByHand(old);
    EXPECT_THAT(validateAgainst(revokedTicket()), RefusedAsRevoked());
    EXPECT_EQ(stapled(), old);
}

TEST_F(Acceptance, AValidationFailsWhenTheServicesTicketDoes) {
    stapleByHand(ticket());
    EXPECT_THAT(validateAgainst(ticketForOthers()),
                Ended(65, ElementsAre(processing(), refusal(), validateFailed(65))));
}

TEST_F(Acceptance, AValidationFailsWhenTheServiceHasNoTicket) {
    stapleByHand(ticket());
    serve(answer(R"({"records":[{"reason":"Record not found"}]})"));
    EXPECT_THAT(validate(), Ended(65, ElementsAre(processing(), StartsWith("Lumora query for Sample.app "),
                                                  noTicketLine(), validateFailed(65))));
}

TEST_F(Acceptance, AValidationFailsWhenTheServiceCannotBeReached) {
    stapleByHand(ticket());
    contact("127.0.0.1:1");
    EXPECT_THAT(validate(), Ended(68, ElementsAre(processing(),
                                                  StartsWith("error is Error Domain=URLErrorDomain Code=4 "),
                                                  "Lumora's response is inconsistent with expections: (null)",
                                                  validateFailed(68))));
}

// Keeping the ticket.

TEST_F(Acceptance, ATicketThatCannotBeKeptIsNotStapled) {
    environment["TMPDIR"] = directory / "nowhere";
    const std::string url =
        values::URL::fileURLWithPath(directory / "nowhere/REQUEST.ticket").absoluteString();
    const auto line =
        StartsWith("Could not write ticket to " + url + " due to Error Domain=POSIXErrorDomain Code=2 ");
    EXPECT_THAT(stapleTicket(ticket()), Ended(73, ElementsAre(processing(), line, stapleFailed(73))));
    EXPECT_EQ(stapled(), std::nullopt);

    stapleByHand(ticket());
    EXPECT_THAT(validate(), Ended(73, ElementsAre(processing(), line, validateFailed(73))));
}

TEST_F(Acceptance, ADirectoryInTheTicketFilesPlaceIsNotReplaced) {
    std::filesystem::create_directory(temporaryPath("REQUEST.ticket"));
    EXPECT_THAT(stapleTicket(ticket()),
                Ended(73, ElementsAre(processing(), StartsWith("Could not write ticket to file://"),
                                      stapleFailed(73))));
    EXPECT_EQ(stapled(), std::nullopt);
    EXPECT_THAT(temporaryFiles(), ElementsAre("REQUEST.ticket"));
}

TEST_F(Acceptance, ATicketFileOfAnEarlierRunIsReplaced) {
    writeFile(temporaryPath("REQUEST.ticket"), std::string(100000, 'x'));
    const Data genuine = ticket();
    EXPECT_THAT(stapleTicket(genuine), Worked());
    EXPECT_EQ(stapled(), genuine);
    EXPECT_EQ(keptTicket(), base::toString(genuine));
}

// A file that changes during the lookup.

class ChangingFile : public Acceptance {
  protected:
    /// The file's change between the lookup's request and its response.
    template <class Change>
    ProcessResult stapleWhile(Change change) {
        const Gate gate;
        service().enqueue(Script().readRequest().waitFor(gate).send(answer(inlineRecord(ticket())).bytes()));
        RunningProcess run(command({"staple", bundle}));
        EXPECT_TRUE(gate.waitUntilReached());
        change();
        gate.open();
        return run.wait();
    }
    std::string writtenInVain() const {
        return "Although we wrote the ticket, the written data did not validate. Please restore " + bundle +
               " from backup to try again.";
    }
};

TEST_F(ChangingFile, IsReadAfreshAfterTheWrite) {
    const Data other =
        CodeDirectoryBuilder().identifier("com.example.other").covers(2, emptyRequirements()).build();
    EXPECT_THAT(
        stapleWhile([&] {
            BundleBuilder()
                .executable(
                    ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(other).build()).build())
                .write(bundle);
        }),
        Ended(73, ElementsAre(processing(), processing(), writtenInVain(), stapleFailed(73))));
}

TEST_F(ChangingFile, ThatLosesItsSignatureIsNoLongerVouchedFor) {
    EXPECT_THAT(stapleWhile([&] { std::filesystem::remove(bundle + "/Contents/Programs/Sample"); }),
                Ended(73, ElementsAre(processing(), processing(), writtenInVain(), stapleFailed(73))));
}

TEST_F(ChangingFile, ThatBecomesAnotherKindCannotBeReadBack) {
    // Only its executable makes it a bundle.
    const std::string generic = directory / "builds/Sample";
    std::filesystem::rename(bundle, generic);
    bundle = generic;
    EXPECT_THAT(stapleWhile([&] { std::filesystem::remove(bundle + "/Contents/Programs/Sample"); }),
                Ended(73, ElementsAre(processing(), processing(),
                                      "Pinwell is incapable of working with folder files.", writtenInVain(),
                                      stapleFailed(73))));
}

TEST_F(ChangingFile, ThatIsMovedAwayDoesNotValidateWhereItWas) {
    EXPECT_THAT(
        stapleWhile([&] { std::filesystem::rename(bundle, bundle + ".moved"); }),
        Ended(73,
              ElementsAre(processing(), processing(),
                          "Although we wrote the ticket, the written data did not validate. Please restore " +
                              bundle + " from backup to try again.",
                          stapleFailed(73))));
    EXPECT_FALSE(std::filesystem::exists(bundle));
}

TEST_F(ChangingFile, ThatGetsALinkInTheTicketsPlaceIsLeftAlone) {
    const std::string victim = directory / "victim";
    writeFile(victim, std::string_view("precious"));
    EXPECT_THAT(stapleWhile([&] { std::filesystem::create_symlink(victim, ticketPath()); }),
                Ended(73, ElementsAre(processing(), stapleFailed(73))));
    EXPECT_EQ(readFile(victim), "precious");
}

TEST_F(ChangingFile, ThatIsStapledByAnotherRunMeanwhileEndsWithAGoodTicket) {
    EXPECT_THAT(stapleWhile([&] { stapleByHand(ticket()); }), Worked());
    EXPECT_EQ(base::toString(*stapled()), keptTicket());
}

}  // namespace
}  // namespace pinwell::test
