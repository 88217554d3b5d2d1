// Reads the headers of an executable image for deep verification, besides the signature's place
// (codesign/executable_image.h). formats/executable_image.h has the layout. Finds the parts mapped as code
// and the embedded property list. Checks that hashes cover every byte that they can cover.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "codesign/executable_image.h"
#include "verify/check.h"

namespace pinwell::verify {

using base::ByteSource;
using codesign::FileRange;

/// A segment command (0x1 or 0x19) of a thin image. Ranges count from the slice's start.
struct Segment {
    std::string name;
    FileRange range;
    bool isExecutable = false;  // now or after a change of protection
};

struct ImageLayout {
    std::uint32_t cpuType = 0;
    std::uint32_t cpuSubtype = 0;
    std::uint32_t fileType = 0;
    std::vector<Segment> segments;
    std::optional<FileRange> propertyList;  // section __info_plist of segment __TEXT
};

/// Throws codesign::CodeError, base::ShortRead or base::ReadFailure.
ImageLayout readImageLayout(const ByteSource& source, const codesign::ImageSlice& slice);

/// Checks that a universal image's list of slices agrees with the slices, that its gaps are zero, and that
/// nothing is after the last slice. Passes for a thin image.
void checkUniversalHeader(const ByteSource& source, const std::vector<codesign::ImageSlice>& slices,
                          const std::string& place, Section& section);

/// Checks that no executable segment reaches the signature, and that the slice ends with the signature,
/// except for zero padding. Offsets of `signature` count from the file's start.
void checkBehindSignature(const ByteSource& source, const codesign::ImageSlice& slice,
                          const ImageLayout& layout, const FileRange& signature, const std::string& place,
                          Section& section);

/// Whether a system can start the executable image: it is a program, not a library. Throws like
/// readImageLayout().
bool isProgram(const ByteSource& source);

/// "64-bit ARM slice", "64-bit x86 slice", "slice of CPU type 0x...".
std::string sliceName(std::uint32_t cpuType);

}  // namespace pinwell::verify
