// The few properties of a code signature that the tool needs, above all the cdhash.
#pragma once

#include <vector>

#include "formats/code_hashes.h"
#include "src/platform.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell {

/// Keys of the properties. All except the first exist only if the signature has them.
inline constexpr std::string_view kCDHashKey = "cdhash";                    // byte buffer
inline constexpr std::string_view kDigestAlgorithmKey = "digestAlgorithm";  // number: digest type
inline constexpr std::string_view kTeamIdKey = "teamId";                    // text
inline constexpr std::string_view kSecureTimestampKey = "secureTimestamp";  // text: the date's printed form
inline constexpr std::string_view kSigningIdKey = "signingId";              // text
inline constexpr std::string_view kFlagsKey = "flags";                      // number

/// The properties of the code at `fileURL`; empty on any failure. An invalid or missing signature is not
/// reported; a failure of the code-signing service itself goes to the system log. Never prints, never changes
/// an exit code.
values::Dictionary basicCodeProperties(const values::URL& fileURL, const Platform& platform);

/// The hashes that a ticket with this own hash can list (code_hashes.h): those of all slices and of nested
/// code of the artefact at this path. An unsigned disk image or a package has only its own. Reads files;
/// blocks.
std::vector<CodeHash> listableHashes(const CodeHash& own, const values::URL& artefact,
                                     const codesign::CodeSigningService& codeSigning);

}  // namespace pinwell
