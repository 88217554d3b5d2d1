// Ad-hoc code signatures, for the samples.
//
// A superblob of three blobs: a SHA-256 code directory (version 0x20400, one hash per page of 4096 bytes), an
// empty requirements blob, an empty CMS blob.
#pragma once

#include <cstdint>
#include <map>
#include <string>

#include "foundation/bytes.h"

namespace pinwell::lumora {

struct AdHocSignature {
    std::string identifier;

    /// The bytes under the page hashes: the file from its start to the signature. Borrowed.
    foundation::ByteView code;

    /// The contents for the special slots, by slot number from 1. The requirements, slot 2, are added; slots
    /// that are not named are zero.
    std::map<std::uint32_t, foundation::Data> components{};

    /// The code is a program's own image, and not data.
    bool isMainProgram = false;

    /// Its length depends only on the identifier, the length of the code and the highest slot.
    foundation::Data superblob() const;

    /// The code hash: 20 bytes.
    foundation::Data codeHash() const;

  private:
    foundation::Data codeDirectory() const;
};

}  // namespace pinwell::lumora
