// The records of a service, in one SQLite database.
//
// Several processes use a store at once: one serves from it while others issue and revoke. The database is in
// WAL mode, so readers never wait; a writer waits for another one for a few seconds before it fails
// (EX_TEMPFAIL).
#pragma once

#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"
#include "foundation/date.h"
#include "lumora-local/code_hash.h"

namespace SQLite {
class Database;
}

namespace pinwell::lumora {

/// The two sets of records that a service keeps apart.
enum class Environment { production, development };

std::string_view toString(Environment environment);
std::optional<Environment> parseEnvironment(std::string_view text);

/// A ticket as lookups deliver it: inline, or by reference to an asset.
struct Delivery {
    struct Asset {
        std::string identifier;  // one path component: lower-case hexadecimal
        std::uint64_t size = 0;
    };
    std::optional<foundation::Data> inlineTicket;
    std::optional<Asset> asset;
};

/// What answering a lookup needs. Calls may come from any thread, several at a time. They throw when the
/// records cannot be read.
class RecordSource {
  public:
    virtual ~RecordSource() = default;

    virtual std::optional<Delivery> findTicket(Environment environment, const std::string& recordName) = 0;

    /// The ticket behind an asset identifier. A record that is replaced takes its asset along, so that a
    /// revoked record's earlier ticket cannot be had any more.
    virtual std::optional<foundation::Data> findAsset(const std::string& identifier) = 0;

    virtual std::size_t countRecords() = 0;
};

/// One record with all that is known of it but the ticket.
struct Record {
    std::string name;
    std::string label;             // what was issued, for people: the artefact's file name
    std::vector<CodeHash> hashes;  // what the ticket lists, the artefact's own hash first
    bool revoked = false;
    bool asAsset = false;
    foundation::Date signedAt;
};

struct SignedRecord {
    Record record;
    foundation::Data ticket;
};

class RecordStore final : public RecordSource {
  public:
    /// Makes an empty store, readable by its owner alone, where nothing must stand yet. Throws Failure.
    static void create(const std::string& path);

    /// Opens an existing one. Throws Failure.
    explicit RecordStore(const std::string& path);
    ~RecordStore() override;

    std::optional<Delivery> findTicket(Environment environment, const std::string& recordName) override;
    std::optional<foundation::Data> findAsset(const std::string& identifier) override;
    std::size_t countRecords() override;

    /// Puts all of them into the store, each in the place of an earlier record of its name, or none
    /// (Failure).
    void put(Environment environment, const std::vector<SignedRecord>& records);

    std::optional<Record> find(Environment environment, const std::string& recordName);

    /// In the order of their names.
    std::vector<Record> list(Environment environment);

  private:
    std::mutex mutex_;  // a connection's statements are not to be mixed
    std::unique_ptr<SQLite::Database> database_;
};

}  // namespace pinwell::lumora
