#include "verify/package.h"

#include "verify/check_names.h"

namespace pinwell::verify {

VerifiedCode verifyPackage(const codesign::ByteSource&, Workers&, Section& section) {
    section.cannotRead(kArchive, "archive", "deep verification of packages is not built in yet");
    return {.isSigned = true, .identities = {}};
}

}  // namespace pinwell::verify
