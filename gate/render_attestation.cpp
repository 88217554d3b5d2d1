#include <algorithm>
#include <nlohmann/json.hpp>

#include "foundation/date.h"
#include "foundation/format.h"
#include "foundation/url.h"
#include "gate/render.h"
#include "gate/uri.h"

namespace pinwell::gate {

namespace {

using OrderedJson = nlohmann::ordered_json;

/// 2026-11-20T19:55:00Z, from "2026-11-20 19:55:00 +0000".
std::string timestampOf(std::int64_t time) {
    constexpr std::size_t kDateLength = 10;
    constexpr std::size_t kLength = 19;
    std::string text = foundation::toString(foundation::Date{time});
    text.resize(kLength);
    text[kDateLength] = 'T';
    return text + "Z";
}

/// The field takes only URIs, so a path is made absolute with the working directory.
std::string absoluteUriOf(const std::string& path) {
    return uriOf(foundation::URL::fileURLWithPath(path).path());
}

/// The identity of the artefact: the digest of a file, and the hash in a ticket.
OrderedJson subjectOf(const Result& result) {
    OrderedJson digests = OrderedJson::object();
    if (!result.fileDigest.empty()) digests["sha256"] = foundation::toHex(result.fileDigest);
    if (!result.codeHash.empty()) digests["cdhash"] = foundation::toHex(result.codeHash);
    return {{"name", result.path}, {"digest", std::move(digests)}};
}

OrderedJson policyOf(const Policy& policy) {
    OrderedJson json = OrderedJson::object();
    if (policy.maximumTicketAge)
        json["max-ticket-age"] = foundation::format("%llds", *policy.maximumTicketAge);
    if (!policy.teams.empty()) json["require-team"] = policy.teams;
    if (!policy.identifiers.empty()) json["require-identifier"] = policy.identifiers;
    json["require-secure-timestamp"] = policy.requiresSecureTimestamp;
    return json;
}

const char* ticketsOf(Options::Tickets tickets) {
    switch (tickets) {
        case Options::Tickets::online:
            return "online";
        case Options::Tickets::offline:
            return "offline";
        case Options::Tickets::directory:
            break;
    }
    return "directory";
}

}  // namespace

std::string renderAttestation(const std::vector<Result>& results, const Options& options, std::int64_t time) {
    OrderedJson subjects = OrderedJson::array();
    OrderedJson verdicts = OrderedJson::array();
    for (const Result& result : results) {
        verdicts.push_back({{"name", result.path}, {"verdict", verdictName(result.verdict)}});
        if (!result.codeHash.empty() || !result.fileDigest.empty()) subjects.push_back(subjectOf(result));
    }
    const bool isPassed =
        !results.empty() && std::all_of(results.begin(), results.end(),
                                        [](const Result& one) { return one.verdict == Verdict::good; });
    OrderedJson levels = OrderedJson::array();
    if (isPassed) levels.push_back(options.isShallow ? "PINWELL_TICKET" : "PINWELL_DEEP");
    const std::string resource =
        results.size() == 1 ? absoluteUriOf(results.front().path) : "urn:pinwell-gate:several";
    const OrderedJson predicate{{"verifier", {{"id", "https://pinwell.example/gate"}}},
                                {"timeVerified", timestampOf(time)},
                                {"resourceUri", resource},
                                {"policy", {{"uri", "urn:pinwell-gate:policy"}}},
                                {"inputAttestations", OrderedJson::array()},
                                {"verificationResult", isPassed ? "PASSED" : "FAILED"},
                                {"verifiedLevels", std::move(levels)},
                                {"slsaVersion", "1.0"},
                                // Our own member: readers of summaries skip unknown members.
                                {"pinwell",
                                 {{"tickets", ticketsOf(options.tickets)},
                                  {"policy", policyOf(options.policy)},
                                  {"results", std::move(verdicts)}}}};
    const OrderedJson statement{{"_type", "https://in-toto.io/Statement/v1"},
                                {"subject", std::move(subjects)},
                                {"predicateType", "https://slsa.dev/verification_summary/v1"},
                                {"predicate", predicate}};
    return statement.dump(2, ' ', false, OrderedJson::error_handler_t::replace) + "\n";
}

}  // namespace pinwell::gate
