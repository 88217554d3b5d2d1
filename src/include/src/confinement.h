// The rights that a program keeps while it reads artefacts, and its end if it exceeds its limits.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "config/platform_directory.h"
#include "sandbox/sandbox.h"
#include "values/url.h"

namespace pinwell {

/// The rights of the tool for that operation on that artefact. To validate, it reads a bundle, or the
/// directory of a file; to staple, it writes there. It writes to the temporary directory, and reads the
/// platform directory, the user's defaults, the libraries and the files for name resolution and file types.
sandbox::Confinement confinementOfRun(std::uint8_t operation, const values::URL& artefact,
                                      const config::PlatformDirectory& platform);

/// The same for several artefacts, known beforehand.
sandbox::Confinement confinementOfRuns(std::uint8_t operation, const std::vector<std::string>& artefacts,
                                       const config::PlatformDirectory& platform);

/// The rights of a program without a network to read these artefacts and nothing beside them.
sandbox::Confinement confinementOfReading(const std::vector<std::string>& artefacts,
                                          const config::PlatformDirectory& platform);

/// Loads the platform security library if it exists, and keeps it: its own files are unknown. For a program
/// that judges tickets, before it gives up its rights.
void keepSecurityLibrary();

/// The limit of processor time, in seconds, for a run over that artefact.
std::uint64_t processorSecondsForArtefact(const values::URL& artefact);

/// Limits processor time and stack of a run of the tool. A run beyond the limits tells the user and ends with
/// the failure recorded last (PWHashedFile).
void limitRun(const values::URL& artefact);

}  // namespace pinwell
