// Deep verification of code, by the kind of its file, and the identities that it finds. For this folder, and
// for code that judges its findings. verify.h verifies an artefact of any kind.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "verify/check.h"
#include "verify/signature_parts.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// The identity of code in one signature, by which a ticket or a seal recognises the code.
struct CodeIdentity {
    std::string place;
    std::vector<Data> codeHashes;  // of all code directories, the chosen one's first
    std::uint32_t digestType = 0;  // of the chosen one
    std::string identifier;
    std::optional<std::string> team;
    bool hasSecureTimestamp = false;
    bool isNested = false;  // a seal names it
    bool isSealed = false;  // it is the code that the seal names
};

/// The findings about a piece of code.
struct VerifiedCode {
    /// Whether any part of it is signed. If not, there is nothing to check the bytes against.
    bool isSigned = false;

    /// One for each slice, the preferred slice first. Damaged signatures have no entry.
    std::vector<CodeIdentity> identities;
};

/// Verifies an executable image: every slice, every code directory, every page. `outside`: files that the
/// special slots of a bundle's main executable cover. An image outside a bundle has its embedded property
/// list.
VerifiedCode verifyExecutable(const base::ByteSource& source, const OutsideComponents& outside,
                              const std::string& place, Workers& workers, Section& section);

/// Verifies a bundle with all that is in it (bundle.h). Throws codesign::CodeError if the directory has no
/// main executable, or if it cannot be read.
VerifiedCode verifyBundle(const std::string& path, Workers& workers, Section& section);

/// Verifies a disk image: its data, its trailer, and its block table as a second check. `source` ends in a
/// disk image's trailer. An unsigned image has no identity here: its synthetic hash covers all of its data,
/// so that hash is the whole check.
VerifiedCode verifyDiskImage(const base::ByteSource& source, Workers& workers, Section& section);

/// Verifies a flat package: table of contents, signature, and everything in the heap.
VerifiedCode verifyPackage(const base::ByteSource& source, Workers& workers, Section& section);

/// The identity that `parts` state.
CodeIdentity identityOf(const SignatureParts& parts, std::string place);

}  // namespace pinwell::verify
