// The result for one path: the checks, and the verdict.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "foundation/bytes.h"
#include "verify/check.h"

namespace pinwell::gate {

/// In the order of gravity: the highest of several paths decides the exit status.
enum class Verdict {
    good,         // 0
    unreachable,  // 68: no usable response from the service
    unreadable,   // 66: it cannot be read, is of no supported kind, or has no signature at all
    noTicket,     // 65: none is stapled
    refused,      // 65: the ticket or a policy does not accept it
    altered,      // 65: something has changed since signing
    revoked,      // 77
};

/// "good", "unreachable" and so on.
std::string_view verdictName(Verdict verdict);
int exitStatusOf(Verdict verdict);

struct Result {
    std::string path;  // as given
    std::string kind;  // "bundle", "diskImage", "package", "executable"; empty if none
    Verdict verdict = Verdict::unreadable;
    std::string conclusion;  // a sentence
    verify::Section checks;

    // Of the artefact; empty without a readable signature.
    std::string recordName;
    std::uint32_t digestType = 0;
    foundation::Data codeHash;
    foundation::Data fileDigest;  // SHA-256 of a file's bytes, if an attestation is wanted
};

}  // namespace pinwell::gate
