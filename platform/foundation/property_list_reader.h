// The readers of the two forms of a property list. For this folder only.
#pragma once

#include <optional>
#include <stdexcept>
#include <string>

#include "foundation/bytes.h"
#include "foundation/error.h"
#include "foundation/value.h"

namespace pinwell::foundation {

inline constexpr std::string_view kBinaryPropertyListMagic = "bplist00";

/// Maximum number of bytes of text and data in a binary list, with shared objects counted at every reference:
/// as many as the longest list can hold without sharing.
inline constexpr std::uint64_t kMaximumPropertyListContents = 16 * 1024 * 1024;

/// Thrown for a refused list. `code` is kMalformedDocument or kExcessiveDocument.
class PropertyListRefusal : public std::runtime_error {
  public:
    PropertyListRefusal(std::int64_t code, const std::string& what) : std::runtime_error(what), code_(code) {}

    std::int64_t code() const noexcept { return code_; }

  private:
    std::int64_t code_;
};

/// The root value of a binary list, big-endian:
///
///   offset 0        "bplist00"
///   8               objects: a marker byte (kind in the high half, length or exponent in the low half; if
///                   that is F, an integer object with the length follows), then contents or references
///   table offset    offset table: one offset for each object
///   size - 32       trailer: 6 bytes unused, offset width, reference width (one byte each), then
///                   64 bits each: number of objects, root object, table offset
///
/// Objects may overlap and may be referenced many times. So every object is counted at every reference, which
/// bounds the work. Containers are read once and shared.
///
/// Refused: offsets and lengths outside the list, kinds outside property lists (sets, null), malformed UTF-16
/// text, keys that are not text, dates outside the calendar, cycles, and lists that exceed the limits of
/// property_list.h. Throws PropertyListRefusal and ShortRead.
Value readBinaryPropertyList(ByteView document);

/// The root value of a list in XML (xml_parser.h):
///
///   <plist version="1.0"><dict><key>name</key><string>text</string> ... </dict></plist>
///
/// Values are dict, array, string, integer, real, true, false, date and data. Attributes are skipped.
///
/// Refused: unknown or misplaced elements; text that is not a value of its kind; and lists that exceed the
/// limits of property_list.h. Throws PropertyListRefusal.
Value readXMLPropertyList(ByteView document);

}  // namespace pinwell::foundation
