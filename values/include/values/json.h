// JSON (RFC 8259) in and out.
#pragma once

#include <cstddef>

#include "base/bytes.h"
#include "base/error.h"
#include "values/value.h"

namespace pinwell::values {

/// Deepest nesting of arrays and objects that is read.
inline constexpr unsigned kMaximumJSONDepth = 512;

/// Longest document and largest number of values that are read. The first is the maximum length of a server's
/// response. The second bounds memory, because the shortest value takes two bytes of text and far more in
/// memory.
inline constexpr std::size_t kMaximumJSONSize = 64 * 1024 * 1024;
inline constexpr std::size_t kMaximumJSONValues = 1'000'000;

/// What becomes of a key that an object has twice. Readers differ about which one counts.
enum class EqualKeys { lastWins, refused };

/// The document, whose top level must be an object or an array. UTF-8, one leading byte-order mark allowed,
/// only white space after it. An integer that fits 64 bits stays an integer; a number that a double cannot
/// hold is an error. The error (kDataErrorDomain) of a malformed document names the byte position.
base::Result<Value> parseJSON(base::ByteView document, EqualKeys equalKeys = EqualKeys::lastWins);

/// Without pretty-printing; keys in sorted order. Fails for values that JSON cannot express: nil, byte
/// buffers, dates, URLs, errors, a number that is not finite, text that is not UTF-8, a top level that is not
/// an object or array.
base::Result<base::Data> serializeJSON(const Value& value);

}  // namespace pinwell::values
