// A whole service in one file, made during its run.
//
// The file is a SQLite database: the records and their log at one moment, and a table `sqlar` (SQLite's own
// form of an archive) with service.json, keys, certificates and the platform directory. It does not contain a
// root's key in another place, a token, or a passphrase.
#pragma once

#include <string>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// Makes `file`, flushed and readable only by its owner; on failure it makes no file. Throws Failure:
/// EX_CANTCREAT if it exists, EX_CONFIG if the records are in a database, which needs its own backup.
void backUp(const ServiceDirectory& directory, const std::string& file);

/// Makes a service at `path`, which must be missing or an empty directory, from a backup; on failure it makes
/// nothing. It verifies the log first. Throws Failure (EX_DATAERR) if `file` is no backup, or is damaged.
void restore(const std::string& file, const std::string& path);

}  // namespace pinwell::lumora
