#include "formats/code_hashes.h"

#include <set>

#include "base/text.h"
#include "formats/tm_ticket.h"
#include "values/format.h"

namespace pinwell {
namespace {

constexpr int kRecordNameVersionPlain = 1;
constexpr int kRecordNameVersionWithAlgorithm = 2;

}  // namespace

bool canListWith(const CodeHash& own, const CodeHash& hash) {
    const std::size_t length = tm_cdhash_algorithm_get_size(hash.algorithm);
    return length != 0 && hash.hash.size() == length && (hash.algorithm == 0) == (own.algorithm == 0);
}

std::vector<CodeHash> listableHashes(const CodeHash& own, const std::vector<CodeHash>& found) {
    std::vector<CodeHash> hashes{own};
    std::set<CodeHash> listed{own};
    for (const CodeHash& hash : found) {
        // If a digest type is unknown to tickets (from a later platform), the artefact's other hashes stay
        // usable. If the own hash has an unknown digest type, the ticket lists only such hashes.
        if (canListWith(own, hash) && listed.insert(hash).second) hashes.push_back(hash);
    }
    return hashes;
}

std::string recordNameForHash(std::uint32_t algorithm, base::ByteView hash) {
    const std::string hex = base::toHex(hash);
    if (algorithm == 0) return values::format("%d/%@", kRecordNameVersionPlain, hex);
    return values::format("%d/%d/%@", kRecordNameVersionWithAlgorithm, algorithm, hex);
}

}  // namespace pinwell
