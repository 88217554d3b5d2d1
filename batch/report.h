// The summary of all artefacts at the end of a batch.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "retrieval/report.h"

namespace pinwell::batch {

using retrieval::Report;

struct Summary {
    std::string_view operation;
    std::uint64_t total = 0;                  // reports
    std::uint64_t resumed = 0;                // done by an earlier run, and skipped
    std::uint64_t duplicates = 0;             // paths of files that were named before
    std::array<std::uint64_t, 32> byCause{};  // indexed by Cause
    int exitStatus = 0;
    double seconds = 0;

    void count(const Report& report);
    std::uint64_t numberOf(retrieval::Cause cause) const {
        return byCause.at(static_cast<std::size_t>(cause));
    }

    /// Whether every report is a verdict on its artefact.
    bool holdsVerdictsOnly() const;
};

/// "staple" or "validate".
std::string_view nameOfOperation(std::uint8_t operation) noexcept;

/// One line of JSON, without its newline, as docs/batch.schema.json has it.
std::string asJson(const Summary& summary);

/// One line, without its newline.
std::string asText(const Summary& summary);

}  // namespace pinwell::batch
