#include "support/code_directory_builder.h"

#include <openssl/evp.h>

#include <algorithm>
#include <array>
#include <stdexcept>
#include <utility>

#include "base/byte_io.h"

namespace pinwell::test {

using base::ByteWriter;

namespace {

std::uint8_t sizeOfDigest(std::uint8_t type) {
    switch (type) {
        case 2:
            return 32;
        case 4:
            return 48;
        default:
            return 20;
    }
}

std::uint32_t headerSize(std::uint32_t version) {
    constexpr std::array<std::pair<std::uint32_t, std::uint32_t>, 5> sizes = {
        {{0x20500, 96}, {0x20400, 88}, {0x20300, 64}, {0x20200, 52}, {0x20100, 48}}};
    for (const auto& [from, size] : sizes) {
        if (version >= from) return size;
    }
    return 44;
}

}  // namespace

Data codeDigest(std::uint8_t type, ByteView bytes) {
    const EVP_MD* digest = type == 1 ? EVP_sha1() : type == 4 ? EVP_sha384() : EVP_sha256();
    std::array<unsigned char, EVP_MAX_MD_SIZE> value = {};
    if (EVP_Digest(bytes.data(), bytes.size(), value.data(), nullptr, digest, nullptr) != 1) {
        throw std::runtime_error("cannot digest");
    }
    return base::toData(std::as_bytes(std::span(value)).first(sizeOfDigest(type)));
}

Data codeHashOf(std::uint8_t type, ByteView codeDirectory) {
    Data hash = codeDigest(type, codeDirectory);
    hash.resize(type == 4 ? 48 : 20);
    return hash;
}

Data makeBlob(std::uint32_t magic, ByteView payload) {
    return ByteWriter().be32(magic).be32(u32(8 + payload.size())).bytes(payload).data();
}

Data emptyRequirements() {
    return makeBlob(0xFADE0C01, Data(4));
}

CodeDirectoryBuilder& CodeDirectoryBuilder::covers(std::uint32_t slot, ByteView component) {
    components_[slot] = base::toData(component);
    return *this;
}

CodeDirectoryBuilder& CodeDirectoryBuilder::specialSlot(std::uint32_t slot, Data digest) {
    specialSlots_[slot] = std::move(digest);
    return *this;
}

Data CodeDirectoryBuilder::build() const {
    std::map<std::uint32_t, Data> special = specialSlots_;
    for (const auto& [slot, component] : components_) special[slot] = codeDigest(digestType_, component);
    const std::uint32_t specialCount = special.empty() ? 0 : special.rbegin()->first;
    const std::uint8_t size = sizeOfDigest(digestType_);

    const std::uint32_t identifierAt = headerSize(version_);
    const std::uint32_t teamAt = identifierAt + u32(identifier_.size() + 1);
    const std::uint32_t scatterAt = teamAt + (team_.empty() ? 0 : u32(team_.size() + 1));
    const std::uint32_t hashesAt = scatterAt + u32(scatter_.size()) + specialCount * size;
    const std::uint32_t end = hashesAt + codeSlots_ * size;

    ByteWriter writer;
    writer.be32(magic_).be32(length_.value_or(end)).be32(version_).be32(flags_);
    writer.be32(hashOffset_.value_or(hashesAt)).be32(identifierOffset_.value_or(identifierAt));
    writer.be32(specialSlotCount_.value_or(specialCount)).be32(codeSlotCount_.value_or(codeSlots_));
    writer.be32(codeSlots_ * 4096);  // limit
    writer.u8(digestSize_.value_or(size)).u8(digestType_).u8(0).u8(12).be32(0);
    if (version_ >= 0x20100) writer.be32(scatterOffset_.value_or(scatter_.empty() ? 0 : scatterAt));
    if (version_ >= 0x20200) writer.be32(teamOffset_.value_or(team_.empty() ? 0 : teamAt));
    if (version_ >= 0x20300) writer.be32(0).be64(0);
    if (version_ >= 0x20400) writer.be64(0).be64(0).be64(0);
    if (version_ >= 0x20500) writer.be32(0).be32(preEncryptionOffset_.value_or(0));

    writer.text(identifier_).u8(0);
    if (!team_.empty()) writer.text(team_).u8(0);
    writer.bytes(scatter_);
    for (std::uint32_t slot = specialCount; slot > 0; --slot) {
        writer.bytes(special.contains(slot) ? special.at(slot) : Data(size));
    }
    writer.bytes(Data(std::size_t{codeSlots_} * size, std::byte{0xAB}));
    return std::move(writer).take();
}

SuperBlobBuilder& SuperBlobBuilder::blob(std::uint32_t slot, Data bytes) {
    entries_.push_back({slot, std::move(bytes), std::exchange(nextGap_, 0), std::nullopt});
    return *this;
}

SuperBlobBuilder& SuperBlobBuilder::gap(std::size_t size) {
    nextGap_ = size;
    return *this;
}

SuperBlobBuilder& SuperBlobBuilder::offsetOf(std::uint32_t slot, std::uint32_t value) {
    for (Entry& entry : entries_) {
        if (entry.slot == slot) entry.offset = value;
    }
    return *this;
}

Data SuperBlobBuilder::build() const {
    ByteWriter blobs;
    std::vector<std::pair<std::uint32_t, std::uint32_t>> index;
    const std::size_t first = 12 + 8 * entries_.size();
    for (const Entry& entry : entries_) {
        blobs.bytes(Data(entry.gapBefore, std::byte{0xEE}));
        index.emplace_back(entry.slot, entry.offset.value_or(u32(first + blobs.size())));
        blobs.bytes(entry.bytes);
    }
    if (reverse_) std::reverse(index.begin(), index.end());

    ByteWriter writer;
    writer.be32(magic_)
        .be32(length_.value_or(u32(first + blobs.size())))
        .be32(count_.value_or(u32(index.size())));
    for (const auto& [slot, offset] : index) writer.be32(slot).be32(offset);
    writer.bytes(blobs.data());
    return std::move(writer).take();
}

SuperBlobBuilder SuperBlobBuilder::adHoc(Data directory) {
    return SuperBlobBuilder().blob(0, std::move(directory)).blob(2, emptyRequirements()).cms({});
}

SuperBlobBuilder SuperBlobBuilder::adHoc() {
    return adHoc(CodeDirectoryBuilder().covers(2, emptyRequirements()).build());
}

}  // namespace pinwell::test
