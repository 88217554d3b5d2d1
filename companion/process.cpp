#include "companion/process.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <sysexits.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <system_error>
#include <utility>

#include "companion/command_line.h"
#include "runtime/process.h"

namespace pinwell::companion {
namespace {

base::FileDescriptor owned(int number, const char* call) {
    if (number < 0) throw std::system_error(errno, std::generic_category(), call);
    return base::FileDescriptor(number);
}

}  // namespace

int runMain(std::string_view program, const std::function<int()>& run) {
    runtime::occupyStandardStreams();
    std::signal(SIGPIPE, SIG_IGN);
    std::signal(SIGXFSZ, SIG_IGN);
    try {
        return run();
    } catch (const std::exception& error) {
        complain(program, error.what());
        return EX_SOFTWARE;
    }
}

base::FileDescriptor takeEndingSignals() {
    sigset_t ending;
    sigemptyset(&ending);
    for (const int number : {SIGHUP, SIGINT, SIGTERM}) {
        struct sigaction now {};
        sigaction(number, nullptr, &now);
        if (now.sa_handler != SIG_IGN) sigaddset(&ending, number);
    }
    pthread_sigmask(SIG_BLOCK, &ending, nullptr);
    return owned(::signalfd(-1, &ending, SFD_CLOEXEC | SFD_NONBLOCK), "signalfd");
}

std::optional<int> nextEndingSignal(const base::FileDescriptor& signals) {
    signalfd_siginfo info{};
    if (::read(signals.get(), &info, sizeof info) != sizeof info) return std::nullopt;
    return static_cast<int>(info.ssi_signo);
}

SignalWatch::SignalWatch(base::FileDescriptor signals, std::function<void(int number)> react)
    : signals_(std::move(signals)),
      end_(owned(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK), "eventfd")),
      thread_([this, react = std::move(react)] {
          while (true) {
              std::array<pollfd, 2> sources{pollfd{signals_.get(), POLLIN, 0}, pollfd{end_.get(), POLLIN, 0}};
              if (::poll(sources.data(), sources.size(), -1) < 0 && errno != EINTR) return;
              if (sources.at(1).revents != 0) return;
              if (const auto number = nextEndingSignal(signals_)) return react(*number);
          }
      }) {}

SignalWatch::~SignalWatch() {
    const std::uint64_t one = 1;
    [[maybe_unused]] const ssize_t ignored = ::write(end_.get(), &one, sizeof one);
    thread_.join();
}

base::Result<OwnTemporaryDirectory> OwnTemporaryDirectory::make(const std::string& name) {
    std::string path = runtime::temporaryDirectory().appendingPathComponent(name + "-XXXXXX").path();
    if (::mkdtemp(path.data()) == nullptr) return base::Error::posix(errno, path);
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
