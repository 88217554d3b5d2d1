#include "companion/own_temporary_directory.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <utility>

#include "foundation/process.h"

namespace pinwell::companion {

foundation::Result<OwnTemporaryDirectory> OwnTemporaryDirectory::make(const std::string& name) {
    std::string path = foundation::temporaryDirectory().appendingPathComponent(name + "-XXXXXX").path();
    if (::mkdtemp(path.data()) == nullptr) return foundation::Error::posix(errno, path);
    ::setenv("TMPDIR", path.c_str(), 1);
    return OwnTemporaryDirectory(std::move(path));
}

OwnTemporaryDirectory::OwnTemporaryDirectory(OwnTemporaryDirectory&& other) noexcept
    : path_(std::exchange(other.path_, {})) {}

OwnTemporaryDirectory::~OwnTemporaryDirectory() {
    std::error_code ignored;
    if (!path_.empty() && !holdsFiles()) std::filesystem::remove(path_, ignored);
}

void OwnTemporaryDirectory::remove() {
    std::error_code ignored;
    std::filesystem::remove_all(std::exchange(path_, {}), ignored);
}

bool OwnTemporaryDirectory::holdsFiles() const {
    std::error_code failure;
    const std::filesystem::directory_iterator entries(path_, failure);
    return !failure && entries != std::filesystem::directory_iterator();
}

}  // namespace pinwell::companion
