// Bundles: directories whose layout names a main executable.
#pragma once

#include <optional>
#include <string>

#include "base/places.h"

namespace pinwell::values {

/// Path of the main executable of the directory at `path`, opened as a bundle; `nullopt` if it has none.
///
/// The property list is Contents/Info.plist, else Resources/Info.plist, else Info.plist. It names the
/// executable (CFBundleExecutable); otherwise the name is the directory's own without the extension. The
/// executable must be a regular file in a direct sub-directory of Contents (any of them), or in the root of a
/// bundle without Contents. If there are several files below Contents, files without any execute bit are
/// ignored if another has one; if two remain, the bundle has none. Neither the executable nor that
/// sub-directory may be a symbolic link. A directory with Versions/Current is a framework: property list in
/// that version's Resources, executable in that version's root. A name that contains a slash or is "." or
/// ".." is ignored.
///
/// A link that leads out of the bundle counts as missing. All paths start from the descriptor that `places`
/// holds for the directory; without one, the directory is held during the call.
std::optional<std::string> mainExecutableOfBundle(base::Places& places, const std::string& path);

/// The same with its own Places.
std::optional<std::string> mainExecutableOfBundle(const std::string& path);

}  // namespace pinwell::values
