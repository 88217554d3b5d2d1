#include "support/archive_builder.h"

#include <openssl/evp.h>
#include <zlib.h>

#include <array>
#include <stdexcept>
#include <vector>

#include "base/byte_io.h"

namespace pinwell::test {
namespace {

constexpr std::size_t kFixedHeaderSize = 28;

Data digestOf(const std::string& name, ByteView bytes) {
    if (name == "none") return {};
    std::array<unsigned char, EVP_MAX_MD_SIZE> value{};
    unsigned length = 0;
    const EVP_MD* const algorithm = EVP_get_digestbyname(name.c_str());
    if (algorithm == nullptr ||
        EVP_Digest(bytes.data(), bytes.size(), value.data(), &length, algorithm, nullptr) != 1)
        throw std::runtime_error("no digest " + name);
    return base::toData(std::as_bytes(std::span(value)).first(length));
}

std::string elementOf(const std::string& name, const std::string& text) {
    return text.empty() ? "" : "<" + name + ">" + text + "</" + name + ">";
}

}  // namespace

Data deflated(ByteView contents) {
    const auto size = static_cast<uLong>(contents.size());
    uLongf length = compressBound(size);
    std::vector<Bytef> out(length);
    if (compress(out.data(), &length, reinterpret_cast<const Bytef*>(contents.data()), size) != Z_OK)
        throw std::runtime_error("cannot compress");
    return base::toData(std::as_bytes(std::span(out)).first(length));
}

Data deflated(std::string_view contents) {
    return deflated(base::asBytes(contents));
}

ArchiveBuilder& ArchiveBuilder::namedDigest(const std::string& name) {
    base::ByteWriter tail;
    tail.text(name).zeros(4 - name.size() % 4);
    return digest(name).algorithm(3).headerTail(std::move(tail).take());
}

ArchiveBuilder& ArchiveBuilder::element(std::string_view xml) {
    elements_ += xml;
    return *this;
}

ArchiveBuilder& ArchiveBuilder::signature(std::string_view style) {
    return element("<signature style=\"" + std::string(style) +
                   "\"><offset>20</offset><size>15</size></signature>");
}

std::string ArchiveBuilder::checksumDescription() const {
    if (checksumElement_) return *checksumElement_;
    if (digest_ == "none" && !checksumStyle_) return "";
    const std::string style = checksumStyle_.value_or(digest_);
    return "<checksum" + (style.empty() ? "" : " style=\"" + style + "\"") + ">" +
           elementOf("offset", checksumOffset_.value_or(std::to_string(beforeChecksum_.size()))) +
           elementOf("size", checksumSize_.value_or(std::to_string(digestOf(digest_, {}).size()))) +
           "</checksum>";
}

std::string ArchiveBuilder::document() const {
    if (toc_) return *toc_;
    return R"(<?xml version="1.0" encoding="UTF-8"?>
<xar><toc><creation-time>2026-11-20T19:55:00</creation-time>)" +
           checksumDescription() + elements_ +
           R"(<file id="1"><name>Payload</name><data><offset>35</offset><size>4</size></data></file></toc></xar>)";
}

Data ArchiveBuilder::stream() const {
    return compressedToc_ ? *compressedToc_ : deflated(document());
}

Data ArchiveBuilder::rightChecksum() const {
    return digestOf(digest_, stream());
}

std::size_t ArchiveBuilder::heapStart() const {
    return kFixedHeaderSize + headerTail_.size() + stream().size();
}

std::uint32_t ArchiveBuilder::digestNumber() const {
    if (digest_ == "none") return 0;
    if (digest_ == "sha1") return 1;
    if (digest_ == "md5") return 2;
    return digest_ == "sha512" ? 4 : 3;
}

Data ArchiveBuilder::build() const {
    const Data toc = stream();
    base::ByteWriter writer;
    writer.text(magic_);
    writer.be16(headerSize_.value_or(static_cast<std::uint16_t>(kFixedHeaderSize + headerTail_.size())));
    writer.be16(version_).be64(compressedLength_.value_or(toc.size()));
    writer.be64(uncompressedLength_.value_or(document().size()));
    writer.be32(algorithm_.value_or(digestNumber())).bytes(headerTail_);
    writer.bytes(toc);
    writer.bytes(beforeChecksum_).bytes(checksum_.value_or(digestOf(digest_, toc))).bytes(afterChecksum_);
    return std::move(writer).take();
}

}  // namespace pinwell::test
