// A distinguished name (RFC 5280, 4.1.2.4): its contents, and comparison.
//
//   Name                  SEQUENCE OF RelativeDistinguishedName; may be empty
//   RelativeDistinguishedName  SET OF AttributeTypeAndValue; at least one
//   AttributeTypeAndValue SEQUENCE { type OBJECT IDENTIFIER, value ANY }
//
// Text is UTF8String, PrintableString, IA5String or VisibleString (7 bits), T61String (taken as ISO 8859-1),
// BMPString or UniversalString (both big-endian). A text that its type does not allow makes the name
// malformed.
#pragma once

#include <string>

#include "base/bytes.h"

namespace pinwell::trust {

/// A name with more attributes is refused. Real names have fewer than 12.
inline constexpr std::size_t kMaximumNameAttributes = 128;

struct DistinguishedName {
    /// Equal for names that compare equal (RFC 5280, 7.1). The type of a text, the case of ASCII letters and
    /// the number of spaces do not matter; the order of the parts does. Other values are compared byte for
    /// byte.
    base::Data canonical;

    /// The last common name, otherwise the last attribute, in UTF-8; empty if there is none or it is not
    /// text.
    std::string summary;

    bool isEmpty = true;
};

/// `contents` are the contents of the outer SEQUENCE. Throws der::Malformed.
DistinguishedName readName(base::ByteView contents);

}  // namespace pinwell::trust
