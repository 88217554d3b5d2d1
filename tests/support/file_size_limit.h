// What a full disk would do to a write, without a volume of its own.
#pragma once

#include <sys/resource.h>

#include <cerrno>
#include <cstddef>
#include <system_error>

namespace pinwell::test {

/// While it lives, this process and those that it starts make no file longer than that many bytes. A write
/// that would ends with EFBIG, and with SIGXFSZ where that is not ignored. One at a time.
class FileSizeLimit {
  public:
    explicit FileSizeLimit(std::size_t bytes) {
        check(::getrlimit(RLIMIT_FSIZE, &before_));
        const rlimit small{bytes, before_.rlim_max};
        check(::setrlimit(RLIMIT_FSIZE, &small));
    }
    ~FileSizeLimit() { ::setrlimit(RLIMIT_FSIZE, &before_); }
    FileSizeLimit(const FileSizeLimit&) = delete;
    FileSizeLimit& operator=(const FileSizeLimit&) = delete;

  private:
    static void check(int result) {
        if (result != 0)
            throw std::system_error(errno, std::system_category(), "cannot limit the size of files");
    }

    rlimit before_{};
};

}  // namespace pinwell::test
