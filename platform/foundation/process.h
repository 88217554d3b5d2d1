// The running process and what its environment says.
#pragma once

#include <optional>
#include <string>

#include "foundation/url.h"

namespace pinwell::foundation {

/// The last component of the name the process was started under.
std::string processName();

/// Lets closed standard streams lead to /dev/null. What is opened next takes the lowest free number: a
/// connection or a file would stand in a closed stream's place and get the messages. To be called before
/// anything is opened.
void occupyStandardStreams();

/// A fresh UUID-like string (RFC 9562, version 4), upper case, from the kernel's random source.
std::string globallyUniqueString();

/// $TMPDIR when it is set and absolute, else /tmp.
URL temporaryDirectory();

/// The variable's value, unless the process runs with more rights than its caller (set-user-ID), in which
/// case nothing the caller set is listened to. Nothing when it is unset.
std::optional<std::string> secureEnvironment(const char* name);

/// Whether `identifier` can be one file name here: not empty, at most 200 bytes, not "." or "..", without a
/// slash or a control character. Text from a server must pass before it becomes part of a path.
bool isSafeFileName(std::string_view identifier);

}  // namespace pinwell::foundation
