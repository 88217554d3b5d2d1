// A distinguished name (RFC 5280, 4.1.2.4): what it says, and when two are the same.
//
//   Name                  SEQUENCE OF RelativeDistinguishedName; may be empty
//   RelativeDistinguishedName  SET OF AttributeTypeAndValue; at least one
//   AttributeTypeAndValue SEQUENCE { type OBJECT IDENTIFIER, value ANY }
//
// Text is UTF8String, PrintableString, IA5String or VisibleString (7 bits), T61String (taken as ISO 8859-1),
// BMPString or UniversalString (both big-endian). Text that its type does not allow makes the name malformed.
#pragma once

#include <string>

#include "foundation/bytes.h"

namespace pinwell::trust {

/// A name of more attributes is refused. Names in use have fewer than 12.
inline constexpr std::size_t kMaximumNameAttributes = 128;

struct DistinguishedName {
    /// The same for names that compare equal (RFC 5280, 7.1): the type of a text, the case of ASCII letters
    /// and the number of spaces do not count, the order of the parts does. Other values count byte for byte.
    foundation::Data canonical;

    /// The last common name, else the last attribute, in UTF-8; empty if that is no text or there is none.
    std::string summary;

    bool isEmpty = true;
};

/// `contents` are those of the outer SEQUENCE. Throws der::Malformed.
DistinguishedName readName(foundation::ByteView contents);

}  // namespace pinwell::trust
