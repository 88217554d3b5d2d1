// The parts that this build leaves out. Their commands and options exist, and fail with a message that names
// the missing part.
#include "failure.h"
#include "metrics.h"
#include "signing_key.h"
#include "values/format.h"

namespace pinwell::lumora {

#if !PINWELL_HAS_METRICS
void requireMetrics() {
    throw Failure(EX_CONFIG, "cannot offer metrics: this program was built without them");
}

std::string describeMetrics(const ServiceCounts::Snapshot&, const ServiceFacts&) {
    requireMetrics();
    return {};
}
#endif

#if !PINWELL_HAS_PKCS11
std::unique_ptr<DigestSigner> openTokenKey(const std::string& uri) {
    throw Failure(EX_CONFIG, values::format("cannot use %@: this program was built without PKCS #11",
                                            uri.substr(0, uri.find('?'))));
}
#endif

}  // namespace pinwell::lumora
