#include "child_process.h"

#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <system_error>

namespace pinwell::test {

ChildEnd endOfChild(const std::function<int(int output)>& body) {
    std::array<int, 2> ends{};
    if (pipe(ends.data()) != 0) throw std::system_error(errno, std::generic_category(), "pipe");
    const pid_t child = fork();
    if (child < 0) throw std::system_error(errno, std::generic_category(), "fork");
    if (child == 0) {
        close(ends[0]);
        _exit(body(ends[1]));
    }
    close(ends[1]);
    ChildEnd end;
    std::array<char, 512> piece{};
    for (ssize_t count = 0; (count = read(ends[0], piece.data(), piece.size())) > 0;)
        end.said.append(piece.data(), static_cast<std::size_t>(count));
    close(ends[0]);
    waitpid(child, &end.status, 0);
    return end;
}

}  // namespace pinwell::test
