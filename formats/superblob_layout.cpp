#include "formats/superblob_layout.h"

namespace pinwell {

using foundation::ByteReader;

SuperblobHeader readSuperblobHeader(ByteReader& reader) {
    SuperblobHeader header;
    header.magic = reader.be32("superblob magic");
    header.length = reader.be32("superblob length");
    header.count = reader.be32("superblob count");
    return header;
}

BlobIndexEntry readBlobIndexEntry(ByteReader& reader) {
    BlobIndexEntry entry;
    entry.slot = reader.be32("index slot");
    entry.offset = reader.be32("index offset");
    return entry;
}

BlobHeader readBlobHeader(ByteReader& reader) {
    BlobHeader header;
    header.magic = reader.be32("blob magic");
    header.length = reader.be32("blob length");
    return header;
}

}  // namespace pinwell
