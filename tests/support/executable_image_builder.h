// Executable images, thin and universal, and bundles around them, field by field. `.build()` without any
// other call is a valid image with an ad-hoc signature.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "support/code_directory_builder.h"

namespace pinwell::test {

inline constexpr std::uint32_t kSampleArm = 0x0100000C;
inline constexpr std::uint32_t kSampleX86 = 0x01000007;

/// A thin image: header, load commands (an irrelevant one, then 0x1D), 64 bytes of code, the signature. By
/// default 64-bit, little-endian, CPU type 0x0100000C.
class ExecutableImageBuilder {
  public:
    ExecutableImageBuilder& bigEndian() { return set(bigEndian_, true); }
    ExecutableImageBuilder& bits32() { return set(is64_, false); }
    ExecutableImageBuilder& magic(std::uint32_t value) { return set(magic_, value); }
    ExecutableImageBuilder& cpuType(std::uint32_t value) { return set(cpuType_, value); }

    /// The bytes of the signature area; by default SuperBlobBuilder::adHoc().
    ExecutableImageBuilder& signature(Data area) { return set(signature_, std::move(area)); }

    /// Follows the signature inside its area.
    ExecutableImageBuilder& padding(Data bytes) { return set(padding_, std::move(bytes)); }

    /// No load command 0x1D and no signature.
    ExecutableImageBuilder& withoutSignature() { return set(signed_, false); }

    /// One more load command, before 0x1D.
    ExecutableImageBuilder& loadCommand(std::uint32_t command, Data body);

    ExecutableImageBuilder& commandCount(std::uint32_t value) { return set(commandCount_, value); }
    ExecutableImageBuilder& commandsSize(std::uint32_t value) { return set(commandsSize_, value); }
    ExecutableImageBuilder& signatureCommandSize(std::uint32_t value) {
        return set(signatureCommandSize_, value);
    }
    ExecutableImageBuilder& signatureOffset(std::uint32_t value) { return set(signatureOffset_, value); }
    ExecutableImageBuilder& signatureLength(std::uint32_t value) { return set(signatureLength_, value); }

    Data build() const;

  private:
    template <class Field, class Value>
    ExecutableImageBuilder& set(Field& field, Value&& value) {
        field = std::forward<Value>(value);
        return *this;
    }

    bool bigEndian_ = false;
    bool is64_ = true;
    bool signed_ = true;
    std::optional<std::uint32_t> magic_;
    std::uint32_t cpuType_ = kSampleArm;
    Data signature_ = SuperBlobBuilder::adHoc().build();
    Data padding_;
    std::vector<std::pair<std::uint32_t, Data>> commands_ = {{0x1B, Data(16, std::byte{0x11})}};
    std::optional<std::uint32_t> commandCount_;
    std::optional<std::uint32_t> commandsSize_;
    std::optional<std::uint32_t> signatureCommandSize_;
    std::optional<std::uint32_t> signatureOffset_;
    std::optional<std::uint32_t> signatureLength_;
};

/// A universal image; by default with 32-bit entries. Slices are in the order of their addition, each at the
/// next multiple of 64. Without any slice it gets one: ExecutableImageBuilder's default.
class UniversalImageBuilder {
  public:
    UniversalImageBuilder& slice(std::uint32_t cpuType, Data image);

    /// 64-bit entries.
    UniversalImageBuilder& wide();

    UniversalImageBuilder& count(std::uint32_t value);
    UniversalImageBuilder& offsetOf(std::size_t slice, std::uint64_t value);
    UniversalImageBuilder& sizeOf(std::size_t slice, std::uint64_t value);
    UniversalImageBuilder& subtypeOf(std::size_t slice, std::uint32_t value);

    Data build() const;

  private:
    std::vector<std::pair<std::uint32_t, Data>> slices_;
    bool wide_ = false;
    std::optional<std::uint32_t> count_;
    std::map<std::size_t, std::uint64_t> offsets_;
    std::map<std::size_t, std::uint64_t> sizes_;
    std::map<std::size_t, std::uint32_t> subtypes_;  // 0 by default
};

/// A bundle directory. By default its property list names the executable "Sample". This is
/// ExecutableImageBuilder's default, in Contents/Programs.
class BundleBuilder {
  public:
    BundleBuilder& executableName(std::string name);
    BundleBuilder& executable(Data bytes);
    BundleBuilder& executableDirectory(std::string belowContents);

    /// The text of Contents/Info.plist; an empty text writes none.
    BundleBuilder& infoPlist(std::string text);

    /// One more file, by its path below the bundle.
    BundleBuilder& file(std::string relativePath, Data contents);

    /// The separate form of a signature: the files in Contents/_CodeSignature. An empty one is not written.
    BundleBuilder& separateSignature(Data codeDirectory, Data requirements, Data cms);

    /// Writes the bundle below `path`, with its directories, and returns the path of its main executable.
    std::string write(const std::string& path) const;

  private:
    std::string executableName_ = "Sample";
    std::string executableDirectory_ = "Programs";
    Data executable_ = ExecutableImageBuilder().build();
    std::optional<std::string> infoPlist_;
    std::map<std::string, Data> files_;
};

}  // namespace pinwell::test
