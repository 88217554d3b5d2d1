// What was found out about one path: the checks, and what follows from them.
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
    unreachable,  // 68: the service gave no answer that could be judged
    unreadable,   // 66: it cannot be read, is of no supported kind, or has no signature at all
    noTicket,     // 65: none is stapled
    refused,      // 65: the ticket or a policy does not accept it
    altered,      // 65: something is not as it was signed
    revoked,      // 77
};

/// "good", "unreachable" and so on.
std::string_view verdictName(Verdict verdict);
int exitStatusOf(Verdict verdict);

struct Result {
    std::string path;  // as given
    std::string kind;  // "bundle", "diskImage", "package", "executable"; empty if it is none
    Verdict verdict = Verdict::unreadable;
    std::string conclusion;  // a sentence
    verify::Section checks;

    // Of the artefact; empty without a signature that can be read.
    std::string recordName;
    std::uint32_t digestType = 0;
    foundation::Data codeHash;
    foundation::Data fileDigest;  // SHA-256 of a file's bytes, if an attestation is wanted
};

}  // namespace pinwell::gate
