#include "confined_child.h"

#include <gtest/gtest.h>
#include <seccomp.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>

#include "child_process.h"

namespace pinwell::test {
namespace {

constexpr int kUnconfined = 250;

// The child's exit status and output.
Outcome inChild(const std::function<int(int output)>& body) {
    const ChildEnd end = endOfChild(body);
    if (!WIFEXITED(end.status)) ADD_FAILURE() << "the child was ended by signal " << WTERMSIG(end.status);
    return {end.said, WEXITSTATUS(end.status)};
}

// A failed write is visible as missing output.
void say(int output, const std::vector<std::string>& lines) {
    for (const std::string& line : lines)
        [[maybe_unused]] const ssize_t written = write(output, (line + "\n").data(), line.size() + 1);
}

void refuse(scmp_filter_ctx filter, int reason, int call) {
    seccomp_rule_add(filter, SCMP_ACT_ERRNO(static_cast<unsigned>(reason)), call, 0);
}

void takeAway(Missing missing) {
    const scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
    if (missing == Missing::landlock) {
        refuse(filter, ENOSYS, SCMP_SYS(landlock_create_ruleset));
    } else {
        refuse(filter, ENOSYS, SCMP_SYS(seccomp));
        const scmp_arg_cmp setsFilter{.arg = 0, .op = SCMP_CMP_EQ, .datum_a = PR_SET_SECCOMP, .datum_b = 0};
        seccomp_rule_add(filter, SCMP_ACT_ERRNO(EINVAL), SCMP_SYS(prctl), 1, setsFilter);
    }
    if (seccomp_load(filter) != 0) _exit(kUnconfined);
    seccomp_release(filter);
}

}  // namespace

int whenConfined(const sandbox::Confinement& confinement, const Attempt& attempt) {
    const Outcome outcome = inChild([&](int output) {
        const auto missing = sandbox::confine(confinement);
        say(output, missing);
        return missing.empty() ? attempt() : kUnconfined;
    });
    EXPECT_EQ(outcome.said, "");
    return outcome.result;
}

Outcome whenConfinedWithout(Missing missing, const sandbox::Confinement& confinement,
                            const Attempt& attempt) {
    return inChild([&](int output) {
        takeAway(missing);
        say(output, sandbox::confine(confinement));
        return attempt();
    });
}

std::optional<std::string> confinementMissing() {
    const Outcome outcome = inChild([](int output) {
        say(output, sandbox::confine({.files = {{"/", sandbox::Access::write}}}));
        return 0;
    });
    if (outcome.said.empty()) return std::nullopt;
    return outcome.said;
}

}  // namespace pinwell::test
