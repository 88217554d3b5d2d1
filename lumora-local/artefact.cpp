#include "lumora-local/artefact.h"

#include <algorithm>

namespace pinwell::lumora {

std::vector<CodeHash> hashesForTicket(const CodeHash& own, const std::vector<CodeHash>& found) {
    std::vector<CodeHash> hashes{own};
    for (const CodeHash& hash : found) {
        // Digest types that tickets do not know (a later platform's) leave the artefact's other hashes
        // usable. A ticket over a hash of unknown digest type lists such hashes alone.
        const bool listable =
            hash.hash.size() == hashLength(hash.algorithm) && (hash.algorithm == 0) == (own.algorithm == 0);
        if (listable && std::find(hashes.begin(), hashes.end(), hash) == hashes.end()) hashes.push_back(hash);
    }
    return hashes;
}

}  // namespace pinwell::lumora
