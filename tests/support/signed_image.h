// Executable images with correct page hashes and a signer's message, with as many code directories and
// components as a signature may have: forms that lumora-local's samples do not have.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include "base/bytes.h"

namespace pinwell::test {

using base::ByteView;
using base::Data;

struct SignedImageParts {
    std::vector<std::uint8_t> digestTypes{2};  // of the code directories, slot 0's first
    std::uint32_t cpuType = 0x0100000C;
    std::string team{};
    bool hasSigner = false;                      // a signer's message with a time stamp; otherwise ad hoc
    bool hasTimestamp = false;                   // of the signer's message
    std::map<std::uint32_t, Data> components{};  // blobs of special slots, beside the requirements
    std::map<std::uint32_t, Data> outside{};     // the contents outside the image that special slots cover
    Data padding{};                              // after the superblob, in the signature's area
};

/// A thin 64-bit image of two pages of 4 KiB, the second one cut, and its signature.
Data signedImageOf(const SignedImageParts& parts);

}  // namespace pinwell::test
