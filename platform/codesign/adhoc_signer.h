// Ad-hoc signing of a whole file as opaque data. The code directory (layout in code_directory.h) is defined
// byte for byte, so that every host gives a file the same cdhash:
//
// | Offset      | Value                                                                     |
// |-------------|---------------------------------------------------------------------------|
// | 8           | version 0x20100; 0x20300 if the limit does not fit in 32 bits             |
// | 12          | flags 2                                                                   |
// | 24          | special slots: 6 for a disk image, 2 otherwise                            |
// | 28          | code slots: 1                                                             |
// | 32          | the limit; FFFFFFFF in the 0x20300 form, which has it in 64 bits at 56    |
// | 36          | digest size 32, digest type 2, platform 0, page size 0                    |
// | 40          | zeros up to the header's end, except the 64-bit limit                     |
// | header size | the identifier and a zero byte                                            |
// | then        | only for a disk image: digests of the special slots 6 (the trailer), 5,   |
// |             | 4, 3 (zero)                                                               |
// | then        | digests of the special slots 2 (the empty requirements) and 1 (zero)      |
// | then        | SHA-256 of the file's bytes from 0 to the limit                           |
//
// The limit is the file's size; for a disk image, the start of its signature or of its trailer
// (static_code.h).
//
// The signature is a superblob with this code directory, the empty requirements and an empty CMS blob.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/byte_source.h"
#include "codesign/static_code.h"

namespace pinwell::codesign {

/// The contents of an opaque file's code directory.
struct OpaqueSignature {
    std::string_view identifier;
    std::uint64_t limit = 0;
    std::optional<Data> trailerDigest;  // for a disk image: SHA-256 of its canonical trailer
    Data contentDigest;                 // SHA-256
};

/// The code directory, as in the table above.
Data layOutOpaqueCodeDirectory(const OpaqueSignature& signature);

/// A detached signature of `source`, a disk image if it has a trailer. Reads it in pieces of a fixed size.
/// Throws base::ReadFailure.
Data signOpaque(const ByteSource& source, const std::optional<DiskImageTrailer>& trailer,
                std::string_view identifier);

}  // namespace pinwell::codesign
