#include "lumora-local/samples.h"

#include <filesystem>
#include <system_error>
#include <utility>

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/file_writing.h"
#include "lumora-local/sample_bundle.h"
#include "lumora-local/sample_disk_image.h"
#include "lumora-local/sample_package.h"

namespace pinwell::lumora {
namespace {

constexpr const char* kApplication = "Sample.app";
constexpr const char* kSignedImage = "Sample.dmg";
constexpr const char* kUnsignedImage = "Unsigned.dmg";
constexpr const char* kPackage = "Sample.pkg";

/// The written files of the set. They are removed again unless the set is complete, so that the next try
/// finds no file.
class PendingSet {
  public:
    PendingSet() = default;
    ~PendingSet() {
        std::error_code ignored;
        for (const std::string& path : paths_) std::filesystem::remove_all(path, ignored);
    }
    PendingSet(const PendingSet&) = delete;
    PendingSet& operator=(const PendingSet&) = delete;

    void add(std::string path) { paths_.push_back(std::move(path)); }
    std::vector<std::string> complete() && { return std::exchange(paths_, {}); }

  private:
    std::vector<std::string> paths_;
};

}  // namespace

std::vector<std::string> writeSamples(const std::string& directory, foundation::Date now) {
    std::error_code error;
    std::filesystem::create_directories(directory, error);
    if (error)
        throw Failure(EX_CANTCREAT, foundation::format("cannot create %@: %@", directory, error.message()));
    for (const char* const name : {kApplication, kSignedImage, kUnsignedImage, kPackage}) {
        const std::string path = directory + "/" + name;
        if (std::filesystem::symlink_status(path, error).type() != std::filesystem::file_type::not_found)
            throw Failure(EX_CANTCREAT, foundation::format("%@ exists", path));
    }
    PendingSet set;
    set.add(writeSampleApplication(directory));
    set.add(writeSampleDiskImage(directory, kSignedImage, ImageSignature::adHoc));
    set.add(writeSampleDiskImage(directory, kUnsignedImage, ImageSignature::none));
    set.add(writeSamplePackage(directory, kPackage, now));
    flushDirectory(directory);
    return std::move(set).complete();
}

}  // namespace pinwell::lumora
