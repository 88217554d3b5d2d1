#include "scratch_file.h"

#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace pinwell::fuzz {

ScratchFile::ScratchFile(ByteView contents) : file_(memfd_create("input", MFD_CLOEXEC)) {
    if (!file_ || write(file_.get(), contents.data(), contents.size()) != std::ssize(contents))
        throw std::system_error(errno, std::generic_category(), "scratch file");
    path_ = "/proc/self/fd/" + std::to_string(file_.get());
}

}  // namespace pinwell::fuzz
