#include "files/file_reader.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <limits>
#include <utility>

#include "base/file_io.h"
#include "files/operations.h"

namespace pinwell::files {
namespace {

class DescriptorReader final : public FileReader {
  public:
    DescriptorReader(int descriptor, std::string name) : descriptor_(descriptor), name_(std::move(name)) {}

    std::uint64_t seekToEnd() override {
        struct stat status {};
        if (fstat(descriptor_, &status) != 0) fail("seek in");
        return position_ = static_cast<std::uint64_t>(status.st_size);
    }
    std::uint64_t seek(std::uint64_t position) override { return position_ = position; }
    std::uint64_t position() override { return position_; }

    Data read(std::uint64_t length) override {
        auto data =
            readPieces(length, [this](std::byte* into, std::size_t size) { return piece(into, size); });
        if (!data) fail("read");
        return *std::move(data);
    }

  private:
    ssize_t piece(std::byte* into, std::size_t size) {
        if (position_ > static_cast<std::uint64_t>(std::numeric_limits<off_t>::max())) {
            errno = EOVERFLOW;
            return -1;
        }
        const ssize_t count = pread(descriptor_, into, size, static_cast<off_t>(position_));
        if (count > 0) position_ += static_cast<std::uint64_t>(count);
        return count;
    }

    [[noreturn]] void fail(const char* attempt) const {
        throw FileHandleError(std::string("Cannot ") + attempt + " " + name_ + ": " +
                              lastError(name_).localizedFailureReason());
    }

    int descriptor_;
    std::string name_;
    std::uint64_t position_ = 0;
};

}  // namespace

Result<std::unique_ptr<FileReader>> openReader(const std::string& path) {
    if (path.find('\0') != std::string::npos) return Error::posix(EINVAL, path);
    const auto place = Places().find(path);
    if (!place) return place.error();
    auto file = openFileHandle(*place, O_RDONLY);
    if (!file) return file.error();
    return std::unique_ptr<FileReader>(*std::move(file));
}

Result<std::unique_ptr<FileReader>> readerOf(int descriptor, std::string name) {
    const int flags = fcntl(descriptor, F_GETFL);
    if (flags < 0) return lastError(name);
    if ((flags & O_ACCMODE) == O_WRONLY || (flags & O_PATH) != 0) return Error::posix(EBADF, name);
    struct stat status {};
    if (fstat(descriptor, &status) != 0) return lastError(name);
    if (const int reason = base::notRegularReason(status.st_mode); reason != 0)
        return Error::posix(reason, name);
    return std::unique_ptr<FileReader>(std::make_unique<DescriptorReader>(descriptor, std::move(name)));
}

}  // namespace pinwell::files
