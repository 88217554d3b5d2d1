// Deep verification of an executable image: every slice, every code directory, every page.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "codesign/byte_source.h"
#include "verify/check.h"
#include "verify/signature_parts.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// What one signature says of its code, for whoever has to recognise that code: the ticket, or a seal.
struct CodeIdentity {
    std::string place;
    std::vector<Data> codeHashes;  // of all code directories, the chosen one's first
    std::uint32_t digestType = 0;  // of the chosen one
    std::string identifier;
    std::optional<std::string> team;
    bool hasSecureTimestamp = false;
    bool isNested = false;  // a seal names it
    bool isSealed = false;  // it is what that seal names
};

/// What a piece of code turned out to be.
struct VerifiedCode {
    /// Whether any part of it is signed. Without one there is nothing to hold the bytes against.
    bool isSigned = false;

    /// One a slice, the preferred slice's first. Damaged signatures have no entry.
    std::vector<CodeIdentity> identities;
};

/// `outside`: what the special slots of a bundle's main executable cover beside the signature. An image that
/// is no bundle's has the property list that is embedded in it.
VerifiedCode verifyExecutable(const codesign::ByteSource& source, const OutsideComponents& outside,
                              const std::string& place, Workers& workers, Section& section);

/// `parts` as they are known by.
CodeIdentity identityOf(const SignatureParts& parts, std::string place);

}  // namespace pinwell::verify
