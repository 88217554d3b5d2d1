#include "support/message_capture.h"

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <sstream>
#include <system_error>

#include "src/messages.h"

namespace pinwell::test {

MessageCapture::MessageCapture(std::uint8_t verbosity)
    : file_(memfd_create("messages", MFD_CLOEXEC)), savedOutput_(-1), savedVerbosity_(verboseLevel) {
    if (file_ < 0) throw std::system_error(errno, std::generic_category(), "memfd_create");
    std::fflush(stdout);  // keeps GoogleTest's own lines in their order
    savedOutput_ = dup(STDOUT_FILENO);
    if (savedOutput_ < 0 || dup2(file_, STDOUT_FILENO) < 0)
        throw std::system_error(errno, std::generic_category(), "dup");
    verboseLevel = verbosity;
}

MessageCapture::~MessageCapture() {
    dup2(savedOutput_, STDOUT_FILENO);
    close(savedOutput_);
    close(file_);
    verboseLevel = savedVerbosity_;
}

std::string MessageCapture::text() const {
    std::string text;
    char chunk[4096];
    off_t offset = 0;
    for (ssize_t count = 0; (count = pread(file_, chunk, sizeof chunk, offset)) > 0; offset += count)
        text.append(chunk, static_cast<std::size_t>(count));
    return text;
}

std::vector<std::string> MessageCapture::lines() const {
    std::vector<std::string> lines;
    std::istringstream stream(text());
    for (std::string line; std::getline(stream, line);) lines.push_back(line);
    return lines;
}

bool MessageCapture::contains(const std::string& line) const {
    const auto all = lines();
    return std::find(all.begin(), all.end(), line) != all.end();
}

}  // namespace pinwell::test
