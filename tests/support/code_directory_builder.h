// Code directories and superblobs, field by field. Valid by default. Each setter changes one field, so a
// test shows its wrong field in one line. Integers and digests are encoded here without the code under
// test.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"

namespace pinwell::test {

/// A size as a field of 32 bits. Test data are small enough.
inline std::uint32_t u32(std::size_t value) {
    return static_cast<std::uint32_t>(value);
}

using base::ByteView;
using base::Data;

/// The digest of a code directory's type number (1 SHA-1, 2 SHA-256, 3 SHA-256 cut to 20 bytes, 4 SHA-384).
Data codeDigest(std::uint8_t type, ByteView bytes);

/// The cdhash of a code directory: its digest cut to 20 bytes, to 48 for type 4.
Data codeHashOf(std::uint8_t type, ByteView codeDirectory);

/// A blob: magic, length, payload.
Data makeBlob(std::uint32_t magic, ByteView payload);

/// The requirements blob without a requirement: FADE0C01 0000000C 00000000.
Data emptyRequirements();

/// One code directory. Layout: header, identifier, team, scatter vector, special slots (highest first), code
/// slots (bytes AB). By default version 0x20400, flags 2 (ad hoc), "com.example.sample", SHA-256, no special
/// slots, two code slots. Overridden values (offsets, counts, sizes) are written as given; the layout does
/// not follow them.
class CodeDirectoryBuilder {
  public:
    CodeDirectoryBuilder& magic(std::uint32_t value) { return set(magic_, value); }
    CodeDirectoryBuilder& version(std::uint32_t value) { return set(version_, value); }
    CodeDirectoryBuilder& flags(std::uint32_t value) { return set(flags_, value); }
    CodeDirectoryBuilder& identifier(std::string value) { return set(identifier_, std::move(value)); }
    CodeDirectoryBuilder& team(std::string value) { return set(team_, std::move(value)); }
    CodeDirectoryBuilder& codeSlots(std::uint32_t value) { return set(codeSlots_, value); }

    /// The type number; the digest size follows unless digestSize() is given as well.
    CodeDirectoryBuilder& digestType(std::uint8_t value) { return set(digestType_, value); }

    /// Demands this component in special slot `slot`.
    CodeDirectoryBuilder& covers(std::uint32_t slot, ByteView component);

    /// Demands this digest in special slot `slot`; slots below that are not given are zero.
    CodeDirectoryBuilder& specialSlot(std::uint32_t slot, Data digest);

    /// 24-byte records of the scatter vector, the closing one included.
    CodeDirectoryBuilder& scatter(Data records) { return set(scatter_, std::move(records)); }

    CodeDirectoryBuilder& length(std::uint32_t value) { return set(length_, value); }
    CodeDirectoryBuilder& hashOffset(std::uint32_t value) { return set(hashOffset_, value); }
    CodeDirectoryBuilder& identifierOffset(std::uint32_t value) { return set(identifierOffset_, value); }
    CodeDirectoryBuilder& teamOffset(std::uint32_t value) { return set(teamOffset_, value); }
    CodeDirectoryBuilder& scatterOffset(std::uint32_t value) { return set(scatterOffset_, value); }
    CodeDirectoryBuilder& preEncryptionOffset(std::uint32_t value) {
        return set(preEncryptionOffset_, value);
    }
    CodeDirectoryBuilder& specialSlotCount(std::uint32_t value) { return set(specialSlotCount_, value); }
    CodeDirectoryBuilder& codeSlotCount(std::uint32_t value) { return set(codeSlotCount_, value); }
    CodeDirectoryBuilder& digestSize(std::uint8_t value) { return set(digestSize_, value); }

    Data build() const;

  private:
    template <class Field, class Value>
    CodeDirectoryBuilder& set(Field& field, Value&& value) {
        field = std::forward<Value>(value);
        return *this;
    }

    std::uint32_t magic_ = 0xFADE0C02;
    std::uint32_t version_ = 0x20400;
    std::uint32_t flags_ = 2;
    std::string identifier_ = "com.example.sample";
    std::string team_;
    std::uint8_t digestType_ = 2;
    std::uint32_t codeSlots_ = 2;
    std::map<std::uint32_t, Data> components_;
    std::map<std::uint32_t, Data> specialSlots_;
    Data scatter_;
    std::optional<std::uint32_t> length_;
    std::optional<std::uint32_t> hashOffset_;
    std::optional<std::uint32_t> identifierOffset_;
    std::optional<std::uint32_t> teamOffset_;
    std::optional<std::uint32_t> scatterOffset_;
    std::optional<std::uint32_t> preEncryptionOffset_;
    std::optional<std::uint32_t> specialSlotCount_;
    std::optional<std::uint32_t> codeSlotCount_;
    std::optional<std::uint8_t> digestSize_;
};

/// One superblob. Without any call it is empty and valid (12 bytes). Blobs are in the order of their
/// addition.
class SuperBlobBuilder {
  public:
    /// A blob with its header, for the index slot `slot`.
    SuperBlobBuilder& blob(std::uint32_t slot, Data bytes);

    /// The CMS message, bare, wrapped into its blob in slot 0x10000.
    SuperBlobBuilder& cms(ByteView bare) { return blob(0x10000, makeBlob(0xFADE0B01, bare)); }

    /// This many bytes of EE before the next blob.
    SuperBlobBuilder& gap(std::size_t size);

    /// Lists the blobs in reverse order; the blobs do not move.
    SuperBlobBuilder& reverseIndex() { return set(reverse_, true); }

    /// Sets the offset of the blob of `slot` in the index.
    SuperBlobBuilder& offsetOf(std::uint32_t slot, std::uint32_t value);

    SuperBlobBuilder& magic(std::uint32_t value) { return set(magic_, value); }
    SuperBlobBuilder& length(std::uint32_t value) { return set(length_, value); }
    SuperBlobBuilder& count(std::uint32_t value) { return set(count_, value); }

    Data build() const;

    /// An ad-hoc signature: `directory`, the empty requirements, which `directory` should cover, and an empty
    /// CMS blob.
    static SuperBlobBuilder adHoc(Data directory);

    /// An ad-hoc signature with the default code directory.
    static SuperBlobBuilder adHoc();

  private:
    struct Entry {
        std::uint32_t slot;
        Data bytes;
        std::size_t gapBefore;
        std::optional<std::uint32_t> offset;
    };

    template <class Field, class Value>
    SuperBlobBuilder& set(Field& field, Value value) {
        field = value;
        return *this;
    }

    std::vector<Entry> entries_;
    std::size_t nextGap_ = 0;
    bool reverse_ = false;
    std::uint32_t magic_ = 0xFADE0CC0;
    std::optional<std::uint32_t> length_;
    std::optional<std::uint32_t> count_;
};

}  // namespace pinwell::test
