#include <algorithm>
#include <initializer_list>

#include "admin_routes.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using values::Array;
using values::Dictionary;
using values::format;
using values::Value;

constexpr int kUnprocessable = 422;
constexpr std::size_t kMaximumKeyLength = 255;

bool hasControlCharacters(std::string_view text) {
    while (!text.empty()) {
        const std::size_t size = base::utf8SequenceLength(text);
        if (size == 0 || base::isControlCharacter(text.substr(0, size))) return true;
        text.remove_prefix(size);
    }
    return false;
}

/// The members of a body.
class Members {
  public:
    Members(std::string_view body, std::initializer_list<std::string_view> known) {
        base::Result<Value> document = values::parseJSON(base::asBytes(body), values::EqualKeys::refused);
        if (!document) {
            throw Refused(400, format("the body is not JSON: %@", document.error().localizedDescription()));
        }
        if (document->dictionary() == nullptr) throw Refused(400, "the body is not a JSON object");
        document_ = *std::move(document);
        for (const auto& [name, value] : *document_.dictionary()) {
            if (std::find(known.begin(), known.end(), name) == known.end())
                throw Refused(kUnprocessable,
                              format("\"%@\" is not a member of this request", name.substr(0, 64)));
        }
    }

    /// Empty if it is not there.
    std::string text(std::string_view name, std::size_t most) const {
        const Value& value = document_[name];
        if (value.isNil()) return {};
        if (value.string() == nullptr) refuse(name, "is not a string");
        if (value.string()->size() > most) refuse(name, format("has more than %zu bytes", most));
        if (hasControlCharacters(*value.string())) refuse(name, "has control characters");
        return *value.string();
    }

    bool flag(std::string_view name) const {
        const Value& value = document_[name];
        if (value.isNil()) return false;
        if (value.boolean() == nullptr) refuse(name, "is neither true nor false");
        return *value.boolean();
    }

    CodeHash record() const {
        const Value& value = document_["record"];
        if (value.isNil()) refuse("record", "is missing");
        if (value.string() == nullptr) refuse("record", "is not a string");
        std::optional<CodeHash> hash = parseRecordName(*value.string());
        if (!hash) refuse("record", "is not the name of a record, such as 2/2/ and 40 hexadecimal digits");
        return *std::move(hash);
    }

    std::vector<CodeHash> hashes(const CodeHash& own) const {
        const Value& value = document_["hashes"];
        std::vector<CodeHash> all;
        if (value.isNil()) return all;
        const Array* array = value.array();
        if (array == nullptr) refuse("hashes", "is not an array");
        if (array->size() > kMaximumListedHashes)
            refuse("hashes", format("has more than %zu elements", kMaximumListedHashes));
        for (std::size_t i = 0; i < array->size(); ++i) {
            const std::string* name = (*array)[i].string();
            std::optional<CodeHash> hash = name != nullptr ? parseRecordName(*name) : std::nullopt;
            if (!hash) refuse("hashes", format("has an element that is no hash, at index %zu", i));
            if (!canListWith(own, *hash)) {
                refuse(
                    "hashes",
                    format("has an element that no ticket lists beside the record's own hash, at index %zu",
                           i));
            }
            all.push_back(*std::move(hash));
        }
        return all;
    }

    Environment environment() const {
        const std::string name = text("environment", kMaximumLabelBytes);
        if (document_["environment"].isNil()) return Environment::production;
        const std::optional<Environment> environment = parseEnvironment(name);
        if (!environment) refuse("environment", "is neither production nor development");
        return *environment;
    }

    Reason reason() const {
        if (document_["reason"].isNil()) return Reason::unspecified;
        const std::optional<Reason> reason = parseReason(text("reason", kMaximumLabelBytes));
        if (!reason) refuse("reason", "is not compromised, superseded, withdrawn or unspecified");
        return *reason;
    }

    [[noreturn]] static void refuse(std::string_view name, std::string_view what) {
        throw Refused(kUnprocessable, format("\"%@\" %@", name, what));
    }

  private:
    Value document_;
};

}  // namespace

TicketRequest parseTicketRequest(std::string_view body) {
    const Members members(body, {"comment", "environment", "hashes", "label", "record", "reinstate"});
    TicketRequest request;
    request.environment = members.environment();
    request.artefact.own = members.record();
    request.artefact.others = members.hashes(request.artefact.own);
    request.artefact.label = members.text("label", kMaximumLabelBytes);
    request.reinstates = members.flag("reinstate");
    request.comment = members.text("comment", kMaximumCommentBytes);
    if (request.reinstates && isBlank(request.comment)) Members::refuse("reinstate", "needs a \"comment\"");
    return request;
}

RevocationRequest parseRevocationRequest(std::string_view body) {
    const Members members(body, {"comment", "environment", "reason", "record"});
    return {members.environment(), recordName(members.record()), members.reason(),
            members.text("comment", kMaximumCommentBytes)};
}

RefusedAttempt attemptIn(std::string_view body) {
    RefusedAttempt attempt;
    const base::Result<Value> document = values::parseJSON(base::asBytes(body));
    if (!document || document->dictionary() == nullptr) return attempt;
    const std::string* record = (*document)["record"].string();
    if (record != nullptr && parseRecordName(*record)) attempt.record = *record;
    const std::string* environment = (*document)["environment"].string();
    if (environment != nullptr)
        attempt.environment = parseEnvironment(*environment).value_or(Environment::production);
    return attempt;
}

std::string parseIdempotencyKey(std::string_view header) {
    const bool quoted = header.size() >= 2 && header.front() == '"' && header.back() == '"';
    const std::string_view key = quoted ? header.substr(1, header.size() - 2) : header;
    const bool fits =
        !key.empty() && key.size() <= kMaximumKeyLength && std::all_of(key.begin(), key.end(), [](char c) {
            return c > ' ' && c < '\x7f' && c != '"' && c != ',' && c != ';' && c != '\\';
        });
    if (!fits) throw Refused(400, "Idempotency-Key is not 1 to 255 visible characters, in quotes or bare");
    return std::string(key);
}

namespace {

Occasion occasionOf(const AdminRequest& request, const std::string& comment) {
    Occasion occasion{values::Date::now(), request.head.client, std::nullopt, comment, false};
    if (request.idempotencyKey) {
        const std::string all = std::string(request.path) + '\n' + std::string(request.body);
        occasion.request = RequestIdentity{request.head.client, *request.idempotencyKey,
                                           base::toHex(crypto::sha256(base::asBytes(all)))};
    }
    return occasion;
}

template <class Work>
auto changing(Work&& work) {
    try {
        return work();
    } catch (const RevokedFailure& failure) {
        throw Refused(409,
                      format("the record %@ is revoked; \"reinstate\" with a \"comment\" makes its software "
                             "valid again",
                             failure.revoked()));
    } catch (const TooManyHashesFailure& failure) {
        throw Refused(422, failure.what());
    } catch (const ReusedKeyFailure&) {
        throw Refused(422, "the Idempotency-Key belongs to another request");
    }
}

Answer answerOf(const Event& event, Dictionary members, int status) {
    members["record"] = event.record;
    members["label"] = base::escapeForDisplay(event.label);
    members["environment"] = toString(event.environment);
    members["action"] = toString(event.action);
    members["event"] = event.hash;
    const auto document = values::serializeJSON(members);
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    Answer answer;
    answer.status = status;
    answer.body = base::toString(*document);
    answer.records = {event.record};
    return answer;
}

Answer issueTicket(RecordStore& store, const TicketSigner& signer, const AdminRequest& request) {
    const TicketRequest wanted = parseTicketRequest(request.body);
    if (wanted.reinstates && !request.rights.revoke) {
        throw Refused(
            403, format("\"reinstate\" undoes a revocation: access.toml does not give %@ the role revoke",
                        request.head.client));
    }
    Occasion occasion = occasionOf(request, wanted.comment);
    occasion.reinstates = wanted.reinstates;
    const Change change = changing(
        [&] { return issueDescribed(store, signer, wanted.environment, wanted.artefact, occasion); });
    return answerOf(change.event, {{"ticket", base::encodeBase64(change.ticket)}},
                    change.event.action == Action::issued ? 201 : 200);
}

Answer revokeRecord(RecordStore& store, const TicketSigner& signer, const AdminRequest& request) {
    const RevocationRequest wanted = parseRevocationRequest(request.body);
    Occasion occasion = occasionOf(request, wanted.comment);
    occasion.reason = wanted.reason;
    const std::optional<Change> change =
        changing([&] { return revokeNamed(store, signer, wanted.environment, wanted.record, occasion); });
    if (!change) throw Refused(404, format("there is no record %@", wanted.record));
    return answerOf(change->event, {}, 200);
}

}  // namespace

AdminRoutes changingRoutes(RecordStore& store, const SignerInUse& signer) {
    return {
        {"POST",
         "/v1/tickets",
         &Rights::issue,
         {},
         [&store, signer](const AdminRequest& request) { return issueTicket(store, *signer(), request); }},
        {"POST", "/v1/revocations", &Rights::revoke, {}, [&store, signer](const AdminRequest& request) {
             return revokeRecord(store, *signer(), request);
         }}};
}

}  // namespace pinwell::lumora
