#include "lumora-local/store_opening.h"

#include <sys/stat.h>

#include <functional>
#include <mutex>

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/sqlite_store.h"
#if PINWELL_LUMORA_POSTGRESQL
#include "lumora-local/postgres_pool.h"
#include "lumora-local/postgres_store.h"
#endif

namespace pinwell::lumora {
namespace {

using foundation::format;

/// Whether service.json still names the opened store. The file is read again only after a change.
class StoreWatch {
  public:
    explicit StoreWatch(const ServiceDirectory& directory)
        : opened_(directory), seen_(signatureNow()), records_(recordsNow()) {}

    void check(StoreUse use) {
        if (use == StoreUse::changing) requireChangesAllowed(opened_);
        const std::lock_guard lock(mutex_);
        // An open file outlives its name; a file that replaces it has other records.
        if (!(recordsNow() == records_)) {
            throw Failure(EX_TEMPFAIL, format("%@ is not the file that was opened; start again to use it",
                                              opened_.storePath()));
        }
        const Signature now = signatureNow();
        // A writer needs certainty: two changes within a clock tick look alike.
        if (use == StoreUse::changing || !(now == seen_)) moved_ = hasMoved(use);
        seen_ = now;
        if (moved_) {
            throw Failure(EX_TEMPFAIL,
                          format("%@ names another store than the one in use; start again to use that one",
                                 opened_.descriptionPath()));
        }
    }

  private:
    struct Signature {
        dev_t device = 0;
        ino_t file = 0;
        std::int64_t seconds = 0;
        std::int64_t nanoseconds = 0;
        bool operator==(const Signature&) const = default;
    };

    Signature signatureNow() const {
        struct stat status {};
        if (::stat(opened_.descriptionPath().c_str(), &status) != 0) return {};
        return {status.st_dev, status.st_ino, status.st_mtim.tv_sec, status.st_mtim.tv_nsec};
    }

    /// Only the file with the records, not its contents; empty for a database.
    Signature recordsNow() const {
        struct stat status {};
        if (opened_.storeUrl() || ::stat(opened_.storePath().c_str(), &status) != 0) return {};
        return {status.st_dev, status.st_ino, 0, 0};
    }

    bool hasMoved(StoreUse use) const {
        try {
            return ServiceDirectory::open(opened_.path()).storeUrl() != opened_.storeUrl();
        } catch (const Failure&) {
            // Lookups continue while somebody edits the file.
            if (use == StoreUse::changing) throw;
            return moved_;
        }
    }

    const ServiceDirectory opened_;
    std::mutex mutex_;
    Signature seen_;
    const Signature records_;
    bool moved_ = false;
};

StoreGuard makeGuard(const ServiceDirectory& directory) {
    return [watch = std::make_shared<StoreWatch>(directory)](StoreUse use) { watch->check(use); };
}

}  // namespace

void requireChangesAllowed(const ServiceDirectory& directory) {
    if (directory.role() != Role::lookup) return;
    throw Failure(EX_CONFIG,
                  format("%@: \"role\" is lookup: this service serves lookups and changes no records",
                         directory.descriptionPath()));
}

#if PINWELL_LUMORA_POSTGRESQL

std::unique_ptr<RecordStore> openStore(const ServiceDirectory& directory) {
    if (!directory.storeUrl())
        return std::make_unique<SqliteStore>(directory.storePath(), makeGuard(directory));
    PostgresPlace place;
    place.url = *directory.storeUrl();
    place.named = directory.descriptionPath() + ": \"store\"";
    place.forLookups = directory.role() == Role::lookup;
    postgresNeeds(place.url, place.named);  // refuses a URL that cannot be read
    return std::make_unique<PostgresStore>(std::move(place), makeGuard(directory));
}

void addStoreRights(sandbox::Confinement& rights, const ServiceDirectory& directory) {
    sandbox::append(rights.files, sandbox::fileAndItsLinks(directory.descriptionPath()));
    if (!directory.storeUrl()) {
        sandbox::append(rights.files,
                        sandbox::fileAndItsLinks(directory.storePath(), sandbox::Access::write));
        return;
    }
    const PostgresNeeds needs = postgresNeeds(*directory.storeUrl(), directory.descriptionPath());
    for (const std::string& path : needs.files) rights.files.push_back({path, sandbox::Access::read});
    if (!needs.tcp) return;
    if (rights.network == sandbox::Network::none) rights.network = sandbox::Network::connect;
    sandbox::append(rights.files, sandbox::nameResolutionFiles());
}

#else

std::unique_ptr<RecordStore> openStore(const ServiceDirectory& directory) {
    if (!directory.storeUrl())
        return std::make_unique<SqliteStore>(directory.storePath(), makeGuard(directory));
    throw Failure(EX_CONFIG,
                  format("%@: \"store\" is a PostgreSQL database, and this program was built without "
                         "PostgreSQL",
                         directory.descriptionPath()));
}

void addStoreRights(sandbox::Confinement& rights, const ServiceDirectory& directory) {
    sandbox::append(rights.files, sandbox::fileAndItsLinks(directory.descriptionPath()));
    sandbox::append(rights.files, sandbox::fileAndItsLinks(directory.storePath(), sandbox::Access::write));
}

#endif

}  // namespace pinwell::lumora
