// One artefact before and after its lookup: reads, writes and messages, and its later recognition.
#include "retrieval/artefact_run.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "base/text.h"
#include "src/DownloadDelegate.h"
#include "support/hash_by_executable.h"
#include "support/test_platform.h"

namespace pinwell::test {
namespace {

using retrieval::Answer;
using retrieval::ArtefactRun;
using retrieval::Cause;
using retrieval::Kind;
using retrieval::Outcome;
using testing::AllOf;
using testing::Contains;
using testing::EndsWith;
using testing::Field;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::Optional;
using testing::StartsWith;

auto Ended(int exitStatus, Cause cause) {
    return Optional(AllOf(Field(&Outcome::exitStatus, exitStatus), Field(&Outcome::cause, cause)));
}

/// A bundle with its own hash.
class Artefacts : public testing::Test {
  protected:
    Artefacts() {
        std::filesystem::create_directory(platform.directory / "tmp");
        writeBundle(path, "first");
    }
    ArtefactRun made(std::uint8_t operation) { return ArtefactRun(path, operation, services); }
    std::string stapled() const {
        return std::filesystem::exists(carrier) ? readFile(carrier) : std::string("none");
    }
    void staple(const base::Data& bytes) const { writeFile(carrier, base::ByteView(bytes)); }
    /// A response of the record service.
    static Answer answered(const std::string& record) {
        Answer answer;
        answer.kind = Answer::Kind::answered;
        answer.response =
            https::HTTPResponse{*values::URL::fromString("https://api.lumora.example/"), 200, {}};
        answer.body = base::toData(R"({"records":[)" + record + "]}");
        return answer;
    }
    static Answer answered(const base::Data& bytes) {
        return answered(R"({"fields":{"signedTicket":{"value":")" + base::encodeBase64(bytes) + R"("}}})");
    }
    static Answer notIssued() { return answered(R"({"reason":"Record not found"})"); }
    static Answer failed(Answer::Kind kind) {
        Answer answer;
        answer.kind = kind;
        answer.error = base::Error(base::kURLErrorDomain, 4, "no connection");
        return answer;
    }

    TestPlatform platform;
    HashByExecutable codeSigning;
    const Platform services = platform.servicesWith(codeSigning);
    const std::string path = platform.directory / "App.app";
    const std::string executable = path + "/Contents/MacOS/App";
    const std::string carrier = path + "/Contents/CodeResources";
    const base::Data ticket = unsignedTicket({base::toData("first...............")});
};

// Staples.

TEST_F(Artefacts, AStapleLooksUpARecordAndWritesItsTicket) {
    ArtefactRun run = made(kOperationStaple);
    EXPECT_EQ(run.begin(), std::nullopt);
    EXPECT_EQ(run.recordName(), "2/2/66697273742e2e2e2e2e2e2e2e2e2e2e2e2e2e2e");
    EXPECT_EQ(run.kind(), Kind::bundle);
    EXPECT_THAT(run.end(answered(ticket)), Ended(0, Cause::worked));
    EXPECT_EQ(stapled(), base::toString(ticket));
    EXPECT_EQ(run.messages().back(), "The staple and validate action worked!");
}

TEST_F(Artefacts, AStapleEndsAccordingToItsResponse) {
    struct Row {
        Answer answer;
        int exitStatus;
        Cause cause;
    };
    const std::vector<Row> rows = {
        {failed(Answer::Kind::unreachable), 68, Cause::unreachable},
        {failed(Answer::Kind::untrusted), 68, Cause::untrusted},
        {notIssued(), 65, Cause::notIssued},
        {answered(base::toData("no ticket")), 65, Cause::notAcceptable},
        {answered(unsignedTicket({base::Data(20, std::byte{1})})), 65, Cause::notAcceptable},
    };
    for (const Row& row : rows) {
        ArtefactRun run = made(kOperationStaple);
        ASSERT_EQ(run.begin(), std::nullopt);
        EXPECT_THAT(run.end(row.answer), Ended(row.exitStatus, row.cause)) << nameOf(row.cause);
        EXPECT_EQ(stapled(), "none");
    }
}

TEST_F(Artefacts, AnAssetWithoutAFetchIsUnreachable) {
    ArtefactRun run = made(kOperationStaple);
    ASSERT_EQ(run.begin(), std::nullopt);
    Answer answer = answered(
        R"({"fields":{"signedTicketAsset":{"value":{"downloadURL":"https://a.example/${f}","size":3}}}})");
    answer.errorIsOfAsset = true;
    answer.kind = Answer::Kind::unreachable;
    EXPECT_THAT(run.end(answer), Ended(68, Cause::unreachable));
    EXPECT_EQ(stapled(), "none");
}

TEST_F(Artefacts, AnAssetIsWrittenAsATicketIs) {
    ArtefactRun run = made(kOperationStaple);
    ASSERT_EQ(run.begin(), std::nullopt);
    Answer answer = answered(
        R"({"fields":{"signedTicketAsset":{"value":{"downloadURL":"https://a.example/${f}","size":)" +
        std::to_string(ticket.size()) + "}}}}");
    answer.asset = Answer::Asset{*answer.response, ticket};
    EXPECT_THAT(run.end(answer), Ended(0, Cause::worked));
    EXPECT_EQ(stapled(), base::toString(ticket));
}

TEST_F(Artefacts, ARunThatWasReleasedReadsAgain) {
    ArtefactRun run = made(kOperationStaple);
    ASSERT_EQ(run.begin(), std::nullopt);
    run.release();
    EXPECT_THAT(run.recordName(), Not(IsEmpty()));
    EXPECT_THAT(run.end(answered(ticket)), Ended(0, Cause::worked));
}

TEST_F(Artefacts, AnArtefactWithAnotherHashByThenIsLookedUpAgain) {
    ArtefactRun run = made(kOperationStaple);
    ASSERT_EQ(run.begin(), std::nullopt);
    writeBundle(path, "second");
    EXPECT_EQ(run.end(answered(ticket)), std::nullopt);
    EXPECT_THAT(run.recordName(), StartsWith("2/2/7365636f6e64"));
    EXPECT_EQ(stapled(), "none");
    EXPECT_THAT(run.end(answered(unsignedTicket({base::toData("second..............")}))),
                Ended(0, Cause::worked));
}

TEST_F(Artefacts, AnArtefactRemovedByThenIsUnreadable) {
    ArtefactRun run = made(kOperationStaple);
    ASSERT_EQ(run.begin(), std::nullopt);
    std::filesystem::remove_all(path);
    EXPECT_THAT(run.end(answered(ticket)), Optional(Field(&Outcome::exitStatus, Not(0))));
    EXPECT_FALSE(std::filesystem::exists(path));
}

TEST_F(Artefacts, AnExceptionEndsTheRunOfItsArtefact) {
    writeBundle(path, HashByExecutable::kRaises);
    ArtefactRun run = made(kOperationStaple);
    EXPECT_THAT(run.begin(), Ended(66, Cause::notReadable));
    EXPECT_THAT(run.messages(), Contains(HasSubstr("nobody has thought of this")));
    writeBundle(path, "first");
    ASSERT_EQ(run.begin(), std::nullopt);
    writeBundle(path, HashByExecutable::kRaises);
    EXPECT_THAT(run.end(answered(ticket)), Ended(73, Cause::notWritable));
}

TEST_F(Artefacts, ATextWithAZeroByteIsNoPath) {
    ArtefactRun run(path + std::string("\0x", 2), kOperationStaple, services);
    EXPECT_THAT(run.begin(), Ended(66, Cause::notReadable));
}

// Validations.

TEST_F(Artefacts, AValidationWithoutATicketNeedsNoLookup) {
    EXPECT_THAT(made(kOperationValidate).begin(), Ended(65, Cause::notStapled));
    staple(base::toData("no ticket"));
    EXPECT_THAT(made(kOperationValidate).begin(), Ended(65, Cause::notAcceptable));
}

TEST_F(Artefacts, AValidationGoesByTheServicesTicketToo) {
    staple(ticket);
    ArtefactRun run = made(kOperationValidate);
    ASSERT_EQ(run.begin(), std::nullopt);
    EXPECT_THAT(run.end(answered(ticket)), Ended(0, Cause::worked));
    constexpr std::uint32_t kRevoked = 1;
    ASSERT_EQ(run.begin(), std::nullopt);
    EXPECT_THAT(run.end(answered(unsignedTicket({}, kRevoked))), Ended(77, Cause::revoked));
    EXPECT_EQ(stapled(), base::toString(ticket));
}

// Tickets that exist already.

TEST_F(Artefacts, AttachingTakesTheTicketOfTheRecord) {
    std::string asked;
    EXPECT_THAT(made(kOperationStaple).attach([&](const std::string& name) {
        asked = name;
        return ticket;
    }),
                AllOf(Field(&Outcome::exitStatus, 0), Field(&Outcome::cause, Cause::worked)));
    EXPECT_EQ(asked, "2/2/66697273742e2e2e2e2e2e2e2e2e2e2e2e2e2e2e");
    EXPECT_EQ(stapled(), base::toString(ticket));
}

TEST_F(Artefacts, AttachingDistinguishesAMissingTicketFromAnUnreadableOne) {
    const auto causeAfter = [&](int code) {
        return made(kOperationStaple)
            .attach([code](const std::string& name) -> base::Result<base::Data> {
                return base::Error::posix(code, name);
            })
            .cause;
    };
    EXPECT_EQ(causeAfter(ENOENT), Cause::notIssued);
    EXPECT_EQ(causeAfter(EACCES), Cause::notReadable);
    EXPECT_EQ(stapled(), "none");
}

// Recognising the files later.

TEST_F(Artefacts, TheStateOfTheFilesIsAsAStapleLeftThem) {
    ArtefactRun run = made(kOperationStaple);
    ASSERT_EQ(run.begin(), std::nullopt);
    EXPECT_EQ(run.filesState(), "") << "there is no ticket yet";
    ASSERT_THAT(run.end(answered(ticket)), Ended(0, Cause::worked));
    const std::string left = run.filesState();
    run.release();
    EXPECT_EQ(run.filesState(), left);
    ArtefactRun next = made(kOperationStaple);
    ASSERT_EQ(next.begin(), std::nullopt);
    EXPECT_EQ(next.filesState(), left);
}

TEST_F(Artefacts, TheStateOfTheFilesShowsEveryChangeOfExecutableAndTicket) {
    staple(ticket);
    const auto state = [this] {
        ArtefactRun run = made(kOperationStaple);
        EXPECT_EQ(run.begin(), std::nullopt);
        return run.filesState();
    };
    const std::string before = state();
    EXPECT_EQ(state(), before) << "reading changes nothing";
    for (const std::string& file : {executable, carrier}) {
        const std::string then = state();
        waitForAnotherTimeThan(file);
        // The same bytes, written again with the old time: nothing proves that they are the same.
        const auto time = std::filesystem::last_write_time(file);
        writeFile(file, readFile(file));
        std::filesystem::last_write_time(file, time);
        EXPECT_NE(state(), then) << file;
    }
    std::filesystem::remove(carrier);
    EXPECT_EQ(state(), "");
}

}  // namespace
}  // namespace pinwell::test
