// Lookups of many names, with a service that responds in any way.
#include "retrieval/record_service.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <thread>

#include "support/answering_sessions.h"
#include "support/test_platform.h"

namespace pinwell::test {
namespace {

using retrieval::Answer;
using retrieval::Cancellation;
using retrieval::Clock;
using retrieval::RecordService;
using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::AllOf;
using testing::Each;
using testing::ElementsAre;
using testing::Field;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;
using testing::StartsWith;

using Names = std::vector<std::string>;
using Reply = AnsweringSessions::Reply;

std::string recordOf(const std::string& name) {
    return R"({"reason":"of )" + name + R"(","recordName":")" + name + R"("})";
}

Reply recordsOf(const Names& names) {
    std::string records;
    for (const std::string& name : names) records += (records.empty() ? "" : ",") + recordOf(name);
    return {.headers = {{"X-Ostrel-Request-UUID", "REQUEST"}}, .body = R"({"records":[)" + records + "]}"};
}

testing::Matcher<const Answer&> HasKind(Answer::Kind kind) {
    return Field("kind", &Answer::kind, kind);
}

testing::Matcher<const Answer&> Tells(const std::string& name) {
    return AllOf(HasKind(Answer::Kind::answered),
                 testing::ResultOf(
                     "body", [](const Answer& answer) { return base::toString(answer.body); },
                     R"({"records":[)" + recordOf(name) + "]}"));
}

/// A service that by default knows every record.
class Lookup : public testing::Test {
  protected:
    std::vector<Answer> lookUp(const Names& names, std::optional<Clock::time_point> deadline = std::nullopt) {
        return service.lookUp(names, cancellation, deadline);
    }
    /// So many names.
    static Names namesUpTo(std::size_t count) {
        Names names;
        for (std::size_t i = 0; i < count; ++i) names.push_back("2/2/" + std::to_string(i));
        return names;
    }
    static void expectRightAnswers(const std::vector<Answer>& answers, const Names& names) {
        ASSERT_THAT(answers, SizeIs(names.size()));
        for (std::size_t i = 0; i < names.size(); ++i) EXPECT_THAT(answers[i], Tells(names[i]));
    }
    static std::size_t groupsAmong(const std::vector<Names>& lookups) {
        return static_cast<std::size_t>(
            std::count_if(lookups.begin(), lookups.end(), [](const Names& one) { return one.size() > 1; }));
    }

    TestPlatform platform;
    AnsweringSessions sessions{
        [](const https::Request& request) { return recordsOf(AnsweringSessions::namesIn(request)); }};
    Cancellation cancellation;
    RecordService service{platformWith(platform.services(), sessions)};
};

// Groups.

TEST_F(Lookup, OfManyNamesIsOneRequestWithSeparateResults) {
    const Names names = namesUpTo(retrieval::kNamesPerRequest);
    const auto answers = lookUp(names);
    expectRightAnswers(answers, names);
    EXPECT_THAT(sessions.lookups(), ElementsAre(names));
    std::set<std::string> identifiers;
    for (const Answer& answer : answers)
        identifiers.insert(answer.response->header("X-Ostrel-Request-UUID").value_or(""));
    EXPECT_THAT(identifiers, AllOf(SizeIs(names.size()), Each(StartsWith("REQUEST-"))));
}

TEST_F(Lookup, OfNothingSendsNoRequest) {
    EXPECT_THAT(lookUp({}), IsEmpty());
    EXPECT_THAT(sessions.requests(), IsEmpty());
}

TEST_F(Lookup, KeepsItsConnection) {
    for (int i = 0; i < 3; ++i) expectRightAnswers(lookUp({"2/2/a", "2/2/b"}), {"2/2/a", "2/2/b"});
    EXPECT_EQ(sessions.sessions(), 1U);
}

TEST_F(Lookup, LeavesAnIdentifierOutThatIsNoFileName) {
    sessions.answerBy([](const https::Request& request) {
        Reply reply = recordsOf(AnsweringSessions::namesIn(request));
        reply.headers["X-Ostrel-Request-UUID"] = "../x";
        return reply;
    });
    EXPECT_EQ(lookUp({"2/2/a"}).at(0).response->header("X-Ostrel-Request-UUID"), std::nullopt);
}

struct OtherAnswer {
    std::string title;
    std::function<Names(Names)> change;
};

class LookupOfAGroup : public Lookup, public testing::WithParamInterface<OtherAnswer> {};

TEST_P(LookupOfAGroup, LooksUpOneByOneIfThatSucceededAndSendsNoMoreGroups) {
    sessions.answerBy([](const https::Request& request) {
        const Names names = AnsweringSessions::namesIn(request);
        return recordsOf(names.size() == 1 ? names : GetParam().change(names));
    });
    const Names names = namesUpTo(7);
    expectRightAnswers(lookUp(names), names);
    expectRightAnswers(lookUp(names), names);
    EXPECT_EQ(groupsAmong(sessions.lookups()), 1U);
    EXPECT_THAT(sessions.lookups(), SizeIs(1 + 7 + 7));
}

INSTANTIATE_TEST_SUITE_P(Answered, LookupOfAGroup,
                         testing::Values(OtherAnswer{"InAnotherOrder",
                                                     [](Names names) {
                                                         std::reverse(names.begin(), names.end());
                                                         return names;
                                                     }},
                                         OtherAnswer{"Short",
                                                     [](Names names) {
                                                         names.pop_back();
                                                         return names;
                                                     }},
                                         OtherAnswer{"Long",
                                                     [](Names names) {
                                                         names.push_back("2/2/more");
                                                         return names;
                                                     }},
                                         OtherAnswer{"Twice",
                                                     [](Names names) {
                                                         const Names once = names;
                                                         names.insert(names.end(), once.begin(), once.end());
                                                         return names;
                                                     }},
                                         OtherAnswer{"WithOneInThePlaceOfAnother",
                                                     [](Names names) {
                                                         names[3] = names[2];
                                                         return names;
                                                     }},
                                         OtherAnswer{"NotAtAll", [](const Names&) { return Names(); }}),
                         [](const auto& row) { return row.param.title; });

TEST_F(Lookup, TriesGroupsAgainAfterAResponseWithoutRecords) {
    const Names names = namesUpTo(3);
    for (const char* body : {"no JSON", "{}", R"({"records":1})", "[]"}) {
        sessions.answerBy([body](const https::Request& request) {
            const Names asked = AnsweringSessions::namesIn(request);
            return asked.size() == 1 ? recordsOf(asked) : Reply{.body = body};
        });
        expectRightAnswers(lookUp(names), names);
    }
    EXPECT_EQ(groupsAmong(sessions.lookups()), 4U);
}

// Failures.

TEST_F(Lookup, AFailureOfAGroupIsOneOfEachName) {
    sessions.answerBy([](const https::Request&) {
        return Reply{.status = 503, .headers = {{"Retry-After", "7"}}, .body = "{}"};
    });
    const auto answers = lookUp(namesUpTo(5));
    EXPECT_THAT(answers, AllOf(SizeIs(5), Each(HasKind(Answer::Kind::unreachable)),
                               Each(Field(&Answer::retryAfter, seconds(7)))));
    EXPECT_THAT(sessions.requests(), SizeIs(1));
    EXPECT_THAT(answers[4].error->localizedDescription(), HasSubstr("answered with status 503"));
}

TEST_F(Lookup, OnlySomeStatusesAskToComeBack) {
    for (const int status : {200, 400, 401, 404, 429, 500, 501, 502, 503, 504, 505}) {
        sessions.answerBy([status](const https::Request&) { return Reply{.status = status, .body = "{}"}; });
        const bool isBusy = status == 429 || (status >= 502 && status <= 504);
        EXPECT_THAT(lookUp({"2/2/a"}).at(0),
                    HasKind(isBusy ? Answer::Kind::unreachable : Answer::Kind::answered))
            << status;
    }
}

TEST_F(Lookup, ReadsRetryAfterAsSecondsOrAsADate) {
    const auto retryAfter = [this](const std::string& text) {
        sessions.answerBy([text](const https::Request&) {
            return Reply{.status = 429, .headers = {{"retry-after", text}}};
        });
        return lookUp({"2/2/a"}).at(0).retryAfter;
    };
    EXPECT_EQ(retryAfter("0"), seconds(0));
    EXPECT_EQ(retryAfter("120"), seconds(120));
    EXPECT_EQ(retryAfter("99999999999999999999"), seconds::max());
    EXPECT_EQ(retryAfter("Sun, 06 Nov 1994 08:49:37 GMT"), seconds(0));
    EXPECT_GT(retryAfter("Fri, 01 Jan 2100 00:00:00 GMT"), seconds(3600));
    for (const char* text : {"", "soon", "-1", "+1", "1.5", "1 s", "Sun, 06 Nov 1994 08:49:37 CET"})
        EXPECT_EQ(retryAfter(text), std::nullopt) << text;
}

TEST_F(Lookup, AResponseWithoutABodyIsNone) {
    sessions.answerBy([](const https::Request&) { return Reply{.status = 200}; });
    const Answer answer = lookUp({"2/2/a"}).at(0);
    EXPECT_THAT(answer, HasKind(Answer::Kind::unreachable));
    EXPECT_EQ(answer.error, std::nullopt);
    EXPECT_EQ(answer.response->status, 200);
}

TEST_F(Lookup, WithoutASessionIsUnreachable) {
    sessions.failWith({base::kURLErrorDomain,
                       static_cast<std::int64_t>(https::URLErrorCode::resourceUnavailable), "no threads"});
    EXPECT_THAT(lookUp(namesUpTo(3)), AllOf(SizeIs(3), Each(HasKind(Answer::Kind::unreachable))));
}

TEST_F(Lookup, ARefusedServerGetsNoFurtherLookup) {
    sessions.answerBy([](const https::Request&) { return Reply{.isByAStranger = true}; });
    EXPECT_THAT(lookUp(namesUpTo(3)), AllOf(SizeIs(3), Each(HasKind(Answer::Kind::untrusted))));
    EXPECT_THAT(sessions.requests(), SizeIs(1));
    // One by one: at most one a connection.
    sessions.answerBy([](const https::Request& request) {
        return AnsweringSessions::namesIn(request).size() > 1 ? Reply{.body = "{}"}
                                                              : Reply{.isByAStranger = true};
    });
    EXPECT_THAT(lookUp(namesUpTo(50)), AllOf(SizeIs(50), Each(HasKind(Answer::Kind::untrusted))));
    EXPECT_THAT(sessions.requests(), SizeIs(testing::Le(2 + retrieval::kConnectionsPerCall)));
}

TEST_F(Lookup, AServiceThatFailsNameByNameGetsNoLookupForAllOfThem) {
    sessions.answerBy([](const https::Request& request) {
        return AnsweringSessions::namesIn(request).size() > 1 ? Reply{.body = "{}"} : Reply{.status = 503};
    });
    EXPECT_THAT(lookUp(namesUpTo(200)), AllOf(SizeIs(200), Each(HasKind(Answer::Kind::unreachable))));
    EXPECT_THAT(sessions.requests(), SizeIs(testing::Le(1 + 6 * retrieval::kConnectionsPerCall)));
}

TEST_F(Lookup, ANameThatIsNotUTF8IsNoRecords) {
    EXPECT_THAT(lookUp({"\xff"}), ElementsAre(HasKind(Answer::Kind::unreachable)));
    EXPECT_THAT(sessions.requests(), IsEmpty());
}

// Assets.

class LookupOfAnAsset : public Lookup {
  protected:
    /// A record that names an asset, with this response to its download.
    void serveAsset(const Reply& asset) {
        sessions.answerBy([asset](const https::Request& request) {
            return request.method == "POST"
                       ? Reply{.body = R"({"records":[{"recordName":"2/2/a","fields":{"signedTicketAsset":)"
                                       R"({"value":{"downloadURL":"https://a.example/${f}","size":3}}}}]})"}
                       : asset;
        });
    }
};

TEST_F(LookupOfAnAsset, FetchesItWithItsRecord) {
    serveAsset({.body = "abc"});
    const Answer answer = lookUp({"2/2/a"}).at(0);
    EXPECT_THAT(answer, HasKind(Answer::Kind::answered));
    ASSERT_TRUE(answer.asset);
    EXPECT_EQ(base::toString(answer.asset->contents), "abc");
    EXPECT_EQ(sessions.requests().at(1).url->host(), "a.example");
}

TEST_F(LookupOfAnAsset, IsUnreachableOrUntrustedAsItsServerIs) {
    serveAsset({.status = 503, .headers = {{"Retry-After", "3"}}});
    Answer answer = lookUp({"2/2/a"}).at(0);
    EXPECT_THAT(answer, HasKind(Answer::Kind::unreachable));
    EXPECT_TRUE(answer.errorIsOfAsset);
    EXPECT_EQ(answer.retryAfter, seconds(3));
    serveAsset({.isByAStranger = true});
    answer = lookUp({"2/2/a"}).at(0);
    EXPECT_THAT(answer, HasKind(Answer::Kind::untrusted));
    EXPECT_TRUE(answer.errorIsOfAsset);
}

// Calls that end before their time.

TEST_F(Lookup, EndsAtItsDeadline) {
    sessions.answerBy([](const https::Request&) { return Reply{.neverComes = true}; });
    EXPECT_THAT(lookUp(namesUpTo(3), Clock::now() + milliseconds(20)),
                AllOf(SizeIs(3), Each(HasKind(Answer::Kind::unreachable))));
    // The connection that was cut off is not used again.
    sessions.answerBy(
        [](const https::Request& request) { return recordsOf(AnsweringSessions::namesIn(request)); });
    expectRightAnswers(lookUp(namesUpTo(3)), namesUpTo(3));
    EXPECT_EQ(sessions.sessions(), 2U);
}

TEST_F(Lookup, EndsWhenItIsCancelledAndSoDoesEveryLaterOne) {
    std::thread other;
    sessions.answerBy([&](const https::Request&) {
        other = std::thread([&] { cancellation.cancel(); });
        return Reply{.neverComes = true};
    });
    EXPECT_THAT(lookUp(namesUpTo(3)), AllOf(SizeIs(3), Each(HasKind(Answer::Kind::unreachable))));
    other.join();
    EXPECT_THAT(lookUp(namesUpTo(3)), AllOf(SizeIs(3), Each(HasKind(Answer::Kind::unreachable))));
    EXPECT_THAT(sessions.requests(), SizeIs(1));
    EXPECT_TRUE(cancellation.sleepUntil(Clock::now() + std::chrono::hours(1)));
}

}  // namespace
}  // namespace pinwell::test
