// Property lists, in the XML and the binary form.
//
// The binary form, big-endian:
//
//   offset 0        "bplist00"
//   8               objects: a marker byte (kind in the high half, length or exponent in the low half; if
//                   that is F, an integer object with the length follows), then contents or references
//   table offset    offset table: one offset for each object
//   size - 32       trailer: 6 bytes unused, offset width, reference width (one byte each), then
//                   64 bits each: number of objects, root object, table offset
//
// Objects may overlap and may be referenced many times. So every object is counted at every reference, which
// bounds the work. Containers are read once and shared.
//
// Refused: offsets and lengths outside the list, kinds outside property lists (sets, null), malformed UTF-16
// text, keys that are not text, dates outside the calendar, cycles, and lists that exceed the limits below.
//
// The XML form (xml_parser.h):
//
//   <plist version="1.0"><dict><key>name</key><string>text</string> ... </dict></plist>
//
// Values are dict, array, string, integer, real, true, false, date and data. Attributes are skipped.
//
// Refused: unknown or misplaced elements; text that is not a value of its kind; and lists that exceed the
// limits below.
#pragma once

#include <cstddef>
#include <cstdint>
#include <stdexcept>
#include <string>

#include "base/bytes.h"
#include "base/error.h"
#include "values/value.h"

namespace pinwell::values {

/// Longest document, deepest nesting and largest number of values that are read. Keys count as values. In the
/// binary form a value counts at every reference.
inline constexpr std::size_t kMaximumPropertyListSize = 16 * 1024 * 1024;
inline constexpr unsigned kMaximumPropertyListDepth = 64;
inline constexpr std::size_t kMaximumPropertyListValues = 1'000'000;

/// Maximum number of bytes of text and data in a binary list, with shared objects counted at every reference:
/// as many as the longest list can hold without sharing.
inline constexpr std::uint64_t kMaximumPropertyListContents = 16 * 1024 * 1024;

/// The document's root value, in either of the two forms. Nothing outside the document is read. Time and
/// memory are in proportion to the document's length.
///
/// Integers are signed 64-bit words, or unsigned if too large; dates are cut to seconds. If a key occurs
/// twice, the last one counts. The error is of kDataErrorDomain.
base::Result<Value> parsePropertyList(base::ByteView document);

/// The XML form, for the builders of sample artefacts. Holds dictionaries, arrays, text, numbers, booleans,
/// data.
base::Result<base::Data> serializePropertyList(const Value& value);

namespace property_list_detail {

/// Thrown for a refused list. `code` is kMalformedDocument or kExcessiveDocument.
class Refusal : public std::runtime_error {
  public:
    Refusal(std::int64_t code, const std::string& what) : std::runtime_error(what), code_(code) {}

    std::int64_t code() const noexcept { return code_; }

  private:
    std::int64_t code_;
};

/// The root value of a list in the XML form. Throws Refusal.
Value readXML(base::ByteView document);

}  // namespace property_list_detail

}  // namespace pinwell::values
