#include "support/test_platform.h"

#include "base/byte_io.h"
#include "src/PWHashedFile/file_kind.h"

namespace pinwell::test {

using base::ByteWriter;
using base::Data;

TestPlatform::TestPlatform()
    : types(types::makeTypeService()),
      files([this](const files::ItemFacts& facts) { return nameType(*types, facts); }),
      platformDirectory(directory / "platform") {
    files.answerTemporaryDirectory(directory.url("tmp"));
}

Platform TestPlatform::services() {
    return servicesWith(codeSigning);
}

Platform TestPlatform::servicesWith(codesign::CodeSigningService& other) {
    return {files, *types, other, trust, https, userDefaults, systemLog, platformDirectory, [](int status) {
                throw ProcessExit{status};
            }};
}

Data unsignedTicket(const std::vector<Data>& hashes, std::uint32_t flags) {
    const std::size_t hashLength = hashes.empty() ? 20 : hashes.front().size();
    ByteWriter payload;
    payload.text("m8tk").le16(2).le16(static_cast<std::uint16_t>(hashLength));
    payload.le32(static_cast<std::uint32_t>(hashes.size())).le32(flags).le64(1795377300);
    for (const Data& hash : hashes) payload.u8(2).bytes(hash);

    ByteWriter certificates;  // SEQUENCE of one element that a fake takes for a certificate
    certificates.u8(0x30).u8(3).u8(0x30).u8(1).u8(0);

    ByteWriter container;
    container.text("s8ch").le16(1).le16(0);
    container.le32(static_cast<std::uint32_t>(certificates.size()))
        .le32(static_cast<std::uint32_t>(payload.size()));
    container.bytes(certificates.data()).bytes(payload.data()).zeros(72);
    return std::move(container).take();
}

}  // namespace pinwell::test
