// File handles.
#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cerrno>
#include <limits>
#include <span>
#include <string>
#include <utility>

#include "operations.h"

namespace pinwell::files {
namespace {

bool exceedsFileSizeLimit(off_t from, off_t length) {
    rlimit limit{};
    if (getrlimit(RLIMIT_FSIZE, &limit) != 0 || limit.rlim_cur == RLIM_INFINITY) return false;
    const auto end = static_cast<rlim_t>(from) + static_cast<rlim_t>(length);  // both fit 63 bits
    return end > limit.rlim_cur;
}

class LocalFileHandle final : public FileHandle {
  public:
    explicit LocalFileHandle(OpenFile file)
        : file_(std::move(file)), attempt_("Cannot read " + file_.path()) {}

    std::uint64_t size() const override { return static_cast<std::uint64_t>(file_.status.st_size); }

    std::size_t readAt(std::uint64_t offset, std::span<std::byte> buffer) const override {
        return base::readAt(file_.number(), offset, buffer, attempt_);
    }

    // The search for data moves the position.
    std::uint64_t nextData(std::uint64_t offset) const override {
        const off_t now = lseek(file_.number(), 0, SEEK_CUR);
        if (now < 0) return offset;
        const std::uint64_t data = base::nextData(file_.number(), offset);
        if (lseek(file_.number(), now, SEEK_SET) != now) {
            const int reason = errno;
            throw base::ReadFailure(base::ReadFailure::Kind::unreadable,
                                    attempt_ + ": " + Error::posix(reason).localizedFailureReason(), offset,
                                    reason);
        }
        return data;
    }

    std::uint64_t seekToEnd() override { return moveTo(0, SEEK_END); }
    std::uint64_t seek(std::uint64_t position) override {
        return moveTo(offset("seek in", position), SEEK_SET);
    }
    std::uint64_t position() override { return moveTo(0, SEEK_CUR); }

    void reserve(std::uint64_t length) override {
        const off_t size = offset("reserve room in", length);
        const off_t from = offset("reserve room in", position());
        // fallocate does not change the file's length here, so it does not check this limit.
        if (exceedsFileSizeLimit(from, size)) fail("reserve room in", Error::posix(EFBIG, file_.path()));
        const int mode = FALLOC_FL_KEEP_SIZE;
        if (uninterrupted([&] { return fallocate(file_.number(), mode, from, size); }) == 0) return;
        // The file system cannot reserve: the write itself will show an error.
        if (errno == EOPNOTSUPP || errno == ENOSYS) return;
        fail("reserve room in", lastError(file_.path()));
    }

    void write(ByteView bytes) override {
        if (const auto done = writeAll(file_, bytes); !done) fail("write to", done.error());
    }

    void truncate(std::uint64_t length) override {
        const off_t size = offset("truncate", length);
        if (uninterrupted([&] { return ftruncate(file_.number(), size); }) != 0)
            fail("truncate", lastError(file_.path()));
    }

    void synchronize() override {
        if (const auto done = flush(file_.number(), file_.path()); !done) fail("synchronize", done.error());
    }

    void close() override {
        if (!file_.descriptor) return;
        if (const auto done = closeReporting(file_); !done) fail("close", done.error());
    }

  private:
    [[noreturn]] void fail(const char* attempt, const Error& error) const {
        throw base::FileFailure(std::string("Cannot ") + attempt + " " + file_.path() + ": " +
                                error.localizedFailureReason());
    }

    off_t offset(const char* attempt, std::uint64_t position) const {
        if (position > static_cast<std::uint64_t>(std::numeric_limits<off_t>::max()))
            fail(attempt, Error::posix(EOVERFLOW));
        return static_cast<off_t>(position);
    }

    std::uint64_t moveTo(off_t distance, int from) {
        const off_t now = uninterrupted([&] { return lseek(file_.number(), distance, from); });
        if (now < 0) fail("seek in", lastError(file_.path()));
        return static_cast<std::uint64_t>(now);
    }

    OpenFile file_;
    std::string attempt_;  // for the reason text of a failed read
};

}  // namespace

Result<std::unique_ptr<FileHandle>> openFileHandle(const Place& place, int access) {
    auto file = openRegularFile(place, access);
    if (!file) return file.error();
    file->place.parent.reset();  // a handle needs only the path, for its errors
    return std::unique_ptr<FileHandle>(std::make_unique<LocalFileHandle>(std::move(*file)));
}

}  // namespace pinwell::files
