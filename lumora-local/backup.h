// The whole of a service in one file, made while it runs.
//
// The file is a SQLite database: the records and their log as of one moment, and beside them a table `sqlar`
// (SQLite's own form of an archive) with service.json, keys, certificates and the platform directory. What is
// elsewhere is not in it: a root's key that was put elsewhere, a token, a passphrase.
#pragma once

#include <string>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// Makes `file`, readable by its owner alone and flushed, or nothing. Throws Failure: EX_CANTCREAT if it
/// exists, EX_CONFIG if the records are in a database that is backed up by its own means.
void backUp(const ServiceDirectory& directory, const std::string& file);

/// Makes a service at `path`, which must not exist or be an empty directory, from a backup; or nothing. The
/// log of the records is verified first. Throws Failure (EX_DATAERR) if `file` is no backup, or is damaged.
void restore(const std::string& file, const std::string& path);

}  // namespace pinwell::lumora
