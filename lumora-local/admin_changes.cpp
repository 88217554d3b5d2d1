#include "foundation/base64.h"
#include "foundation/format.h"
#include "foundation/json.h"
#include "foundation/markup.h"
#include "foundation/value.h"
#include "lumora-local/admin_routes.h"
#include "lumora-local/admin_service.h"
#include "lumora-local/change_request.h"
#include "lumora-local/sha256.h"

namespace pinwell::lumora {
namespace {

using foundation::Dictionary;
using foundation::format;

Occasion occasionOf(const AdminRequest& request, const std::string& comment) {
    Occasion occasion{foundation::Date::now(), request.head.client, std::nullopt, comment, false};
    if (request.idempotencyKey) {
        const std::string all = std::string(request.path) + '\n' + std::string(request.body);
        occasion.request = RequestIdentity{request.head.client, *request.idempotencyKey,
                                           foundation::toHex(sha256(foundation::asBytes(all)))};
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
    members["label"] = foundation::escapeForDisplay(event.label);
    members["environment"] = toString(event.environment);
    members["action"] = toString(event.action);
    members["event"] = event.hash;
    const auto document = foundation::serializeJSON(members);
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    Answer answer;
    answer.status = status;
    answer.body = foundation::toString(*document);
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
    return answerOf(change.event, {{"ticket", foundation::encodeBase64(change.ticket)}},
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
