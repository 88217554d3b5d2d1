// The two facilities of the kernel, each by itself. For this folder only.
#pragma once

#include "base/error.h"
#include "sandbox/sandbox.h"

namespace pinwell::sandbox {

/// Landlock: gives up all rights to files that `files` does not name, and to TCP as `network` says, as far as
/// the kernel's version supports it. The process must have no_new_privs set.
base::Result<void> restrictFiles(const FileRules& files, Network network);

/// Whether Landlock already prevents opening files for writing.
enum class FilesAre { open, restricted };

/// seccomp: gives up the calls that `calls` does not allow. The process must have no_new_privs set.
base::Result<void> restrictCalls(Calls calls, Network network, FilesAre files);

}  // namespace pinwell::sandbox
