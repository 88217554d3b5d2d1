#include "service_store.h"

#include <sys/stat.h>

#include <functional>
#include <mutex>

#include "crypto/crypto.h"
#include "event.h"
#include "failure.h"
#include "postgres_pool.h"
#include "postgres_store.h"
#include "sqlite_store.h"
#include "values/format.h"

#if PINWELL_LUMORA_POSTGRESQL
#endif

#if PINWELL_LUMORA_POSTGRESQL
#endif

namespace pinwell::lumora {
namespace {

using base::asBytes;
using base::Data;
using values::format;

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

namespace {

/// A digest of items in their order: each digest covers the previous one.
class RunningDigest {
  public:
    void add(const std::string& item) {
        const std::string text = base::toString(digest_) + item;
        digest_ = crypto::sha256(asBytes(text));
    }
    const Data& value() const noexcept { return digest_; }

  private:
    Data digest_ = Data(32, std::byte{0});
};

void appendField(std::string& text, std::string_view field) {
    text += std::to_string(field.size());
    text += ':';
    text += field;
}

std::string fieldsOf(Environment environment, const SignedRecord& entry) {
    const Record& record = entry.record;
    std::string text(toString(environment));
    appendField(text, record.name);
    appendField(text, record.label);
    text += record.revoked ? "revoked" : "valid";
    text += record.asAsset ? "asset" : "inline";
    appendField(text, std::to_string(record.signedAt.seconds));
    for (const CodeHash& hash : record.hashes) {
        appendField(text, std::to_string(hash.algorithm));
        appendField(text, base::toString(hash.hash));
    }
    text += 't';
    appendField(text, base::toString(crypto::sha256(entry.ticket)));
    return text;
}

}  // namespace

ContentsSummary summarize(RecordStore& store) {
    ContentsSummary summary;
    RunningDigest digest;
    store.walkContents({.event =
                            [&](const Event& event) {
                                ++summary.events;
                                digest.add(event.hash);
                            },
                        .record =
                            [&](Environment environment, const SignedRecord& entry) {
                                ++summary.records;
                                digest.add(fieldsOf(environment, entry));
                            }});
    summary.digest = digest.value();
    return summary;
}

#if PINWELL_LUMORA_POSTGRESQL

Migration migrate(const ServiceDirectory& directory, const std::string& url) {
    requireChangesAllowed(directory);
    PostgresPlace place{.url = url, .named = "--to"};
    requireStoreUrl(place.url, place.named);
    postgresNeeds(place.url, place.named);
    if (directory.storeUrl() == url) {
        throw Failure(EX_USAGE, format("%@ names this database already", directory.descriptionPath()));
    }
    const std::unique_ptr<RecordStore> source = openStore(directory);
    Migration migration;
    source->holdStill([&](const std::function<void()>& confirm) {
        const HistorySummary history = verifyHistory(*source, std::nullopt);
        const ContentsSummary wanted = summarize(*source);
        try {
            PostgresStore::create(place,
                                  [&](const ContentsVisitor& visitor) { source->walkContents(visitor); });
        } catch (const Failure& failure) {
            if (failure.exitStatus() != EX_CANTCREAT) throw;
            PostgresStore filled(place);
            if (summarize(filled) != wanted) throw;
        }
        PostgresStore destination(place);
        if (summarize(destination) != wanted) {
            throw Failure(EX_SOFTWARE, "the copy differs from the original; the service keeps its old store");
        }
        verifyHistory(destination, history.head);
        confirm();
        migration = {wanted.records, wanted.events, history.head, directory.moveStore(url)};
    });
    return migration;
}

#else

Migration migrate(const ServiceDirectory&, const std::string&) {
    throw Failure(EX_CONFIG, "--to: this program was built without PostgreSQL");
}

#endif

}  // namespace pinwell::lumora
