#include "lumora-local/lookup.h"

#include <gtest/gtest.h>

#include <stdexcept>

#include "base/bytes.h"
#include "base/text.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using values::Array;
using values::Dictionary;
using values::Value;

const std::string kAsset(64, 'a');
constexpr const char* kPath = "/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup";

/// Two records in production, one delivered each way; one in development.
class FakeRecords final : public RecordSource {
  public:
    std::optional<Delivery> findTicket(Environment environment, const std::string& name) override {
        if (failing) throw std::runtime_error("the disk is gone");
        if (environment == Environment::development) {
            return name == "in-development" ? std::optional(Delivery{base::toData("dev"), {}}) : std::nullopt;
        }
        ++lookups;
        if (name == "mebibyte") return Delivery{Data(1024 * 1024), {}};
        if (name == "inline") return Delivery{base::toData("ticket"), {}};
        if (name == "large") return Delivery{{}, Delivery::Asset{kAsset, 2'000'000}};
        return std::nullopt;
    }
    std::optional<Data> findAsset(const std::string& identifier) override {
        if (identifier != kAsset) return std::nullopt;
        return base::toData(std::string("bytes\0of\xFFit", 11));
    }
    std::size_t countRecords() override { return 2; }

    bool failing = false;
    int lookups = 0;
};

class LookupTest : public testing::Test {
  protected:
    static RequestHead lookupHead() { return {"POST", kPath, "localhost:8443", "application/json", ""}; }

    int headStatus(const RequestHead& head) const {
        const auto answer = service_.answerHead(head);
        return answer ? answer->status : 0;
    }
    int bodyStatus(std::string_view body) const { return service_.answerLookup(lookupHead(), body).status; }

    static Value parse(const Answer& answer) {
        auto value = values::parseJSON(base::asBytes(answer.body));
        EXPECT_TRUE(value) << answer.body;
        return value ? *std::move(value) : Value();
    }
    Value lookup(std::string_view body, const RequestHead& head = lookupHead()) const {
        const Answer answer = service_.answerLookup(head, body);
        EXPECT_EQ(answer.status, 200) << answer.body;
        return parse(answer);
    }

    FakeRecords records_;
    const LookupService service_{records_, {"localhost", "::1"}, Endpoint{"localhost", 9999}};
};

TEST_F(LookupTest, AcceptsTheHeadOfALookup) {
    EXPECT_EQ(service_.answerHead(lookupHead()), std::nullopt);
}

TEST_F(LookupTest, DeliversATicketInline) {
    const Value answer = lookup(R"({"records":[{"recordName":"inline"}]})");
    const Value& record = answer["records"][0];
    EXPECT_EQ(*record["recordName"].string(), "inline");
    EXPECT_EQ(base::decodeBase64(*record["fields"]["signedTicket"]["value"].string()),
              base::toData("ticket"));
    EXPECT_TRUE(record["fields"]["signedTicketAsset"].isNil());
    EXPECT_TRUE(record["reason"].isNil());
}

TEST_F(LookupTest, DeliversALargeTicketByReference) {
    const Value answer = lookup(R"({"records":[{"recordName":"large"}]})");
    const Value& asset = answer["records"][0]["fields"]["signedTicketAsset"]["value"];
    EXPECT_EQ(*asset["downloadURL"].string(), "https://localhost:8443/assets/" + kAsset + "/${f}");
    EXPECT_EQ(asset["size"].unsignedIntegerValue(), 2'000'000U);
    EXPECT_TRUE(answer["records"][0]["fields"]["signedTicket"].isNil());
}

TEST_F(LookupTest, StatesWhyARecordHasNoTicket) {
    const Value answer = lookup(R"({"records":[{"recordName":"unknown"}]})");
    EXPECT_EQ(*answer["records"][0]["reason"].string(), "Record not found");
    EXPECT_EQ(*answer["records"][0]["recordName"].string(), "unknown");
    EXPECT_TRUE(answer["records"][0]["fields"].isNil());
}

TEST_F(LookupTest, ReturnsRecordsInTheRequestedOrder) {
    const Value answer = lookup(
        R"({"records":[{"recordName":"unknown"},{"recordName":"inline"},{"recordName":"large"},{"recordName":"inline"}]})");
    const Array& records = *answer["records"].array();
    ASSERT_EQ(records.size(), 4U);
    EXPECT_EQ(*records[0]["recordName"].string(), "unknown");
    EXPECT_EQ(*records[1]["recordName"].string(), "inline");
    EXPECT_EQ(*records[2]["recordName"].string(), "large");
    EXPECT_EQ(*records[3]["recordName"].string(), "inline");
}

std::string bodyOf(const std::string& name, std::size_t times) {
    std::string records;
    for (std::size_t i = 0; i < times; ++i)
        records += (i > 0 ? "," : "") + ("{\"recordName\":\"" + name + "\"}");
    return "{\"records\":[" + records + "]}";
}

TEST_F(LookupTest, LooksUpARepeatedNameOnce) {
    const Value answer = lookup(bodyOf("inline", 200));
    EXPECT_EQ(answer["records"].array()->size(), 200U);
    EXPECT_EQ(records_.lookups, 1);
}

TEST_F(LookupTest, RefusesAResponseOverItsLimit) {
    EXPECT_EQ(bodyStatus(bodyOf("mebibyte", 5)), 200);
    EXPECT_EQ(bodyStatus(bodyOf("mebibyte", 6)), 413);
    EXPECT_EQ(bodyStatus(bodyOf("mebibyte", 200)), 413);
}

TEST_F(LookupTest, CountsItsLimitInSentBytes) {
    EXPECT_LE(service_.answerLookup(lookupHead(), bodyOf("mebibyte", 5)).body.size(), kMaximumAnswerSize);
}

TEST_F(LookupTest, SharesTheBytesOfAnAssetThatSeveralDownload) {
    const RequestHead head{"GET", "/assets/" + kAsset + "/x", "", "", ""};
    const auto first = service_.answerHead(head);
    const auto second = service_.answerHead(head);
    EXPECT_EQ(first->asset, second->asset);
}

TEST_F(LookupTest, KeepsTheEnvironmentsApart) {
    RequestHead development = lookupHead();
    development.target = "/database/1/com.ostrel.tm.ticket-delivery/development/public/records/lookup";
    EXPECT_EQ(service_.answerHead(development), std::nullopt);
    EXPECT_TRUE(
        lookup(R"({"records":[{"recordName":"inline"}]})", development)["records"][0]["fields"].isNil());
    EXPECT_FALSE(
        lookup(R"({"records":[{"recordName":"in-development"}]})", development)["records"][0]["fields"]
            .isNil());
}

TEST_F(LookupTest, IgnoresOtherMembersOfARequest) {
    const Value answer = lookup(R"({"zone":{"a":[]},"records":[{"recordName":"inline","desiredKeys":[1]}]})");
    EXPECT_FALSE(answer["records"][0]["fields"].isNil());
}

TEST_F(LookupTest, UsesTheHostThatTheClientUsed) {
    const auto urlFor = [&](const std::string& host) {
        RequestHead head = lookupHead();
        head.host = host;
        const Value answer = lookup(R"({"records":[{"recordName":"large"}]})", head);
        return *answer["records"][0]["fields"]["signedTicketAsset"]["value"]["downloadURL"].string();
    };
    const std::string rest = "/assets/" + kAsset + "/${f}";
    EXPECT_EQ(urlFor("[::1]:1234"), "https://[::1]:1234" + rest);
    EXPECT_EQ(urlFor("LOCALHOST:1234"), "https://localhost:1234" + rest);
    EXPECT_EQ(urlFor("localhost"), "https://localhost:443" + rest);
    for (const char* foreign :
         {"evil.example", "evil.example:8443", "", "localhost:8443/x", "localhost:0", "a b"}) {
        EXPECT_EQ(urlFor(foreign), "https://localhost:9999" + rest) << foreign;
    }
}

TEST_F(LookupTest, RefusesABodyOfAnotherForm) {
    for (const char* body :
         {"", "{", "null", "1", "\"records\"", "[]", "{}", R"({"records":null})", R"({"records":{}})",
          R"({"records":[]})", R"({"records":[null]})", R"({"records":["inline"]})", R"({"records":[{}]})",
          R"({"records":[{"recordName":null}]})", R"({"records":[{"recordName":1}]})",
          R"({"records":[{"recordName":["inline"]}]})", R"({"records":[{"recordName":"inline"},{}]})",
          R"({"records":[{"recordName":"inline"}]} trailing)", "{\"records\":[{\"recordName\":\"\xFF\"}]}"}) {
        const Answer answer = service_.answerLookup(lookupHead(), body);
        EXPECT_EQ(answer.status, 400) << body;
        EXPECT_EQ(*parse(answer)["serverErrorCode"].string(), "BAD_REQUEST") << body;
        EXPECT_FALSE(parse(answer)["reason"].string()->empty()) << body;
    }
}

TEST_F(LookupTest, RefusesDeeplyNestedJson) {
    const std::string opening(100'000, '[');
    EXPECT_EQ(bodyStatus(opening), 400);
    EXPECT_EQ(bodyStatus(opening + std::string(100'000, ']')), 400);
    EXPECT_EQ(bodyStatus("{\"records\":" + opening), 400);
}

TEST_F(LookupTest, RefusesRequestsOverTheirLimits) {
    const auto bodyOf = [](std::size_t count, std::size_t nameLength) {
        std::string body = "{\"records\":[";
        for (std::size_t i = 0; i < count; ++i) {
            body += (i == 0 ? "" : ",") + ("{\"recordName\":\"" + std::string(nameLength, 'n')) + "\"}";
        }
        return body + "]}";
    };
    EXPECT_EQ(bodyStatus(bodyOf(kMaximumRecordsPerRequest, 3)), 200);
    EXPECT_EQ(bodyStatus(bodyOf(kMaximumRecordsPerRequest + 1, 3)), 400);
    EXPECT_EQ(bodyStatus(bodyOf(1, kMaximumRecordNameLength)), 200);
    EXPECT_EQ(bodyStatus(bodyOf(1, kMaximumRecordNameLength + 1)), 400);
}

TEST_F(LookupTest, RefusesOtherPaths) {
    for (const char* target :
         {"/", "", "*", "/database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup/",
          "/database/2/com.ostrel.tm.ticket-delivery/production/public/records/lookup",
          "/database/1/com.ostrel.other/production/public/records/lookup",
          "/database/1/com.ostrel.tm.ticket-deliveryX/production/public/records/lookup",
          "/database/1/com.ostrel.tm.ticket-delivery/staging/public/records/lookup",
          "/database/1/com.ostrel.tm.ticket-delivery//public/records/lookup",
          "/database/1/com.ostrel.tm.ticket-delivery/public/records/lookup",
          "/database/1/com.ostrel.tm.ticket-delivery/production/private/records/lookup",
          "/database/1/com.ostrel.tm.ticket-delivery/production/../production/public/records/lookup",
          "//database/1/com.ostrel.tm.ticket-delivery/production/public/records/lookup"}) {
        RequestHead head = lookupHead();
        head.target = target;
        const auto answer = service_.answerHead(head);
        ASSERT_TRUE(answer) << target;
        EXPECT_EQ(answer->status, 404) << target;
        EXPECT_EQ(*parse(*answer)["serverErrorCode"].string(), "NOT_FOUND") << target;
    }
}

TEST_F(LookupTest, IgnoresTheQuery) {
    RequestHead head = lookupHead();
    head.target += "?token=1";
    EXPECT_EQ(service_.answerHead(head), std::nullopt);
}

TEST_F(LookupTest, RefusesOtherMethodsAndNamesTheRightOne) {
    for (const char* method : {"GET", "HEAD", "PUT", "DELETE", "OPTIONS", "post"}) {
        RequestHead head = lookupHead();
        head.method = method;
        const auto answer = service_.answerHead(head);
        ASSERT_TRUE(answer) << method;
        EXPECT_EQ(answer->status, 405) << method;
        ASSERT_EQ(answer->headers.size(), 1U);
        EXPECT_EQ(answer->headers[0], (std::pair<std::string, std::string>("Allow", "POST")));
    }
    EXPECT_EQ(headStatus({"POST", "/healthz", "", "", ""}), 405);
    EXPECT_EQ(headStatus({"POST", "/assets/" + kAsset + "/a", "", "", ""}), 405);
}

TEST_F(LookupTest, AcceptsOnlyJson) {
    const auto statusOf = [&](const std::string& type) {
        RequestHead head = lookupHead();
        head.contentType = type;
        return headStatus(head);
    };
    for (const char* type : {"application/json", "Application/JSON", "application/json; charset=utf-8",
                             "application/json ;x=y"}) {
        EXPECT_EQ(statusOf(type), 0) << type;
    }
    for (const char* type : {"", "text/json", "application/jsonp", "application/jso", "json",
                             "multipart/form-data; boundary=x", "application/x-www-form-urlencoded"}) {
        EXPECT_EQ(statusOf(type), 415) << type;
    }
}

TEST_F(LookupTest, RefusesEncodedBodies) {
    RequestHead head = lookupHead();
    head.contentEncoding = "gzip";
    EXPECT_EQ(headStatus(head), 415);
    head.contentEncoding = "identity";
    EXPECT_EQ(headStatus(head), 0);
}

TEST_F(LookupTest, ServesAnAssetUnderAnyPlainName) {
    for (const char* name : {"lmasset.ticket", "a", "A-1_.x"}) {
        const auto answer = service_.answerHead({"GET", "/assets/" + kAsset + "/" + name, "", "", ""});
        ASSERT_TRUE(answer);
        EXPECT_EQ(answer->status, 200) << name;
        ASSERT_NE(answer->asset, nullptr);
        EXPECT_EQ(*answer->asset, base::toData(std::string("bytes\0of\xFFit", 11)));
        EXPECT_EQ(answer->contentType, "application/octet-stream");
    }
}

TEST_F(LookupTest, RefusesOtherAssets) {
    for (const std::string& target :
         {std::string("/assets/"), std::string("/assets/") + kAsset, "/assets/" + kAsset + "/",
          "/assets/" + std::string(64, 'b') + "/lmasset.ticket",
          "/assets/" + kAsset.substr(1) + "/lmasset.ticket", "/assets/" + kAsset + "/${f}",
          "/assets/" + kAsset + "/a/b", "/assets/" + kAsset + "/%24%7Bf%7D",
          "/assets/" + kAsset + "/" + std::string(201, 'a'), std::string("/assets/../healthz")}) {
        EXPECT_EQ(headStatus({"GET", target, "", "", ""}), 404) << target;
    }
}

TEST_F(LookupTest, ReportsItsHealth) {
    const auto answer = service_.answerHead({"GET", "/healthz", "", "", ""});
    ASSERT_TRUE(answer);
    EXPECT_EQ(answer->status, 200);
    EXPECT_EQ(*parse(*answer)["status"].string(), "ok");
    EXPECT_EQ(parse(*answer)["records"].unsignedIntegerValue(), 2U);
}

TEST_F(LookupTest, PassesFailuresOfTheStoreOn) {
    records_.failing = true;
    EXPECT_THROW(service_.answerLookup(lookupHead(), R"({"records":[{"recordName":"inline"}]})"),
                 std::runtime_error);
}

}  // namespace
}  // namespace pinwell::lumora
