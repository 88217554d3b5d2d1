// seccomp: system calls given up for good. For this folder only.
#pragma once

#include <optional>
#include <string>

#include "sandbox/sandbox.h"

namespace pinwell::sandbox {

/// Whether Landlock already keeps files from being opened for writing.
enum class FilesAre { open, restricted };

/// Gives up the calls that `calls` does not allow. Returns why nothing was given up; `nullopt` if they were.
/// The process must have no_new_privs set.
std::optional<std::string> restrictCalls(Calls calls, Network network, FilesAre files);

}  // namespace pinwell::sandbox
