// A library that is preloaded into a program and acts in the middle of a parser, as code does that a hostile
// file has got to run: when the program first parses XML, or first reads from a TLS connection.
//
//   INTRUDER_DOES    attempts   tries what nobody may do there; each attempt leaves a line "NAME ERRNO" in
//   the
//                               file INTRUDER_LOG, which is opened before the program gives anything up
//                    work       uses processor time for ever, of which the program has a second
//                    fall       calls itself for ever
//   INTRUDER_SECRET  a file that the program was not given, beside one with ".old" behind its name
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mount.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

static int output = -1;
static volatile int depth;

static int does(const char* what) {
    const char* const wanted = getenv("INTRUDER_DOES");
    return wanted != NULL && strcmp(wanted, what) == 0;
}

__attribute__((constructor)) static void prepare(void) {
    const char* const path = getenv("INTRUDER_LOG");
    if (path != NULL) output = open(path, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    if (!does("work")) return;
    struct rlimit limit;
    if (getrlimit(RLIMIT_CPU, &limit) != 0) abort();
    limit.rlim_cur = 1;
    if (setrlimit(RLIMIT_CPU, &limit) != 0) abort();
}

static void report(const char* name, long result) {
    const int reason = result < 0 ? errno : 0;
    char line[64];
    const int length = snprintf(line, sizeof line, "%s %d\n", name, reason);
    if (write(output, line, (size_t)length) < 0) abort();
}

// None of them does harm where it may be made.
static void tryEverything(void) {
    const char* const secret = getenv("INTRUDER_SECRET");
    char made[4096];
    char removed[4096];
    snprintf(made, sizeof made, "%s.new", secret);
    snprintf(removed, sizeof removed, "%s.old", secret);
    char* const arguments[] = {NULL};
    report("read", open(secret, O_RDONLY | O_CLOEXEC));
    report("write", open(secret, O_WRONLY | O_CLOEXEC));
    report("make", open(made, O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    report("remove", unlink(removed));
    report("exec", execve("/nonexistent/program", arguments, arguments));
    report("ptrace", ptrace(PTRACE_PEEKDATA, getppid(), NULL, NULL));
    report("mount", mount("none", "/nonexistent/directory", "tmpfs", 0, NULL));
    report("kill", kill(getppid(), 0));
    report("packets", socket(AF_PACKET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    report("udp", socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
}

static int (*volatile further)(void);

static int fall(void) {
    volatile char frame[4096];
    frame[0] = (char)++depth;
    return further() + frame[0];
}

static void act(void) {
    static int acted;
    if (acted++ > 0) return;
    if (does("attempts")) tryEverything();
    while (does("work")) continue;
    further = fall;
    if (does("fall")) fall();
}

typedef int (*XmlReader)(void* parser, const char* text, int length, int isLast);
typedef int (*TlsReader)(void* connection, void* buffer, size_t length, size_t* count);

int XML_Parse(void* parser, const char* text, int length, int isLast);
int XML_Parse(void* parser, const char* text, int length, int isLast) {
    act();
    XmlReader next = NULL;
    *(void**)&next = dlsym(RTLD_NEXT, "XML_Parse");
    return next(parser, text, length, isLast);
}

int SSL_read_ex(void* connection, void* buffer, size_t length, size_t* count);
int SSL_read_ex(void* connection, void* buffer, size_t length, size_t* count) {
    if (getenv("INTRUDER_READS_TLS") != NULL) act();
    TlsReader next = NULL;
    *(void**)&next = dlsym(RTLD_NEXT, "SSL_read_ex");
    return next(connection, buffer, length, count);
}
