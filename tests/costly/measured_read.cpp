#include "measured_read.h"

#include <malloc.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <exception>
#include <fstream>
#include <stdexcept>

namespace pinwell::test {
namespace {

constexpr double kKibibytesInAMebibyte = 1024;

/// The child's report.
struct Report {
    bool isTaken = false;
    double seconds = 0;
    double mebibytes = 0;
    std::array<char, 200> exception{};
};

// Not of the process's clock: under a limit of processor time it only moves at the timer's ticks, and a short
// read would take no time.
double processorSeconds() {
    rusage used{};
    getrusage(RUSAGE_SELF, &used);
    constexpr double kMicrosecondsInASecond = 1e6;
    return static_cast<double>(used.ru_utime.tv_sec + used.ru_stime.tv_sec) +
           static_cast<double>(used.ru_utime.tv_usec + used.ru_stime.tv_usec) / kMicrosecondsInASecond;
}

/// A line of /proc/self/status, in mebibytes.
double statusValue(const std::string& name) {
    std::ifstream status("/proc/self/status");
    for (std::string word; status >> word;) {
        double kibibytes = 0;
        if (word == name && status >> kibibytes) return kibibytes / kKibibytesInAMebibyte;
    }
    throw std::runtime_error("/proc/self/status has no " + name);
}

/// Resets the peak.
void forgetPeak() {
    malloc_trim(0);  // otherwise, the parent's freed memory would be used again unnoticed
    std::ofstream file("/proc/self/clear_refs");
    file << 5;
    if (!file.flush()) throw std::runtime_error("the peak of the memory cannot be reset");
}

Report readHere(const std::function<bool(const base::Data&)>& read, const base::Data& input, int runs) {
    Report report;
    try {
        forgetPeak();
        const double before = statusValue("VmRSS:");
        for (int i = 0; i < runs; ++i) {
            const double start = processorSeconds();
            report.isTaken = read(input);
            const double seconds = processorSeconds() - start;
            report.seconds = i == 0 ? seconds : std::min(report.seconds, seconds);
        }
        report.mebibytes = std::max(0.0, statusValue("VmHWM:") - before);
    } catch (const std::exception& failure) {
        std::strncpy(report.exception.data(), failure.what(), report.exception.size() - 1);
        report.exception[0] = report.exception[0] == '\0' ? '?' : report.exception[0];
    }
    return report;
}

[[noreturn]] void beChild(int out, const std::function<Report()>& work, unsigned limit) {
    const rlimit processorTime{limit, limit};
    const rlimit none{0, 0};
    setrlimit(RLIMIT_CPU, &processorTime);
    setrlimit(RLIMIT_CORE, &none);
    const Report report = work();
    const bool isSent = ::write(out, &report, sizeof report) == static_cast<ssize_t>(sizeof report);
    _exit(isSent ? 0 : 1);
}

std::string endOf(int status, unsigned limit) {
    if (WIFEXITED(status)) return "it ended with " + std::to_string(WEXITSTATUS(status));
    const int signal = WTERMSIG(status);
    if (signal == SIGXCPU || signal == SIGKILL)
        return "it took more than " + std::to_string(limit) + " s of processor time, or was killed";
    return std::string("it was ended by a signal: ") + strsignal(signal);
}

}  // namespace

MeasuredRead measureRead(const std::function<bool(const base::Data&)>& read, const base::Data& input,
                         int runs, unsigned limit) {
    std::array<int, 2> ends{};
    if (pipe(ends.data()) != 0) throw std::runtime_error("no pipe");
    const pid_t child = fork();
    if (child < 0) throw std::runtime_error("no process");
    if (child == 0)
        beChild(
            ends[1], [&] { return readHere(read, input, runs); }, limit);
    close(ends[1]);
    Report report;
    ssize_t received = 0;
    do received = ::read(ends[0], &report, sizeof report);
    while (received < 0 && errno == EINTR);
    close(ends[0]);
    int status = 0;
    while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    if (received != static_cast<ssize_t>(sizeof report)) return {.failure = endOf(status, limit)};
    return {report.exception.data(), report.isTaken, report.seconds, report.mebibytes};
}

bool memoryIsMeasured() {
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
    return false;
#elif defined(__has_feature)
    return !__has_feature(address_sanitizer) && !__has_feature(thread_sanitizer);
#else
    return true;
#endif
}

}  // namespace pinwell::test
