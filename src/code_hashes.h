// The code hashes that a ticket for an artefact lists.
#pragma once

#include <compare>
#include <cstdint>
#include <vector>

#include "codesign/code_signing.h"
#include "foundation/bytes.h"
#include "foundation/url.h"

namespace pinwell {

/// A code directory's hash with the number of its digest type (codesign::DigestType). Number 0 means an
/// unknown digest type; the hash then has 20 bytes.
struct CodeHash {
    std::uint32_t algorithm = 0;
    foundation::Data hash;

    auto operator<=>(const CodeHash&) const = default;
};

/// Joins an artefact's own hash with the other hashes found in it: its own first, without duplicates. Leaves
/// out hashes that a ticket with this own hash cannot list.
std::vector<CodeHash> listableHashes(const CodeHash& own, const std::vector<CodeHash>& found);

/// The same with the hashes of all slices and of nested code of the artefact at this path. An unsigned disk
/// image or a package has only its own. Reads files; blocks.
std::vector<CodeHash> listableHashes(const CodeHash& own, const foundation::URL& artefact,
                                     const codesign::CodeSigningService& codeSigning);

}  // namespace pinwell
