#include "support/package_builder.h"

#include "base/byte_io.h"
#include "support/archive_builder.h"

namespace pinwell::test {

Data makeTrailer(const TrailerFields& fields, const Data& data) {
    base::ByteWriter writer;
    writer.bytes(data).text(fields.magic).le16(fields.version).le16(fields.type);
    writer.le32(fields.length.value_or(static_cast<std::uint32_t>(data.size()))).le32(fields.upperLength);
    return std::move(writer).take();
}

Data PackageBuilder::defaultArchive() {
    return ArchiveBuilder().signature("CMS").build();
}

PackageBuilder& PackageBuilder::archive(Data bytes) {
    archive_ = std::move(bytes);
    return *this;
}

PackageBuilder& PackageBuilder::terminator() {
    TrailerFields fields;
    fields.type = 1;
    return trailer(fields);
}

PackageBuilder& PackageBuilder::ticket(std::string_view bytes) {
    TrailerFields fields;
    fields.type = 2;
    return trailer(fields, base::toData(bytes));
}

PackageBuilder& PackageBuilder::unknown(std::string_view bytes, std::uint16_t type) {
    TrailerFields fields;
    fields.type = type;
    return trailer(fields, base::toData(bytes));
}

PackageBuilder& PackageBuilder::trailer(const TrailerFields& fields, const Data& data) {
    return append(makeTrailer(fields, data));
}

PackageBuilder& PackageBuilder::bytes(std::string_view text) {
    return append(base::toData(text));
}

PackageBuilder& PackageBuilder::append(const Data& bytes) {
    base::append(trailers_, bytes);
    return *this;
}

std::string PackageBuilder::build() const {
    std::string package(base::asText(archive_));
    package += base::asText(trailers_);
    return package;
}

}  // namespace pinwell::test
