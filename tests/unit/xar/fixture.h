// An archive in a file, opened through the library's own functions.
#pragma once

#include <gtest/gtest.h>
#include <xar/xar.h>

#include <cstdlib>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <type_traits>
#include <vector>

#include "support/archive_builder.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

struct CloseArchive {
    void operator()(xar_t archive) const noexcept { xar_close(archive); }
};
using OpenArchive = std::unique_ptr<std::remove_pointer_t<xar_t>, CloseArchive>;

/// The result of a property call.
struct Property {
    std::int32_t status = 0;
    std::optional<std::string> text;  // `nullopt` for null

    bool operator==(const Property&) const = default;
};
inline const Property kNoProperty{-1, std::nullopt};

class ArchiveTest : public testing::Test {
  protected:
    OpenArchive open(const Data& bytes) {
        writeFile(path, bytes);
        return OpenArchive(xar_open(path.c_str(), 0));
    }
    OpenArchive open(const ArchiveBuilder& archive) { return open(archive.build()); }
    bool opens(const ArchiveBuilder& archive) { return open(archive) != nullptr; }

    /// An archive with this document as its table of contents, and with a matching checksum.
    bool opensWithToc(const std::string& xml) { return opens(ArchiveBuilder().toc(xml)); }

    static Property property(const OpenArchive& archive, const char* key) {
        const char* value = "left over";
        const auto status = xar_prop_get(reinterpret_cast<xar_file_t>(archive.get()), key, &value);
        return {status, value == nullptr ? std::nullopt : std::optional<std::string>(value)};
    }

    /// Every signature's type in order; `nullopt` for null.
    static std::vector<std::optional<std::string>> types(const OpenArchive& archive) {
        std::vector<std::optional<std::string>> all;
        for (auto s = xar_signature_first(archive.get()); s != nullptr; s = xar_signature_next(s)) {
            const char* const type = xar_signature_type(s);
            all.push_back(type == nullptr ? std::nullopt : std::optional<std::string>(type));
        }
        return all;
    }

    /// The bytes that the first signature signs; `nullopt` if they cannot be copied; `status` then has the
    /// reason.
    std::optional<Data> signedData(const OpenArchive& archive) {
        std::uint8_t* bytes = nullptr;
        std::uint32_t length = 0;
        status = xar_signature_copy_signed_data(xar_signature_first(archive.get()), &bytes, &length, nullptr,
                                                nullptr, nullptr);
        if (status != 0) {
            EXPECT_EQ(bytes, nullptr);
            return std::nullopt;
        }
        const Data copy = base::toData(std::as_bytes(std::span(bytes, length)));
        std::free(bytes);
        return copy;
    }

    TemporaryDirectory directory;
    const std::string path = directory / "archive.xar";
    int status = 0;
};

/// The document around these children of the table of contents, after a checksum's element that fits an
/// unsigned archive.
inline std::string tocWith(const std::string& children) {
    return R"(<xar><toc><checksum style="sha1"><offset>0</offset><size>20</size></checksum>)" + children +
           "</toc></xar>";
}

}  // namespace pinwell::test
