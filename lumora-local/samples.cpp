#include "lumora-local/samples.h"

#include <filesystem>
#include <system_error>

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/sample_bundle.h"
#include "lumora-local/sample_disk_image.h"
#include "lumora-local/sample_package.h"

namespace pinwell::lumora {
namespace {

constexpr const char* kApplication = "Sample.app";
constexpr const char* kSignedImage = "Sample.dmg";
constexpr const char* kUnsignedImage = "Unsigned.dmg";
constexpr const char* kPackage = "Sample.pkg";

}  // namespace

std::vector<std::string> writeSamples(const std::string& directory, foundation::Date now) {
    std::error_code error;
    std::filesystem::create_directories(directory, error);
    if (error)
        throw Failure(EX_CANTCREAT, foundation::format("cannot create %@: %@", directory, error.message()));
    // Half a set would be in the way of the next try.
    for (const char* const name : {kApplication, kSignedImage, kUnsignedImage, kPackage}) {
        const std::string path = directory + "/" + name;
        if (std::filesystem::symlink_status(path, error).type() != std::filesystem::file_type::not_found)
            throw Failure(EX_CANTCREAT, foundation::format("%@ exists", path));
    }
    return {writeSampleApplication(directory),
            writeSampleDiskImage(directory, kSignedImage, ImageSignature::adHoc),
            writeSampleDiskImage(directory, kUnsignedImage, ImageSignature::none),
            writeSamplePackage(directory, kPackage, now)};
}

}  // namespace pinwell::lumora
