// Prints the ticket policy of the security library that the dynamic loader finds.
#include <iostream>
#include <optional>

#include "trust/trust_service.h"

int main() {
    using namespace pinwell::trust;
    const auto service = makeTrustService([] { return Anchors{}; }, Date::now);
    const std::optional<PolicyRef> policy = service->namedPolicy("SecPolicyCreateOstrelQuillonPlusTicket");
    if (!policy)
        std::cout << "unavailable";
    else if (*policy == nullptr)
        std::cout << "refused";
    else
        std::cout << "created " << (*policy)->oid;
}
