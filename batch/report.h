// What there is to say of each artefact as it ends, and of all of them at the end.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "retrieval/artefact_run.h"
#include "retrieval/cause.h"

namespace pinwell::batch {

struct Report {
    std::string path;  // as given
    std::uint8_t operation = 0;
    retrieval::Kind kind = retrieval::Kind::none;
    std::string recordName;  // empty if it is not known
    int exitStatus = 0;
    retrieval::Cause cause = retrieval::Cause::worked;
    unsigned attempts = 0;  // 0: it was not begun
    double seconds = 0;
    std::vector<std::string> messages;
};

struct Summary {
    std::uint8_t operation = 0;
    std::uint64_t total = 0;                  // reports
    std::uint64_t resumed = 0;                // done by an earlier run, and left out
    std::uint64_t duplicates = 0;             // paths of files that were named before
    std::array<std::uint64_t, 32> byCause{};  // indexed by Cause
    int exitStatus = 0;
    double seconds = 0;

    void count(const Report& report);
    std::uint64_t numberOf(retrieval::Cause cause) const {
        return byCause.at(static_cast<std::size_t>(cause));
    }
};

/// "staple" or "validate".
std::string_view nameOfOperation(std::uint8_t operation) noexcept;

/// One line of JSON, without its newline, as docs/batch.schema.json has it. Bytes that are no UTF-8 become
/// U+FFFD.
std::string asJson(const Report& report);
std::string asJson(const Summary& summary);

/// One line, without its newline, in the words of `pinwell`; in verbose mode all of them before it. Control
/// characters are escaped.
std::string asText(const Report& report, bool isVerbose, bool inColor);
std::string asText(const Summary& summary);

}  // namespace pinwell::batch
