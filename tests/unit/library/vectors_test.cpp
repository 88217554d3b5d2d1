// The test vectors, through the C interface and through the C++ one.
#include <pinwell/ticket.h>

#include <algorithm>
#include <utility>

#include "c_handles.h"
#include "vector_artefacts.h"

namespace pinwell::test {
namespace {

using values::Value;
using Failed = std::vector<std::pair<std::string, std::string>>;

constexpr std::size_t kFewestVectors = 50;

const std::string& text(const Value& value) {
    return *value.string();
}

Failed expectedFailures(const Value& verify) {
    Failed failed;
    for (const Value& pair : *verify["failed"].array())
        failed.emplace_back(text(pair[std::size_t{0}]), text(pair[std::size_t{1}]));
    return failed;
}

Failed failuresOf(const CResult& result) {
    Failed failed;
    for (std::size_t i = 0; i < pinwell_result_check_count(result.get()); ++i) {
        pinwell_check check = PINWELL_CHECK_INIT;
        EXPECT_EQ(pinwell_result_check(result.get(), i, &check), PINWELL_OK);
        if (check.outcome >= PINWELL_OUTCOME_UNREADABLE)
            failed.emplace_back(std::string(check.name, check.name_length),
                                std::string(check.place, check.place_length));
    }
    std::sort(failed.begin(), failed.end());
    return failed;
}

class Vectors : public testing::Test {
  protected:
    void SetUp() override { ASSERT_GT(artefacts.all().size(), kFewestVectors); }

    static void expectVerdict(const CResult& result, const Value& expected) {
        EXPECT_EQ(pinwell_verdict_text(pinwell_result_verdict(result.get())), text(expected["verdict"]));
        EXPECT_EQ(pinwell_result_exit_status(result.get()), *expected["exitStatus"].integer());
        EXPECT_NE(textOf(pinwell_result_reason, result), "");
    }

    const VectorArtefacts& artefacts = VectorArtefacts::shared();
    const CRoots roots = cRoots(VectorArtefacts::platform());
};

TEST_F(Vectors, AreJudgedAsExpected) {
    for (const auto& [expected, path] : artefacts.all()) {
        SCOPED_TRACE(text(expected["name"]));
        const CResult result = judged(path, roots);
        expectVerdict(result, expected["judge"]);
        EXPECT_EQ(pinwell_kind_text(pinwell_result_kind(result.get())), text(expected["kind"]));
        EXPECT_EQ(textOf(pinwell_result_record_name, result), text(expected["recordName"]));
    }
}

TEST_F(Vectors, AreVerifiedAsExpected) {
    for (const auto& [expected, path] : artefacts.all()) {
        SCOPED_TRACE(text(expected["name"]));
        const CResult result = verified(path, roots);
        expectVerdict(result, expected["verify"]);
        EXPECT_EQ(failuresOf(result), expectedFailures(expected["verify"]));
    }
}

TEST_F(Vectors, AreVerifiedByOneThreadAsBySeveral) {
    pinwell_options options = PINWELL_OPTIONS_INIT;
    for (const std::uint32_t threads : {1U, 3U}) {
        options.threads = threads;
        for (const auto& [expected, path] : artefacts.all())
            EXPECT_EQ(failuresOf(verified(path, roots, &options)), expectedFailures(expected["verify"]))
                << path;
    }
}

TEST_F(Vectors, HaveTheirTicketsWhereExpected) {
    for (const auto& [expected, path] : artefacts.all()) {
        SCOPED_TRACE(text(expected["name"]));
        const Value& wanted = expected["ticket"];
        pinwell_ticket* found = nullptr;
        EXPECT_EQ(pinwell_find_ticket(path.c_str(), path.size(), &found, nullptr),
                  *wanted["status"].integer());
        const CTicket ticket(found);
        EXPECT_EQ(found != nullptr, *wanted["status"].integer() == PINWELL_OK);
        if (found == nullptr) continue;
        const std::string& below = text(wanted["file"]);
        EXPECT_EQ(textOf(pinwell_ticket_file, ticket), below.empty() ? path : path + "/" + below);
        EXPECT_EQ(pinwell_ticket_offset(found), wanted["offset"].unsignedIntegerValue());
        const std::string bytes = textOf(pinwell_ticket_bytes, ticket);
        EXPECT_EQ(bytes.size(), wanted["length"].unsignedIntegerValue());
        EXPECT_EQ(
            bytes,
            readFile(textOf(pinwell_ticket_file, ticket)).substr(pinwell_ticket_offset(found), bytes.size()));
        EXPECT_EQ(bytes, textOf(pinwell_result_ticket, judged(path, roots)));
    }
}

TEST_F(Vectors, HaveTicketsThatTheCxxInterfaceJudgesAlike) {
    const auto cxxRoots = ticket::TrustedRoots::fromPlatformDirectory(VectorArtefacts::platform());
    std::size_t count = 0;
    for (const auto& [expected, path] : artefacts.all()) {
        SCOPED_TRACE(text(expected["name"]));
        const CResult result = judged(path, roots);
        const std::string bytes = textOf(pinwell_result_ticket, result);
        const std::string hash = textOf(pinwell_result_code_hash, result);
        if (bytes.empty() || hash.empty()) continue;
        ++count;
        const ticket::ByteView hashes[] = {base::asBytes(hash)};
        const auto validation = ticket::validate(base::asBytes(bytes), cxxRoots, 0, hashes);
        const pinwell_verdict verdict = pinwell_result_verdict(result.get());
        EXPECT_EQ(validation.isAcceptable(), verdict == PINWELL_VERDICT_GOOD);
        EXPECT_EQ(validation.isGenuine && validation.isRevoked, verdict == PINWELL_VERDICT_REVOKED);
    }
    EXPECT_GT(count, kFewestVectors / 2);
}

}  // namespace
}  // namespace pinwell::test
