// Replaces metrics.cpp in a build without the library that writes metrics.
#include "lumora-local/failure.h"
#include "lumora-local/metrics.h"

namespace pinwell::lumora {

void requireMetrics() {
    throw Failure(EX_CONFIG, "cannot offer metrics: this program was built without them");
}

std::string describeMetrics(const ServiceCounts::Snapshot&, const ServiceFacts&) {
    requireMetrics();
    return {};
}

}  // namespace pinwell::lumora
