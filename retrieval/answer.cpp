#include "retrieval/answer.h"

#include <stdexcept>

#include "foundation/json.h"
#include "foundation/value.h"
#include "src/ticket_record.h"

namespace pinwell::retrieval {

bool Answer::hasNoTicket() const {
    if (kind != Kind::answered || body.empty()) return false;
    const auto document = foundation::parseJSON(body);
    try {
        const TicketRecord record = ticketRecordOf(document ? *document : foundation::Value());
        return record.ticketText() == nullptr && record.assetURLTemplate() == nullptr;
    } catch (const foundation::ValueTypeError&) {
        return false;
    } catch (const std::out_of_range&) {
        return false;
    }
}

}  // namespace pinwell::retrieval
