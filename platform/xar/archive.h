// An open archive: its file, and what its table of contents says. For this folder only.
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
    /// The archive at `path`, its table of contents verified; null when it cannot be. Throws std::bad_alloc.
    static std::unique_ptr<Archive> open(const std::string& path);

    const TableOfContents& table() const noexcept { return table_; }

    /// The checksum of the table of contents as it stands in the heap now; nothing when it cannot be read.
    std::optional<foundation::Data> storedChecksum() const;

  private:
    // Where the checksum stands, counted from the start of the heap.
    struct Place {
        std::uint64_t offset = 0;
        std::uint64_t size = 0;
    };

    Archive() = default;

    bool openFile(const std::string& path);
    std::optional<foundation::Data> read(std::uint64_t offset, std::size_t length) const;
    bool readTable(const Header& header);
    bool locateChecksum(DigestAlgorithm algorithm);

    foundation::FileDescriptor file_;
    std::uint64_t fileSize_ = 0;
    std::uint64_t heapStart_ = 0;
    TableOfContents table_;
    foundation::Data computedChecksum_;
    Place checksum_;
};

}  // namespace pinwell::xar
