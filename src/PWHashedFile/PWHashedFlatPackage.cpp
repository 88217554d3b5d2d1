#include "src/PWHashedFile/PWHashedFlatPackage.h"

#include <utility>

#include "src/messages.h"

namespace pinwell {

std::optional<Data> PWHashedFlatPackage::_ticketData() {
    noteState();
    const auto opened = platform().files.openForReading(*fileURL());
    if (!opened) {
        NoisyLog("Could not create file handle to %@. %@", fileURL(), opened.error());
        NoisyLog("Could not get ticket for %@. %@", fileURL()->path(), opened.error());
        return std::nullopt;
    }
    trailers_ = walkPackageTrailers(**opened, name());
    return std::exchange(trailers_.ticket, std::nullopt);
}

}  // namespace pinwell
