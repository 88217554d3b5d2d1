// Property lists, in the XML and the binary form.
#pragma once

#include "foundation/bytes.h"
#include "foundation/error.h"
#include "foundation/value_fwd.h"

namespace pinwell::foundation {

/// Longest document, deepest nesting and largest number of values that are read. Keys count as values. In the
/// binary form a value counts at every reference.
inline constexpr std::size_t kMaximumPropertyListSize = 16 * 1024 * 1024;
inline constexpr unsigned kMaximumPropertyListDepth = 64;
inline constexpr std::size_t kMaximumPropertyListValues = 1'000'000;

/// The document's root value, in either of the two forms. Nothing outside the document is read. Time and
/// memory are in proportion to the document's length (property_list_reader.h).
///
/// Integers are signed 64-bit words, or unsigned if too large; dates are cut to seconds. If a key occurs
/// twice, the last one counts. The error is of kDataErrorDomain.
Result<Value> parsePropertyList(ByteView document);

/// The XML form, for the builders of sample artefacts. Holds dictionaries, arrays, text, numbers, booleans,
/// data.
Result<Data> serializePropertyList(const Value& value);

}  // namespace pinwell::foundation
