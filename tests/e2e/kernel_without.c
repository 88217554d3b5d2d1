// A library that is preloaded into a program and takes facilities of the kernel away from it, as a kernel
// without them or a container that forbids them would: KERNEL_WITHOUT holds "landlock", "seccomp" or both.
#include <errno.h>
#include <seccomp.h>
#include <stdlib.h>
#include <string.h>
#include <sys/prctl.h>

__attribute__((constructor)) static void takeAway(void) {
    const char* const missing = getenv("KERNEL_WITHOUT");
    if (missing == NULL) return;
    scmp_filter_ctx filter = seccomp_init(SCMP_ACT_ALLOW);
    if (filter == NULL) abort();
    int failure = 0;
    if (strstr(missing, "landlock") != NULL)
        failure |= seccomp_rule_add(filter, SCMP_ACT_ERRNO(ENOSYS), SCMP_SYS(landlock_create_ruleset), 0);
    if (strstr(missing, "seccomp") != NULL) {
        failure |= seccomp_rule_add(filter, SCMP_ACT_ERRNO(ENOSYS), SCMP_SYS(seccomp), 0);
        failure |= seccomp_rule_add(filter, SCMP_ACT_ERRNO(EINVAL), SCMP_SYS(prctl), 1,
                                    SCMP_A0(SCMP_CMP_EQ, PR_SET_SECCOMP));
    }
    if (failure != 0 || seccomp_load(filter) != 0) abort();
    seccomp_release(filter);
}
