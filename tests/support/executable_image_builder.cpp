#include "support/executable_image_builder.h"

#include <sys/stat.h>

#include "base/byte_io.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

using base::ByteWriter;

namespace {

/// Writes 32-bit numbers in the order of one image.
class OrderedWriter {
  public:
    explicit OrderedWriter(bool bigEndian) : bigEndian_(bigEndian) {}

    OrderedWriter& number(std::uint32_t value) {
        if (bigEndian_) {
            writer_.be32(value);
        } else {
            writer_.le32(value);
        }
        return *this;
    }
    OrderedWriter& bytes(ByteView view) {
        writer_.bytes(view);
        return *this;
    }
    std::size_t size() const { return writer_.size(); }
    Data take() && { return std::move(writer_).take(); }

  private:
    ByteWriter writer_;
    bool bigEndian_;
};

std::string defaultInfoPlist(const std::string& executable) {
    return R"(<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0"><dict><key>CFBundleExecutable</key><string>)" +
           executable + "</string></dict></plist>\n";
}

}  // namespace

ExecutableImageBuilder& ExecutableImageBuilder::loadCommand(std::uint32_t command, Data body) {
    commands_.emplace_back(command, std::move(body));
    return *this;
}

Data ExecutableImageBuilder::build() const {
    constexpr std::size_t codeSize = 64;
    const std::size_t headerSize = is64_ ? 32 : 28;
    std::size_t commandsSize = signed_ ? 16 : 0;
    for (const auto& [command, body] : commands_) commandsSize += 8 + body.size();
    const std::size_t signatureAt = headerSize + commandsSize + codeSize;

    OrderedWriter writer(bigEndian_);
    writer.number(magic_.value_or(is64_ ? 0xFEEDFACF : 0xFEEDFACE)).number(cpuType_).number(0).number(2);
    writer.number(commandCount_.value_or(u32(commands_.size() + (signed_ ? 1 : 0))));
    writer.number(commandsSize_.value_or(u32(commandsSize))).number(0);
    if (is64_) writer.number(0);
    for (const auto& [command, body] : commands_)
        writer.number(command).number(u32(8 + body.size())).bytes(body);
    if (signed_) {
        writer.number(0x1D).number(signatureCommandSize_.value_or(16));
        writer.number(signatureOffset_.value_or(u32(signatureAt)));
        writer.number(signatureLength_.value_or(u32(signature_.size() + padding_.size())));
    }
    writer.bytes(Data(codeSize, std::byte{0xC3}));
    if (signed_) writer.bytes(signature_).bytes(padding_);
    return std::move(writer).take();
}

UniversalImageBuilder& UniversalImageBuilder::slice(std::uint32_t cpuType, Data image) {
    slices_.emplace_back(cpuType, std::move(image));
    return *this;
}

UniversalImageBuilder& UniversalImageBuilder::wide() {
    wide_ = true;
    return *this;
}

UniversalImageBuilder& UniversalImageBuilder::count(std::uint32_t value) {
    count_ = value;
    return *this;
}

UniversalImageBuilder& UniversalImageBuilder::offsetOf(std::size_t slice, std::uint64_t value) {
    offsets_[slice] = value;
    return *this;
}

UniversalImageBuilder& UniversalImageBuilder::sizeOf(std::size_t slice, std::uint64_t value) {
    sizes_[slice] = value;
    return *this;
}

UniversalImageBuilder& UniversalImageBuilder::subtypeOf(std::size_t slice, std::uint32_t value) {
    subtypes_[slice] = value;
    return *this;
}

Data UniversalImageBuilder::build() const {
    std::vector<std::pair<std::uint32_t, Data>> slices = slices_;
    if (slices.empty()) slices.emplace_back(kSampleArm, ExecutableImageBuilder().build());

    const auto aligned = [](std::size_t offset) { return (offset + 63) / 64 * 64; };
    std::size_t next = aligned(8 + slices.size() * (wide_ ? 32 : 20));
    ByteWriter list;
    ByteWriter images;
    const std::size_t first = next;
    for (std::size_t i = 0; i < slices.size(); ++i) {
        const Data& image = slices[i].second;
        const std::uint64_t offset = offsets_.contains(i) ? offsets_.at(i) : next;
        const std::uint64_t size = sizes_.contains(i) ? sizes_.at(i) : image.size();
        list.be32(slices[i].first).be32(subtypes_.contains(i) ? subtypes_.at(i) : 0);
        if (wide_) {
            list.be64(offset).be64(size).be32(6).be32(0);
        } else {
            list.be32(u32(offset)).be32(u32(size)).be32(6);
        }
        images.zeros(next - first - images.size()).bytes(image);
        next = aligned(next + image.size());
    }

    ByteWriter writer;
    writer.be32(wide_ ? 0xCAFEBABF : 0xCAFEBABE).be32(count_.value_or(u32(slices.size())));
    writer.bytes(list.data());
    writer.zeros(first - writer.size()).bytes(images.data());
    return std::move(writer).take();
}

BundleBuilder& BundleBuilder::executableName(std::string name) {
    executableName_ = std::move(name);
    return *this;
}

BundleBuilder& BundleBuilder::executable(Data bytes) {
    executable_ = std::move(bytes);
    return *this;
}

BundleBuilder& BundleBuilder::executableDirectory(std::string belowContents) {
    executableDirectory_ = std::move(belowContents);
    return *this;
}

BundleBuilder& BundleBuilder::infoPlist(std::string text) {
    infoPlist_ = std::move(text);
    return *this;
}

BundleBuilder& BundleBuilder::file(std::string relativePath, Data contents) {
    files_[std::move(relativePath)] = std::move(contents);
    return *this;
}

BundleBuilder& BundleBuilder::separateSignature(Data codeDirectory, Data requirements, Data cms) {
    if (!codeDirectory.empty()) file("Contents/_CodeSignature/CodeDirectory", std::move(codeDirectory));
    if (!requirements.empty()) file("Contents/_CodeSignature/CodeRequirements", std::move(requirements));
    if (!cms.empty()) file("Contents/_CodeSignature/CodeSignature", std::move(cms));
    return *this;
}

std::string BundleBuilder::write(const std::string& path) const {
    const std::string infoPlist = infoPlist_.value_or(defaultInfoPlist(executableName_));
    if (!infoPlist.empty()) writeFile(path + "/Contents/Info.plist", infoPlist);
    const std::string executable = path + "/Contents/" + executableDirectory_ + "/" + executableName_;
    writeFile(executable, executable_);
    chmod(executable.c_str(), 0755);
    for (const auto& [name, contents] : files_) writeFile(path + "/" + name, contents);
    return executable;
}

}  // namespace pinwell::test
