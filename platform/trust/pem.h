// Blocks of a PEM text (RFC 7468, in its lax form).
//
//   -----BEGIN LABEL-----
//   base64, with white space anywhere
//   -----END LABEL-----
//
// Text outside blocks is skipped. A block extends to the next marker. If that is not its own end, the block
// is damaged; the next block is still read.
#pragma once

#include <optional>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::trust {

struct PemBlock {
    std::string_view label;                // a view into the text
    std::size_t line = 0;                  // of its first marker, from 1
    std::optional<foundation::Data> data;  // `nullopt` if it is damaged
    std::string_view damage;               // why, for people; empty otherwise
};

/// In the order of the text. Time and memory are linear in its length.
std::vector<PemBlock> readPemBlocks(std::string_view text);

/// Whether the block's label is "CERTIFICATE" or one of its two older forms.
bool isCertificateBlock(const PemBlock& block);

}  // namespace pinwell::trust
