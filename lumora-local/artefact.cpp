#include "lumora-local/artefact.h"

#include <set>

namespace pinwell::lumora {

bool canListWith(const CodeHash& own, const CodeHash& hash) {
    return hash.hash.size() == hashLength(hash.algorithm) && (hash.algorithm == 0) == (own.algorithm == 0);
}

std::vector<CodeHash> hashesForTicket(const CodeHash& own, const std::vector<CodeHash>& found) {
    std::vector<CodeHash> hashes{own};
    std::set<CodeHash> listed{own};
    for (const CodeHash& hash : found) {
        // Hashes of unknown digest types (a later platform's) do not prevent the use of the artefact's other
        // hashes. A ticket over a hash of unknown digest type lists only such hashes.
        if (canListWith(own, hash) && listed.insert(hash).second) hashes.push_back(hash);
    }
    return hashes;
}

}  // namespace pinwell::lumora
