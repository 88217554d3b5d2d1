// The rights that a program keeps while it reads artefacts, and the end that it takes when it runs away.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "foundation/platform_directory.h"
#include "foundation/url.h"
#include "sandbox/sandbox.h"

namespace pinwell {

/// What the tool needs for that operation on that artefact: to validate, it reads a bundle, or the directory
/// that a file is in; to staple, it writes there. It writes to the temporary directory, and reads the
/// platform directory, the user's defaults, the libraries and what name resolution and file types need.
sandbox::Confinement confinementOfRun(std::uint8_t operation, const foundation::URL& artefact,
                                      const foundation::PlatformDirectory& platform);

/// The same for several artefacts that are known beforehand.
sandbox::Confinement confinementOfRuns(std::uint8_t operation, const std::vector<std::string>& artefacts,
                                       const foundation::PlatformDirectory& platform);

/// What reading these artefacts needs, of a program without a network: nothing beside them.
sandbox::Confinement confinementOfReading(const std::vector<std::string>& artefacts,
                                          const foundation::PlatformDirectory& platform);

/// Has the process look for the platform security library, whose own files nobody knows, and keeps it.
/// For a program that judges tickets, before it gives up its rights.
void keepSecurityLibrary();

/// Processor time, in seconds, that a run may take over that artefact.
std::uint64_t processorSecondsForArtefact(const foundation::URL& artefact);

/// Limits processor time and stack of a run of the tool. Beyond them it says so to the user and ends with the
/// failure that it has recorded last (PWHashedFile).
void limitRun(const foundation::URL& artefact);

}  // namespace pinwell
