// The structure of an X.509 certificate (RFC 5280, 4.1), read without a library.
//
//   Certificate     SEQUENCE { tbsCertificate, AlgorithmIdentifier, signature BIT STRING }
//   tbsCertificate  SEQUENCE {
//       [0] { version INTEGER }     absent for version 1; 1 and 2 mean versions 2 and 3
//       serial number INTEGER       any, in the fewest bytes
//       AlgorithmIdentifier         the same as outside (4.1.1.2)
//       issuer Name
//       SEQUENCE { notBefore, notAfter }   each UTCTime or GeneralizedTime
//       subject Name
//       SubjectPublicKeyInfo        subject_key.h
//       [1] issuer's and [2] subject's unique identifier BIT STRING   from version 2
//       [3] { Extensions } }        version 3 alone; extensions.h
//
// In DER: definite lengths in the shortest form, no bytes left over, nesting at most der::kMaximumNesting.
// Also refused: other versions, and fields that the stated version does not have.
#pragma once

#include <optional>

#include "foundation/bytes.h"
#include "foundation/date.h"
#include "trust/der.h"

namespace pinwell::trust {

/// A longer certificate is refused. The same limit as that of a ticket's certificate element.
inline constexpr std::size_t kMaximumCertificateSize = 131072;

/// Views into the certificate's bytes, each of the contents of an element unless said otherwise.
struct CertificateParts {
    foundation::ByteView signedPart;  // the whole element
    foundation::ByteView serialNumber;
    foundation::ByteView innerAlgorithm;
    der::Element issuer;
    foundation::Date notBefore;
    foundation::Date notAfter;
    der::Element subject;
    foundation::ByteView subjectKey;
    std::optional<foundation::ByteView> extensions;
    foundation::ByteView outerAlgorithm;
    foundation::ByteView signature;  // without the count of unused bits, which is 0
};

/// Throws der::Malformed unless `certificate` is exactly one certificate.
CertificateParts readCertificateParts(foundation::ByteView certificate);

}  // namespace pinwell::trust
