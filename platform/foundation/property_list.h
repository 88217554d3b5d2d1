// Property lists, in the XML and the binary form.
#pragma once

#include "foundation/bytes.h"
#include "foundation/error.h"
#include "foundation/value_fwd.h"

namespace pinwell::foundation {

/// Longest document, deepest nesting and largest number of values that is read. Keys are values, and so is a
/// value of the binary form at every use.
inline constexpr std::size_t kMaximumPropertyListSize = 16 * 1024 * 1024;
inline constexpr unsigned kMaximumPropertyListDepth = 64;
inline constexpr std::size_t kMaximumPropertyListValues = 1'000'000;

/// The document's root value; which of the two forms it has is found, not told. Nothing outside the document
/// is read. Time and memory are in proportion to the document's length (property_list_reader.h).
///
/// Integers are signed 64-bit words, or unsigned ones where they do not fit those; dates are cut to seconds.
/// Of two equal keys the last one counts. The error is of kDataErrorDomain.
Result<Value> parsePropertyList(ByteView document);

/// The XML form, for the builders of sample artefacts. Holds dictionaries, arrays, text, numbers, booleans,
/// data.
Result<Data> serializePropertyList(const Value& value);

}  // namespace pinwell::foundation
