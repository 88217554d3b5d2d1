// An open archive: its file, and its table of contents. For this folder only.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "xar/header.h"
#include "xar/table_of_contents.h"

namespace pinwell::xar {

class Archive {
  public:
    /// Opens the archive at `path`, and compares its table of contents with the checksum in the heap. Returns
    /// null if they differ or one cannot be read. Returns null too for an archive with signatures but without
    /// a checksum algorithm, because its signatures would cover nothing. Throws std::bad_alloc.
    static std::unique_ptr<Archive> open(const std::string& path);

    const TableOfContents& table() const noexcept { return table_; }

    /// The checksum of the table of contents, computed and compared with the heap by open(). Empty for an
    /// archive without an algorithm, which has no signatures.
    const foundation::Data& checksum() const noexcept { return checksum_; }

  private:
    Archive() = default;

    bool openFile(const std::string& path);
    std::optional<foundation::Data> read(std::uint64_t offset, std::size_t length) const;
    bool readTable(const Header& header);
    bool isChecksumDescribed(DigestAlgorithm algorithm) const;
    bool isChecksumStored() const;

    foundation::FileDescriptor file_;
    std::uint64_t fileSize_ = 0;
    std::uint64_t heapStart_ = 0;
    TableOfContents table_;
    foundation::Data checksum_;
};

}  // namespace pinwell::xar
