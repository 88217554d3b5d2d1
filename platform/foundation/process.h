// The running process and its environment.
#pragma once

#include <optional>
#include <string>

#include "foundation/url.h"

namespace pinwell::foundation {

/// The last component of the name that the process was started with.
std::string processName();

/// Opens closed standard streams on /dev/null. Otherwise the next opened connection or file
/// would take the number of a closed stream, and get the messages. Call it before anything is
/// opened.
void occupyStandardStreams();

/// A fresh UUID-like string (RFC 9562, version 4), upper case, from the kernel's random source.
std::string globallyUniqueString();

/// $TMPDIR if it is set and absolute, otherwise /tmp.
URL temporaryDirectory();

/// The variable's value. Returns `nullopt` if it is unset, or if the process has more rights than its caller
/// (set-user-ID), whose environment is then not trusted.
std::optional<std::string> secureEnvironment(const char* name);

/// Whether `identifier` can be one file name here: not empty, at most 200 bytes, not "." or "..", without a
/// slash or a control character. Text from a server must pass before it becomes part of a path.
bool isSafeFileName(std::string_view identifier);

}  // namespace pinwell::foundation
