// The same public key, written in other ways. Each function takes a SubjectPublicKeyInfo in DER and returns
// one.
//
//   fields.edit = [](CertificateElements& all) { all.key = hybridPoint(all.key); };
#pragma once

#include "foundation/bytes.h"

namespace pinwell::test {

/// For an elliptic-curve key whose point is 04 x y: 02 or 03 and x; 06 or 07 and x y.
foundation::Data compressedPoint(foundation::ByteView info);
foundation::Data hybridPoint(foundation::ByteView info);

/// Of a key on P-256: its curve by its numbers, instead of its name.
foundation::Data onDescribedCurve(foundation::ByteView info);

/// Of an RSA key: under RSASSA-PSS's identifier, without parameters.
foundation::Data asPssKey(foundation::ByteView info);

/// Under another AlgorithmIdentifier, an element.
foundation::Data underAlgorithm(foundation::ByteView info, foundation::ByteView algorithm);

/// An RSA key of these numbers, each the contents of an INTEGER.
foundation::Data rsaKey(foundation::ByteView modulus, foundation::ByteView exponent);

}  // namespace pinwell::test
