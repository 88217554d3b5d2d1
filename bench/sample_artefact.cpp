// Artefacts for the benchmarks:
//
//   sample_artefact image|package FILE    turns any file of any size into a signed artefact
//   sample_artefact paged-image FILE      the same, with a hash for every page of an image
//   sample_artefact bundle DIRECTORY FILES BYTES
//                                         writes a bundle with that many sealed files of that many bytes
//   sample_artefact images DIRECTORY COUNT
//                                         writes small unsigned images with different hashes, which also
//                                         differ from the images of another COUNT
//
// For an image, a signature and a trailer follow the contents. For a package, an archive's header and table
// of contents replace the beginning. The rest of the file stays unchanged on the disk.
#include <cstdio>
#include <exception>
#include <filesystem>
#include <fstream>
#include <random>
#include <string_view>

#include "formats/executable_image.h"
#include "lumora-local/ad_hoc_signature.h"
#include "lumora-local/samples.h"
#include "support/archive_builder.h"
#include "support/disk_image_builder.h"
#include "support/temporary_directory.h"
#include "values/format.h"

namespace {

using pinwell::base::Data;
using pinwell::test::ArchiveBuilder;
using pinwell::test::DiskImageBuilder;

constexpr int kExitUsage = 64;
constexpr int kExitInputOutput = 74;

void writeAt(std::uint64_t offset, const Data& bytes, const char* path) {
    std::fstream file(path, std::ios::binary | std::ios::in | std::ios::out);
    file.exceptions(std::ios::failbit | std::ios::badbit);
    file.seekp(static_cast<std::streamoff>(offset));
    const std::string text = pinwell::base::toString(bytes);
    file.write(text.data(), static_cast<std::streamsize>(text.size()));
    file.close();
}

/// Holds the image in memory: this program is not measured.
void signPages(const char* path) {
    const Data contents = pinwell::base::toData(pinwell::test::readFile(path));
    constexpr std::uint32_t kTrailerSlot = 6;
    const Data superblob =
        pinwell::lumora::AdHocSignature{.identifier = "com.example.benchmark",
                                        .code = contents,
                                        .components = {{kTrailerSlot, DiskImageBuilder().trailer()}}}
            .superblob();
    writeAt(contents.size(),
            DiskImageBuilder().data({}).codeSignOffset(contents.size()).superblob(superblob).build(), path);
}

void writeBundle(const std::string& bundle, int files, std::size_t size) {
    const std::string contents = bundle + "/Contents/";
    std::mt19937_64 random(1);  // NOLINT: the same files in every run
    pinwell::lumora::ResourceSeal seal;
    for (int i = 0; i < files; ++i) {
        const std::string path = pinwell::values::format("Resources/%d/%d", i % 100, i);
        Data bytes(size);
        for (std::byte& byte : bytes) byte = static_cast<std::byte>(random());
        pinwell::test::writeFile(contents + path, bytes);
        seal.addFile(path, bytes);
    }
    const Data list = pinwell::lumora::propertyListDocument({{"CFBundleExecutable", "Sample"}});
    const pinwell::lumora::SealedComponents components{list, seal.document()};
    const std::string executable = contents + "Programs/Sample";
    pinwell::test::writeFile(contents + "Info.plist", list);
    pinwell::test::writeFile(contents + "_CodeSignature/CodeResources", components.resourceSeal);
    pinwell::test::writeFile(executable, pinwell::lumora::makeSignedImage(
                                             pinwell::kCpuType64Arm, "com.example.benchmark", components));
    std::filesystem::permissions(executable, std::filesystem::perms::owner_all);
}

void writeImages(const std::string& folder, int count) {
    for (int i = 1; i <= count; ++i) {
        const std::string data = pinwell::values::format("image %d of %d", i, count);
        pinwell::test::writeFile(pinwell::values::format("%@/Image%d.dmg", folder, i),
                                 DiskImageBuilder().data(pinwell::base::toData(data)).build());
    }
}

}  // namespace

int main(int argc, char** argv) {
    const std::string_view kind = argc >= 3 && argc <= 5 ? argv[1] : "";
    try {
        if (kind == "image") {
            const std::uint64_t size = std::filesystem::file_size(argv[2]);
            const DiskImageBuilder behind =
                DiskImageBuilder().data({}).codeSignOffset(size).superblob(DiskImageBuilder::signature());
            writeAt(size, behind.build(), argv[2]);
        } else if (kind == "package") {
            writeAt(0, ArchiveBuilder().signature("CMS").build(), argv[2]);
        } else if (kind == "paged-image") {
            signPages(argv[2]);
        } else if (kind == "bundle" && argc == 5) {
            writeBundle(argv[2], std::stoi(argv[3]), std::stoul(argv[4]));
        } else if (kind == "images" && argc == 4) {
            writeImages(argv[2], std::stoi(argv[3]));
        } else {
            std::fprintf(stderr,
                         "usage: sample_artefact image|package|paged-image FILE\n"
                         "       sample_artefact bundle DIRECTORY FILES BYTES\n"
                         "       sample_artefact images DIRECTORY COUNT\n");
            return kExitUsage;
        }
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "sample_artefact: %s: %s\n", argv[2], failure.what());
        return kExitInputOutput;
    }
    return 0;
}
