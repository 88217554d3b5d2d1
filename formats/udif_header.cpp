#include "formats/udif_header.h"

#include <algorithm>

#include "foundation/byte_reader.h"
#include "foundation/byte_writer.h"

namespace pinwell {

using foundation::ByteReader;

namespace {

constexpr std::size_t kUDIFVersionOffset = 4;
constexpr std::size_t kUDIFHeaderSizeOffset = 8;
constexpr std::size_t kCodeSignLengthOffset = 304;

ByteReader readerAt(foundation::ByteView header, std::size_t offset) {
    ByteReader reader(header);
    reader.seek(offset, "UDIF header field");
    return reader;
}

}  // namespace

bool UDIFFileHeader::assign(foundation::ByteView bytes) {
    if (bytes.size() != bytes_.size()) return false;
    std::copy(bytes.begin(), bytes.end(), bytes_.begin());
    return true;
}

bool UDIFFileHeader::hasMagic() const {
    return ByteReader(bytes_).be32("fUDIFSignature") == kUDIFMagic;
}

std::uint32_t UDIFFileHeader::magicAsShown() const {
    return ByteReader(bytes_).le32("fUDIFSignature");
}

std::uint32_t UDIFFileHeader::version() const {
    return readerAt(bytes_, kUDIFVersionOffset).be32("fUDIFVersion");
}

std::uint32_t UDIFFileHeader::headerSize() const {
    return readerAt(bytes_, kUDIFHeaderSizeOffset).be32("fUDIFHeaderSize");
}

std::uint64_t UDIFFileHeader::codeSignOffset() const {
    return readerAt(bytes_, kUDIFCodeSignFieldsOffset).be64("fUDIFCodeSignOffset");
}

std::uint64_t UDIFFileHeader::codeSignLength() const {
    return readerAt(bytes_, kCodeSignLengthOffset).be64("fUDIFCodeSignLength");
}

void UDIFFileHeader::setCodeSign(std::uint64_t offset, std::uint64_t length) {
    static_assert(kCodeSignLengthOffset == kUDIFCodeSignFieldsOffset + sizeof offset);
    const auto fields = foundation::ByteWriter().be64(offset).be64(length).data();
    std::copy(fields.begin(), fields.end(), bytes_.begin() + kUDIFCodeSignFieldsOffset);
}

}  // namespace pinwell
