#include "retrieval/file_state.h"

#include <sys/stat.h>

namespace pinwell::retrieval {
namespace {

std::string textOf(const timespec& time) {
    return std::to_string(time.tv_sec) + "." + std::to_string(time.tv_nsec);
}

}  // namespace

std::string stateOfFile(const std::string& path) {
    struct stat status {};
    if (::lstat(path.c_str(), &status) != 0) return {};
    return std::to_string(status.st_size) + "," + textOf(status.st_mtim) + "," + textOf(status.st_ctim) +
           "," + std::to_string(status.st_ino);
}

}  // namespace pinwell::retrieval
