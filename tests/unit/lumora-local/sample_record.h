// A record as the tests of the stores keep it, and the occasion on which they do.
#pragma once

#include <string>
#include <string_view>

#include "lumora-local/record_store.h"

namespace pinwell::lumora::test {

inline constexpr Environment kProduction = Environment::production;

inline const Occasion kOccasion{values::Date{100}, "tester", std::nullopt, "", false};

/// Of an artefact with one hash of each length, valid, issued at 77.
inline SignedRecord makeRecord(const std::string& name, std::string_view ticket = "ticket") {
    return {{name,
             "Sample.app",
             {{2, base::Data(20, std::byte{1})}, {4, base::Data(48, std::byte{2})}},
             false,
             false,
             values::Date{77}},
            base::toData(ticket)};
}

}  // namespace pinwell::lumora::test
