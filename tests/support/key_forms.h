// The same public key, written in other ways. Each function takes a SubjectPublicKeyInfo in DER and returns
// one.
//
//   fields.edit = [](CertificateElements& all) { all.key = hybridPoint(all.key); };
#pragma once

#include "base/bytes.h"

namespace pinwell::test {

/// For an elliptic-curve key whose point is 04 x y: 02 or 03 and x; 06 or 07 and x y.
base::Data compressedPoint(base::ByteView info);
base::Data hybridPoint(base::ByteView info);

/// Of a key on P-256: its curve by its numbers, instead of its name.
base::Data onDescribedCurve(base::ByteView info);

/// Of an RSA key: under RSASSA-PSS's identifier, without parameters.
base::Data asPssKey(base::ByteView info);

/// Under another AlgorithmIdentifier, an element.
base::Data underAlgorithm(base::ByteView info, base::ByteView algorithm);

/// An RSA key of these numbers, each the contents of an INTEGER.
base::Data rsaKey(base::ByteView modulus, base::ByteView exponent);

}  // namespace pinwell::test
