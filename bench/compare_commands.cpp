// Compares the times of two commands in one run:
//   compare_commands [--memory MEBIBYTES] [--time MILLISECONDS] RUNS LIMIT COMMAND... -- PEER...
//
// Runs the two commands in turn, so that other load on the machine affects both alike. Prints the median wall
// time of each, their ratio, the fastest run of each (more reliable on a busy machine), and the highest
// memory of a run of each. Exits with 1 if the ratio of the medians is above LIMIT ("inf" for none), COMMAND
// had more memory than MEBIBYTES, or its median is above MILLISECONDS. Exits with 70 if a command could not
// be run or ended unlike its first run, else with 0.
#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string_view>
#include <utility>
#include <vector>

extern char** environ;

namespace {

using Clock = std::chrono::steady_clock;
using Milliseconds = std::chrono::duration<double, std::milli>;

constexpr int kMostWarmUps = 3;
constexpr int kExitSlower = 1;
constexpr int kExitUsage = 64;
constexpr int kExitSoftware = 70;
constexpr double kKibibytesInAMebibyte = 1024;

class Contender {
  public:
    // `arguments` ends with a null pointer.
    explicit Contender(char** arguments) : arguments_(arguments) {}

    void run(bool counts) {
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        for (const int stream : {0, 1, 2})
            posix_spawn_file_actions_addopen(&actions, stream, "/dev/null", O_RDWR, 0);
        const auto start = Clock::now();
        pid_t process = 0;
        const int failure = posix_spawnp(&process, arguments_[0], &actions, nullptr, arguments_, environ);
        posix_spawn_file_actions_destroy(&actions);
        if (failure != 0) giveUp(std::strerror(failure));
        int status = 0;
        rusage usage{};
        while (wait4(process, &status, 0, &usage) < 0 && errno == EINTR) {
        }
        const Milliseconds took = Clock::now() - start;
        if (firstStatus_ < 0) firstStatus_ = status;
        if (status != firstStatus_) giveUp("ended otherwise than before");
        if (counts) times_.push_back(took.count());
        kibibytes_ = std::max(kibibytes_, usage.ru_maxrss);
    }

    double median() {
        std::sort(times_.begin(), times_.end());
        return times_[times_.size() / 2];
    }
    double fastest() const { return *std::min_element(times_.begin(), times_.end()); }
    double mebibytes() const { return static_cast<double>(kibibytes_) / kKibibytesInAMebibyte; }

  private:
    [[noreturn]] void giveUp(const char* why) const {
        std::fprintf(stderr, "compare_commands: %s: %s\n", arguments_[0], why);
        std::exit(kExitSoftware);
    }

    char** arguments_;
    int firstStatus_ = -1;
    std::vector<double> times_;
    long kibibytes_ = 0;
};

}  // namespace

int main(int argc, char** argv) {
    double memoryLimit = std::numeric_limits<double>::infinity();
    double timeLimit = std::numeric_limits<double>::infinity();
    for (const auto& [option, value] :
         {std::pair("--memory", &memoryLimit), std::pair("--time", &timeLimit)}) {
        if (argc < 3 || std::string_view(argv[1]) != option) continue;
        *value = std::strtod(argv[2], nullptr);
        argv += 2;
        argc -= 2;
    }
    char** separator =
        std::find_if(argv, argv + argc, [](const char* word) { return std::string_view(word) == "--"; });
    const auto words = separator - argv;
    if (words < 4 || words + 1 >= argc) {
        std::fprintf(
            stderr,
            "usage: compare_commands [--memory MEBIBYTES] [--time MILLISECONDS] RUNS LIMIT COMMAND... -- "
            "PEER...\n");
        return kExitUsage;
    }
    const int runs = std::max(1, std::atoi(argv[1]));
    const double limit = std::strtod(argv[2], nullptr);
    *separator = nullptr;

    Contender ours(argv + 3);
    Contender peer(separator + 1);
    for (int i = -std::min(runs, kMostWarmUps); i < runs; ++i) {
        ours.run(i >= 0);
        peer.run(i >= 0);
    }
    const double ratio = ours.median() / peer.median();
    std::printf(
        "%.2f ms against %.2f ms: ratio %.2f (limit %.2f); fastest %.2f and %.2f ms; %.1f and %.1f MiB\n",
        ours.median(), peer.median(), ratio, limit, ours.fastest(), peer.fastest(), ours.mebibytes(),
        peer.mebibytes());
    const bool keepsLimits = ratio <= limit && ours.mebibytes() <= memoryLimit && ours.median() <= timeLimit;
    return keepsLimits ? 0 : kExitSlower;
}
