// Prints its real and effective user, and their platform directory. It is a separate program, so that a test
// can give a copy of it the set-user-ID bit.
#include <unistd.h>

#include <iostream>

#include "config/platform_directory.h"

int main() {
    std::cout << getuid() << ' ' << geteuid() << ' ' << pinwell::config::PlatformDirectory::current().path()
              << '\n';
}
