#include "lumora-local/admin_routes.h"

#include <gtest/gtest.h>

#include "lumora-local/admin_service.h"

namespace pinwell::lumora {
namespace {

const std::string kHex(40, 'a');
const std::string kName = "2/2/" + kHex;

template <class Parse>
int statusOf(Parse parse, const std::string& body) {
    try {
        parse(body);
    } catch (const Refused& refused) {
        return refused.status();
    }
    return 0;
}
int ticketStatus(const std::string& body) {
    return statusOf(parseTicketRequest, body);
}
int revocationStatus(const std::string& body) {
    return statusOf(parseRevocationRequest, body);
}
std::string with(const std::string& members) {
    return R"({"record":")" + kName + R"(",)" + members + "}";
}

TEST(TicketBody, RequiresOnlyTheRecord) {
    const TicketRequest request = parseTicketRequest(R"({"record":")" + kName + R"("})");
    EXPECT_EQ(recordName(request.artefact.own), kName);
    EXPECT_TRUE(request.artefact.others.empty());
    EXPECT_EQ(request.artefact.label, "");
    EXPECT_EQ(request.environment, Environment::production);
    EXPECT_FALSE(request.reinstates);
}

TEST(TicketBody, AcceptsAllOfItsMembers) {
    const TicketRequest request = parseTicketRequest(
        with(R"("hashes":["2/2/)" + std::string(40, 'b') + R"(","2/4/)" + std::string(96, 'c') +
             R"("],"label":"Caf\u00e9.app","environment":"development","reinstate":true,"comment":"why")"));
    ASSERT_EQ(request.artefact.others.size(), 2U);
    EXPECT_EQ(request.artefact.others[1].algorithm, 4U);
    EXPECT_EQ(request.artefact.label, "Caf\u00e9.app");
    EXPECT_EQ(request.environment, Environment::development);
    EXPECT_TRUE(request.reinstates);
    EXPECT_EQ(request.comment, "why");
}

TEST(TicketBody, IsRefusedUnlessItIsAJsonObject) {
    for (const char* body : {"", "{", "[]", "null", "1", "\"a\"", "{\"record\":\"\xff\"}", "{} {}"})
        EXPECT_EQ(ticketStatus(body), 400) << body;
}

TEST(TicketBody, IsRefusedIfAMemberIsMissingUnknownOrOfAnotherType) {
    for (const std::string& body :
         {std::string("{}"), std::string(R"({"record":null})"), std::string(R"({"record":7})"),
          std::string(R"({"record":"2/2/AAAA"})"), R"({"record":"2/9/)" + kHex + R"("})",
          with(R"("Label":"x")"), with(R"("label":7)"), with(R"("label":null)"), with(R"("hashes":{})"),
          with(R"("hashes":[7])"), with(R"("hashes":["2/2/ab"])"), with(R"("environment":"test")"),
          with(R"("environment":"")"), with(R"("reinstate":1)"), with(R"("comment":[])")}) {
        EXPECT_EQ(ticketStatus(body), 422) << body;
    }
}

/// Another reader of the request, such as a filter, may use the other one.
TEST(TicketBody, IsRefusedWithARepeatedMember) {
    EXPECT_EQ(ticketStatus(with(R"("label":"a","label":"b")")), 400);
    EXPECT_EQ(ticketStatus(with(R"("label":"a","\u006cabel":"b")")), 400);
    EXPECT_EQ(revocationStatus(with(R"("comment":"a","comment":"b")")), 400);
}

TEST(TicketBody, IsRefusedBeyondItsBounds) {
    const auto label = [](std::size_t size) { return with(R"("label":")" + std::string(size, 'x') + '"'); };
    EXPECT_EQ(ticketStatus(label(kMaximumLabelBytes)), 0);
    EXPECT_EQ(ticketStatus(label(kMaximumLabelBytes + 1)), 422);
    const auto comment = [](std::size_t size) {
        return with(R"("comment":")" + std::string(size, 'x') + '"');
    };
    EXPECT_EQ(ticketStatus(comment(kMaximumCommentBytes)), 0);
    EXPECT_EQ(ticketStatus(comment(kMaximumCommentBytes + 1)), 422);
    const auto hashes = [](std::size_t count) {
        std::string list;
        for (std::size_t i = 0; i < count; ++i) list += (i > 0 ? ",\"" : "\"") + kName + '"';
        return with("\"hashes\":[" + list + "]");
    };
    EXPECT_EQ(ticketStatus(hashes(kMaximumListedHashes)), 0);
    EXPECT_EQ(ticketStatus(hashes(kMaximumListedHashes + 1)), 422);
}

TEST(TicketBody, IsRefusedWithControlCharacters) {
    for (const char* text : {R"(a\nb)", R"(\u0000)", R"(\u001b[2J)", R"(\u007f)", R"(\u0085)"}) {
        EXPECT_EQ(ticketStatus(with(std::string(R"("label":")") + text + '"')), 422) << text;
        EXPECT_EQ(ticketStatus(with(std::string(R"("comment":")") + text + '"')), 422) << text;
    }
}

TEST(TicketBody, RefusesHashesThatNoTicketListsTogether) {
    EXPECT_EQ(ticketStatus(with(R"("hashes":["1/)" + kHex + R"("])")), 422);
    EXPECT_EQ(ticketStatus(R"({"record":"1/)" + kHex + R"(","hashes":["1/)" + kHex + R"("]})"), 0);
    EXPECT_EQ(ticketStatus(R"({"record":"1/)" + kHex + R"(","hashes":["2/2/)" + kHex + R"("]})"), 422);
}

TEST(TicketBody, RequiresACommentToReinstate) {
    EXPECT_EQ(ticketStatus(with(R"("reinstate":true)")), 422);
    EXPECT_EQ(ticketStatus(with(R"("reinstate":true,"comment":" \t")")), 422);
    EXPECT_EQ(ticketStatus(with(R"("reinstate":true,"comment":"   ")")), 422);
    EXPECT_EQ(ticketStatus(with(R"("reinstate":true,"comment":"why")")), 0);
    EXPECT_EQ(ticketStatus(with(R"("reinstate":false)")), 0);
}

TEST(TicketBody, IsRefusedIfDeeplyNested) {
    EXPECT_EQ(ticketStatus(with("\"hashes\":" + std::string(100'000, '['))), 400);
}

TEST(RevocationBody, AcceptsAReasonAndAComment) {
    const RevocationRequest request =
        parseRevocationRequest(with(R"("reason":"compromised","comment":"key lost")"));
    EXPECT_EQ(request.record, kName);
    EXPECT_EQ(request.reason, Reason::compromised);
    EXPECT_EQ(request.comment, "key lost");
    EXPECT_EQ(parseRevocationRequest(R"({"record":")" + kName + R"("})").reason, Reason::unspecified);
}

TEST(RevocationBody, IsRefusedIfAMemberIsOutOfBounds) {
    for (const std::string& body : {std::string("{}"), with(R"("reason":"bored")"), with(R"("reason":"")"),
                                    with(R"("hashes":[])"), with(R"("environment":7)")}) {
        EXPECT_EQ(revocationStatus(body), 422) << body;
    }
    EXPECT_EQ(revocationStatus("7"), 400);
}

TEST(RefusedAttempt, NamesTheRecordIfItCanBeRead) {
    EXPECT_EQ(attemptIn(with(R"("label":7,"environment":"development")")).record, kName);
    EXPECT_EQ(attemptIn(with(R"("label":7,"environment":"development")")).environment,
              Environment::development);
    for (const char* body : {"", "{", "[]", R"({"record":7})", R"({"record":"x\u001b"})"})
        EXPECT_EQ(attemptIn(body).record, "") << body;
}

TEST(IdempotencyKey, IsAcceptedWithAndWithoutQuotes) {
    EXPECT_EQ(parseIdempotencyKey("\"8e03978e-40d5\""), "8e03978e-40d5");
    EXPECT_EQ(parseIdempotencyKey("8e03978e-40d5"), "8e03978e-40d5");
    EXPECT_EQ(parseIdempotencyKey(std::string(255, 'k')).size(), 255U);
}

TEST(IdempotencyKey, IsRefusedIfEmptyTooLongOrInvisible) {
    for (const std::string& header :
         {std::string(), std::string("\"\""), std::string("\""), std::string("a b"),
          std::string("\"a\", \"b\""), std::string("a;b"), std::string("a\\b"), std::string("\"a"),
          std::string("\xc3\xa9"), std::string(256, 'k')}) {
        EXPECT_THROW(parseIdempotencyKey(header), Refused) << header;
    }
}

}  // namespace
}  // namespace pinwell::lumora
