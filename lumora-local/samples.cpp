#include "samples.h"

#include <zlib.h>

#include <filesystem>
#include <system_error>
#include <utility>

#include "failure.h"
#include "file_writing.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::Data;

const Bytef* zlibBytes(ByteView bytes) {
    return reinterpret_cast<const Bytef*>(bytes.data());
}

}  // namespace

Data deflated(ByteView contents) {
    uLongf length = compressBound(contents.size());
    Data stream(length);
    const int status = compress2(reinterpret_cast<Bytef*>(stream.data()), &length, zlibBytes(contents),
                                 contents.size(), Z_BEST_COMPRESSION);
    if (status != Z_OK) throw Failure(EX_SOFTWARE, "cannot compress");
    stream.resize(length);
    return stream;
}

std::uint32_t crc32(ByteView bytes) {
    return static_cast<std::uint32_t>(::crc32_z(0, zlibBytes(bytes), bytes.size()));
}

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

std::vector<std::string> writeSamples(const std::string& directory, values::Date now) {
    std::error_code error;
    std::filesystem::create_directories(directory, error);
    if (error)
        throw Failure(EX_CANTCREAT, values::format("cannot create %@: %@", directory, error.message()));
    for (const char* const name : {kApplication, kSignedImage, kUnsignedImage, kPackage}) {
        const std::string path = directory + "/" + name;
        if (std::filesystem::symlink_status(path, error).type() != std::filesystem::file_type::not_found)
            throw Failure(EX_CANTCREAT, values::format("%@ exists", path));
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
