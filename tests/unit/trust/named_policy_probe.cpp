// Prints the ticket policy of the security library that the dynamic loader finds.
#include <iostream>

#include "trust/trust_service.h"

int main() {
    using namespace pinwell::trust;
    const auto service = makeTrustService([] { return Anchors{}; }, Date::now);
    PolicyRef policy;
    switch (service->createNamedPolicy("SecPolicyCreateOstrelQuillonPlusTicket", policy)) {
        case NamedPolicyOutcome::unavailable:
            std::cout << "unavailable";
            break;
        case NamedPolicyOutcome::refused:
            std::cout << "refused";
            break;
        case NamedPolicyOutcome::created:
            std::cout << "created " << policy->oid;
            break;
    }
}
