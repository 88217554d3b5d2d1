// Bundles: directories laid out so that a main executable can be found in them.
#pragma once

#include <optional>
#include <string>

#include "foundation/places.h"

namespace pinwell::foundation {

/// Path of the main executable of the directory at `path`, opened as a bundle; nothing when it has none.
///
/// The property list is Contents/Info.plist, else Resources/Info.plist, else Info.plist; the executable is
/// the one it names (CFBundleExecutable), or else the directory's own name without the extension, and must be
/// a regular file in a direct sub-directory of Contents (found, not assumed), or, for a bundle without
/// Contents, in its root. Of several files below Contents, those without any execute bit do not count if
/// another has one; if two are left, the bundle has none. Neither the executable nor that sub-directory may
/// be a symbolic link. A directory with Versions/Current is a framework: property list in that version's
/// Resources, executable in that version's root. A name that holds a slash or is "." or ".." names nothing.
///
/// What is reached only through a link that leads out of the bundle is not there. All is found from the
/// descriptor that `places` holds of the directory; without one, it is held for the duration of the call.
std::optional<std::string> mainExecutableOfBundle(Places& places, const std::string& path);

/// The same with places of its own.
std::optional<std::string> mainExecutableOfBundle(const std::string& path);

}  // namespace pinwell::foundation
