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

/// Most bytes that text and data of a binary list may come to when shared objects are counted at every use:
/// as many as the longest list can hold without sharing any.
inline constexpr std::uint64_t kMaximumPropertyListContents = 16 * 1024 * 1024;

/// A list is refused. `code` is kMalformedDocument or kExcessiveDocument.
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
///   8               objects: a marker byte (kind in the high half, length or exponent in the low one; low
///   half
///                   F: an integer object with the length follows), then the contents or the object
///                   references
///   table offset    offset table: one offset an object
///   size - 32       trailer: 6 bytes unused, offset width, reference width (one byte each), then 64 bits
///   each:
///                   number of objects, root object, table offset
///
/// Objects may overlap, and one may be used many times. So work is bounded by what the list comes to when
/// every object is counted at every use, and containers are read once and shared.
///
/// Refused: offsets and lengths outside the list, kinds that are no property list values (sets, null), text
/// that is not UTF-16 where it should be, keys that are not text, dates without a place in the calendar,
/// cycles, and what exceeds the limits of property_list.h. Throws PropertyListRefusal and ShortRead.
Value readBinaryPropertyList(ByteView document);

/// The root value of a list in XML (xml_parser.h):
///
///   <plist version="1.0"><dict><key>name</key><string>text</string> ... </dict></plist>
///
/// Values are dict, array, string, integer, real, true, false, date and data. Attributes are passed over.
///
/// Refused: other elements, and these where they do not belong; text that is no value of its kind; and what
/// exceeds the limits of property_list.h. Throws PropertyListRefusal.
Value readXMLPropertyList(ByteView document);

}  // namespace pinwell::foundation
