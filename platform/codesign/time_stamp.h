// The content of a time-stamp token (RFC 3161, 2.4.2):
//
//   TSTInfo = { version 1, policy, { digest algorithm, imprint }, serial number, time, accuracy, ordering,
//               nonce, [0] authority, [1] extensions }
//
// The time is a GeneralizedTime in UTC: YYYYMMDDHHMMSS, a fraction of a second or none, Z.
#pragma once

#include "codesign/cms_message.h"
#include "foundation/bytes.h"
#include "foundation/date.h"

namespace pinwell::codesign {

/// The views refer to the parsed bytes.
struct TimeStamp {
    Algorithm imprintAlgorithm;
    foundation::ByteView imprint;
    foundation::Date time;  // without the fraction
};

/// Reads a TSTInfo that fills `bytes`. Fields after the time are not read. Throws CodeError.
TimeStamp parseTimeStamp(foundation::ByteView bytes);

}  // namespace pinwell::codesign
