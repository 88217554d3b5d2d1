// The code hashes that a ticket for an artefact lists, and the name of its record, which is made from one.
#pragma once

#include <compare>
#include <cstdint>
#include <string>
#include <vector>

#include "base/bytes.h"

namespace pinwell {

/// A code directory's hash with the number of its digest type (codesign::DigestType). Number 0 means an
/// unknown digest type; the hash then has 20 bytes.
struct CodeHash {
    std::uint32_t algorithm = 0;
    base::Data hash;

    auto operator<=>(const CodeHash&) const = default;
};

/// Whether a ticket for an artefact with this own hash can list `hash` as well.
bool canListWith(const CodeHash& own, const CodeHash& hash);

/// Joins an artefact's own hash with the other hashes found in it: its own first, without duplicates. Leaves
/// out hashes that a ticket with this own hash cannot list.
std::vector<CodeHash> listableHashes(const CodeHash& own, const std::vector<CodeHash>& found);

/// The name of the record that holds the ticket for a code hash: "2/ALGORITHM/HEX", or "1/HEX" if the
/// algorithm is 0.
std::string recordNameForHash(std::uint32_t algorithm, base::ByteView hash);
inline std::string recordNameForHash(const CodeHash& hash) {
    return recordNameForHash(hash.algorithm, hash.hash);
}

}  // namespace pinwell
