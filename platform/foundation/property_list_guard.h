// What a property list must satisfy before the parsing library is given it.
//
// The library builds a tree without bounds: it descends by recursion, and copies an object of the binary form
// once for every reference to it, so that a list of a few hundred bytes can ask for any amount of memory.
// These checks walk the whole list first, with bounds, and refuse it; what passes is a tree of known size.
#pragma once

#include <optional>

#include "foundation/error.h"

namespace pinwell::foundation {

inline constexpr std::string_view kBinaryPropertyListMagic = "bplist00";

/// Most bytes that text and data of a binary list may come to when shared objects are counted at every use.
inline constexpr std::uint64_t kMaximumPropertyListContents = 64 * 1024 * 1024;

/// Nothing when the list may be parsed.
///
/// The binary form, big-endian:
///
///   offset 0        "bplist00"
///   8               objects: a marker byte (kind in the high half, length or exponent in the low one; low
///   half F:
///                   an integer object with the length follows), then the contents or the object references
///   table offset    offset table: one offset an object
///   size - 32       trailer: 6 bytes unused, offset width, reference width (one byte each), then 64 bits
///   each:
///                   number of objects, root object, table offset
///
/// Refused: offsets and lengths outside the list, kinds that are no property list values (sets), keys that
/// are not text or hold a zero character, cycles, and what exceeds the limits of property_list.h.
std::optional<Error> refuseBinaryPropertyList(ByteView document);

/// Nothing when the list may be parsed.
///
/// Refused besides unbalanced, unknown or too deeply nested elements: a document type with an internal subset
/// (where entities are declared), marked sections elsewhere than in text, references to no character, zero
/// bytes (and so UTF-16).
std::optional<Error> refuseXMLPropertyList(ByteView document);

}  // namespace pinwell::foundation
