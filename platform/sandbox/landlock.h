// Landlock: gives up rights to files and TCP permanently. For this folder only.
#pragma once

#include <optional>
#include <string>

#include "sandbox/sandbox.h"

namespace pinwell::sandbox {

/// Version of the kernel's Landlock. Returns 0, with errno set, without it.
int landlockVersion();

/// Gives up all rights to files that `files` does not name, and to TCP as `network` says, as far as the
/// kernel's version supports it. Returns `nullopt` on success, otherwise the reason. The process must have
/// no_new_privs set.
std::optional<std::string> restrictFiles(const FileRules& files, Network network);

}  // namespace pinwell::sandbox
