#include "body_sink.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <mutex>
#include <set>

#include "transfer_error.h"
#include "values/value.h"

namespace pinwell::https {
namespace {

Error writeError(int number, const std::string& path) {
    return makeError(URLErrorCode::cannotWriteFile, "The download could not be written to \"" + path + "\".")
        .causedBy(Error::posix(number, path));
}

// Files that exit() must remove: it runs no destructors of objects on any stack.
class Leftovers {
  public:
    // Never destroyed, because other threads may still have downloads while the process ends.
    static Leftovers& shared() {
        static Leftovers& leftovers = *new Leftovers;
        return leftovers;
    }

    void add(const std::string& path) {
        const std::lock_guard lock(mutex_);
        paths_.insert(path);
    }

    void remove(const std::string& path) {
        const std::lock_guard lock(mutex_);
        if (paths_.erase(path) > 0) ::unlink(path.c_str());
    }

  private:
    Leftovers() {
        if (std::atexit([] { shared().removeAll(); }) != 0)
            std::abort();  // 32 are guaranteed; we are the first
    }

    void removeAll() {
        const std::lock_guard lock(mutex_);
        for (const std::string& path : paths_) ::unlink(path.c_str());
        paths_.clear();
    }

    std::mutex mutex_;
    std::set<std::string> paths_;
};

}  // namespace

Result<std::unique_ptr<DownloadFile>> DownloadFile::make(const URL& directory) {
    std::string path = directory.appendingPathComponent("pinwell-download-XXXXXX").path();
    base::FileDescriptor file(::mkostemp(path.data(), O_CLOEXEC));  // it adds O_EXCL and 0600
    if (!file) return writeError(errno, path);
    return std::unique_ptr<DownloadFile>(new DownloadFile(std::move(file), std::move(path)));
}

DownloadFile::DownloadFile(base::FileDescriptor file, std::string path)
    : file_(std::move(file)), path_(std::move(path)) {
    Leftovers::shared().add(path_);
}

DownloadFile::~DownloadFile() {
    Leftovers::shared().remove(path_);
}

Error DownloadFile::failure(int number) const {
    return writeError(number, path_);
}

Result<void> DownloadFile::write(base::ByteView bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::write(file_.get(), bytes.data(), bytes.size());
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return failure(errno);
        bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return {};
}

Result<void> DownloadFile::finish() {
    if (::close(file_.release()) != 0 && errno != EINTR) return failure(errno);
    return {};
}

}  // namespace pinwell::https
