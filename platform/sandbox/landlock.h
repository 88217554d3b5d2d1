// Landlock: rights to files and TCP, given up for good. For this folder only.
#pragma once

#include <optional>
#include <string>

#include "sandbox/sandbox.h"

namespace pinwell::sandbox {

/// Version of the kernel's Landlock; 0 without. Sets errno then.
int landlockVersion();

/// Gives up all rights to files that `files` does not name, and to TCP as `network` says, as far as the
/// kernel's version goes. Returns why nothing was given up; `nullopt` if it was. The process must have
/// no_new_privs set.
std::optional<std::string> restrictFiles(const FileRules& files, Network network);

}  // namespace pinwell::sandbox
