#include "lumora-local/migration.h"

#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/history.h"
#include "lumora-local/sha256.h"
#include "lumora-local/store_opening.h"
#if PINWELL_LUMORA_POSTGRESQL
#include "lumora-local/postgres_pool.h"
#include "lumora-local/postgres_store.h"
#endif

namespace pinwell::lumora {
namespace {

using foundation::asBytes;
using foundation::Data;
using foundation::format;

/// A digest of items in their order: each digest covers the previous one.
class RunningDigest {
  public:
    void add(const std::string& item) {
        const std::string text = foundation::toString(digest_) + item;
        digest_ = sha256(asBytes(text));
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
        appendField(text, foundation::toString(hash.hash));
    }
    text += 't';
    appendField(text, foundation::toString(sha256(entry.ticket)));
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
