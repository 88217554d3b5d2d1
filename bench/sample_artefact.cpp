// Turns a file of any contents and size into a signed artefact: sample_artefact image|package FILE
//
// A signature and a trailer are put behind the contents of an image, an archive's header and table of
// contents over the beginning of a package. All else in the file is left as it lies on the disk.
#include <cstdio>
#include <exception>
#include <filesystem>
#include <fstream>
#include <string_view>

#include "support/archive_builder.h"
#include "support/disk_image_builder.h"

namespace {

using pinwell::foundation::Data;
using pinwell::test::ArchiveBuilder;
using pinwell::test::DiskImageBuilder;

constexpr int kExitUsage = 64;
constexpr int kExitInputOutput = 74;

void writeAt(std::uint64_t offset, const Data& bytes, const char* path) {
    std::fstream file(path, std::ios::binary | std::ios::in | std::ios::out);
    file.exceptions(std::ios::failbit | std::ios::badbit);
    file.seekp(static_cast<std::streamoff>(offset));
    const std::string text = pinwell::foundation::toString(bytes);
    file.write(text.data(), static_cast<std::streamsize>(text.size()));
    file.close();
}

}  // namespace

int main(int argc, char** argv) {
    const std::string_view kind = argc == 3 ? argv[1] : "";
    try {
        if (kind == "image") {
            const std::uint64_t size = std::filesystem::file_size(argv[2]);
            const DiskImageBuilder behind =
                DiskImageBuilder().data({}).codeSignOffset(size).superblob(DiskImageBuilder::signature());
            writeAt(size, behind.build(), argv[2]);
        } else if (kind == "package") {
            writeAt(0, ArchiveBuilder().signature("CMS").build(), argv[2]);
        } else {
            std::fprintf(stderr, "usage: sample_artefact image|package FILE\n");
            return kExitUsage;
        }
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "sample_artefact: %s: %s\n", argv[2], failure.what());
        return kExitInputOutput;
    }
    return 0;
}
