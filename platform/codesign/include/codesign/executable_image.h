// The parts of executable images that locate their signature.
// formats/executable_image.h has the layout.
//
// Refused: no slices, slices that overlap each other or the list, slices that reach past the file, two slices
// of one CPU type and subtype (a loader may take another than the one whose hash was looked up); load
// commands that do not fit their reserved space, two that give a signature, a signature that overlaps the
// load commands or reaches past its slice.
//
// There is no limit on the number of slices or load commands. Both lists are read piece by piece, so that
// work and memory grow with the file's contents and not with its claims.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "base/byte_source.h"
#include "formats/executable_image.h"

namespace pinwell::codesign {

using base::ByteSource;
using base::ByteView;
using base::Data;
using base::SharedBytes;

/// A part of a file.
struct FileRange {
    std::uint64_t offset = 0;
    std::uint64_t length = 0;

    bool operator==(const FileRange&) const = default;
};

/// One thin image and its place in the file.
struct ImageSlice {
    std::uint32_t cpuType = 0;
    std::uint32_t cpuSubtype = 0;  // as stated, with capabilities
    FileRange range;
};

/// Whether the file begins like an executable image. Throws base::ReadFailure.
bool isExecutableImage(const ByteSource& source);

/// The slices of a universal image, or the whole of a thin one; at least one. Throws CodeError or
/// base::ReadFailure.
std::vector<ImageSlice> readSlices(const ByteSource& source);

/// The header of a slice. Throws CodeError if the slice is too short for one, or is not a thin image; or
/// base::ReadFailure.
ImageHeader readSliceHeader(const ByteSource& source, const ImageSlice& slice);

/// The slice that represents all: the first of CPU type 0x0100000C, otherwise the first of 0x01000007,
/// otherwise the first. The same on every host, so that every host looks up the same ticket.
const ImageSlice& preferredSlice(const std::vector<ImageSlice>& slices);

/// The place of a slice's signature in the file; `nullopt` if it is not signed. Throws CodeError,
/// base::ShortRead or base::ReadFailure.
std::optional<FileRange> findImageSignature(const ByteSource& source, const ImageSlice& slice);

}  // namespace pinwell::codesign
