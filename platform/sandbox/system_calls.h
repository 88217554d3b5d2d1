// seccomp: gives up system calls permanently. For this folder only.
#pragma once

#include <optional>
#include <string>

#include "sandbox/sandbox.h"

namespace pinwell::sandbox {

/// Whether Landlock already prevents opening files for writing.
enum class FilesAre { open, restricted };

/// Gives up the calls that `calls` does not allow. Returns `nullopt` on success, otherwise the reason. The
/// process must have no_new_privs set.
std::optional<std::string> restrictCalls(Calls calls, Network network, FilesAre files);

}  // namespace pinwell::sandbox
