#include "src/code_hashes.h"

#include <set>

#include "src/tm_ticket.h"

namespace pinwell {

std::vector<CodeHash> listableHashes(const CodeHash& own, const std::vector<CodeHash>& found) {
    std::vector<CodeHash> hashes{own};
    std::set<CodeHash> listed{own};
    for (const CodeHash& hash : found) {
        // If a digest type is unknown to tickets (from a later platform), the artefact's other hashes stay
        // usable. If the own hash has an unknown digest type, the ticket lists only such hashes.
        const std::size_t length = tm_cdhash_algorithm_get_size(hash.algorithm);
        const bool listable =
            length != 0 && hash.hash.size() == length && (hash.algorithm == 0) == (own.algorithm == 0);
        if (listable && listed.insert(hash).second) hashes.push_back(hash);
    }
    return hashes;
}

std::vector<CodeHash> listableHashes(const CodeHash& own, const foundation::URL& artefact,
                                     const codesign::CodeSigningService& codeSigning) {
    const auto all = codeSigning.allCodeHashes(artefact);
    if (!all) return {own};
    std::vector<CodeHash> found;
    for (const codesign::SigningInformation& code : *all)
        for (std::size_t i = 0; i < code.cdHashes.size() && i < code.digestAlgorithms.size(); ++i)
            found.push_back({code.digestAlgorithms[i], code.cdHashes[i]});
    return listableHashes(own, found);
}

}  // namespace pinwell
