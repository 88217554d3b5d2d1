// Property lists, in the XML and the binary form.
#pragma once

#include "foundation/error.h"

namespace pinwell::foundation {

/// Longest document, deepest nesting and largest number of values that is read.
inline constexpr std::size_t kMaximumPropertyListSize = 16 * 1024 * 1024;
inline constexpr unsigned kMaximumPropertyListDepth = 64;
inline constexpr std::size_t kMaximumPropertyListValues = 1'000'000;

/// The document's root value; which of the two forms it has is found, not told. Document type declarations
/// are not followed and nothing outside the document is read; one with an internal subset is refused, as is
/// what exceeds the limits above. Integers are signed 64-bit words, dates are cut to seconds. The error is of
/// kDataErrorDomain.
Result<Value> parsePropertyList(ByteView document);

/// The XML form, for the builders of sample artefacts. Holds dictionaries, arrays, text, numbers, booleans,
/// data.
Result<Data> serializePropertyList(const Value& value);

}  // namespace pinwell::foundation
