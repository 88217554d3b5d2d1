// Simulates a full disk for writes, without a separate volume.
#pragma once

#include <sys/resource.h>

#include <cerrno>
#include <cstddef>
#include <system_error>

namespace pinwell::test {

/// During its life, this process and its children cannot make a longer file. Such a write ends with EFBIG,
/// and with SIGXFSZ unless the signal is ignored. One at a time.
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
