#include "formats/superblob_layout.h"

#include <gtest/gtest.h>

#include "foundation/byte_writer.h"

namespace pinwell {
namespace {

using foundation::ByteReader;
using foundation::ByteView;
using foundation::ByteWriter;
using foundation::Data;

const Data kFields = ByteWriter().be32(0xFADE0CC0).be32(300).be32(2).data();

TEST(SuperblobLayout, ReadsTheHeaderInBigEndian) {
    ByteReader reader(kFields);
    const SuperblobHeader header = readSuperblobHeader(reader);
    EXPECT_EQ(header.magic, kSuperblobMagic);
    EXPECT_EQ(header.length, 300U);
    EXPECT_EQ(header.count, 2U);
    EXPECT_EQ(reader.position(), kSuperblobHeaderSize);
}

TEST(SuperblobLayout, ReadsAnIndexEntryAndABlobHeaderAtThePosition) {
    ByteReader reader(kFields);
    reader.skip(4, "");
    EXPECT_EQ(readBlobIndexEntry(reader), (BlobIndexEntry{300, 2}));
    EXPECT_EQ(reader.remaining(), 0U);
    ByteReader blob(kFields);
    EXPECT_EQ(readBlobHeader(blob).length, 300U);
    EXPECT_EQ(blob.position(), kBlobHeaderSize);
}

TEST(SuperblobLayout, NamesTheFieldWhereTheBytesEnd) {
    ByteReader reader(ByteView(kFields).first(11));
    try {
        readSuperblobHeader(reader);
        FAIL() << "eleven bytes are no header";
    } catch (const foundation::ShortRead& error) {
        EXPECT_NE(std::string(error.what()).find("superblob count"), std::string::npos) << error.what();
    }
}

}  // namespace
}  // namespace pinwell
