// A signed flat package to try the service with, which other readers of xar archives accept too.
//
// | Part              | Holds                                                                         |
// |-------------------|-------------------------------------------------------------------------------|
// | header            | 28 bytes: "xar!", size, version 1, lengths of the table, checksum algorithm 1 |
// | table of contents | XML in a zlib stream: the checksum's place, the signature's place and its     |
// |                   | certificates, the files                                                       |
// | heap              | SHA-1 of the stream; CMS SignedData, detached over that; the files' data      |
//
// The files are PackageInfo, compressed, and ReadMe.txt, uncompressed. The signer's key and certificates (RSA
// 2048; a root and a leaf) are made new and not kept, so no two packages are the same.
#pragma once

#include <string>

#include "foundation/bytes.h"
#include "foundation/date.h"

namespace pinwell::lumora {

/// A whole package, signed at `now`. Throws Failure when the cryptographic library fails.
foundation::Data makePackage(foundation::Date now);

/// Writes `directory`/`name` and returns its path. Overwrites nothing. Throws Failure.
std::string writeSamplePackage(const std::string& directory, const std::string& name, foundation::Date now);

}  // namespace pinwell::lumora
