#include <SQLiteCpp/SQLiteCpp.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <system_error>
#include <vector>

#include "base/file_io.h"
#include "event.h"
#include "failure.h"
#include "file_writing.h"
#include "sqlite_store.h"
#include "sqlite_tables.h"
#include "upkeep.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

namespace fs = std::filesystem;
using base::Data;
using values::format;

constexpr std::size_t kMaximumBackedUpFile = std::size_t{1024} * 1024;
constexpr std::size_t kMaximumBackedUpFiles = 10'000;
constexpr int kDeepestFolder = 4;
constexpr int kWaitMilliseconds = 10'000;

template <class Work>
auto withDatabase(const std::string& file, Work&& work) {
    try {
        return std::forward<Work>(work)();
    } catch (const SQLite::Exception& error) {
        throw Failure(exitStatusOfSqlite(error.getErrorCode()), format("%@: %s", file, error.what()));
    }
}

/// Relative names of all files of a backup, without the records.
std::vector<std::string> filesOf(const std::string& root) {
    std::vector<std::string> names;
    for (const char* folder : {"service", "platform"}) {
        auto entry = fs::recursive_directory_iterator(root + "/" + folder);
        for (; entry != fs::recursive_directory_iterator(); ++entry) {
            const std::string name = entry->path().filename().string();
            const bool isStore = name.starts_with("records.sqlite") && entry.depth() == 0;
            if (name.starts_with('.') || isStore) {
                if (entry->is_directory()) entry.disable_recursion_pending();
                continue;
            }
            if (entry->is_regular_file()) names.push_back(fs::relative(entry->path(), root).string());
        }
    }
    std::sort(names.begin(), names.end());
    return names;
}

mode_t modeOf(const std::string& name) {
    return name.ends_with(".key") ? kPrivateFileMode : kPublicFileMode;
}

/// Whether a backup may make a file of this name: below service or platform, nothing hidden, no way out.
bool isNameInBackup(const fs::path& name) {
    int depth = 0;
    for (const fs::path& part : name) {
        const std::string text = part.string();
        if (text.empty() || text.starts_with('.') || text.find('/') != std::string::npos) return false;
        if (++depth == 1 && text != "service" && text != "platform") return false;
    }
    return depth >= 2 && depth <= kDeepestFolder && !name.filename().string().starts_with("records.sqlite") &&
           name.string().find('\0') == std::string::npos;
}

void archiveFiles(SQLite::Database& database, const std::string& root) {
    SQLite::Transaction transaction(database);
    database.exec("CREATE TABLE sqlar (name TEXT PRIMARY KEY, mode INT, mtime INT, sz INT, data BLOB)");
    SQLite::Statement row(database, "INSERT INTO sqlar VALUES (?, ?, ?, ?, ?)");
    const std::int64_t now = values::Date::now().seconds;
    // service.json is read first. The files that it names exist before it, and no command removes them.
    std::vector<std::string> names{"service/service.json"};
    const Data settings = [&] {
        auto bytes = base::readSmallFile(root + "/" + names.front(), kMaximumBackedUpFile);
        if (!bytes) throw Failure(EX_NOINPUT, bytes.error().localizedDescription());
        return *std::move(bytes);
    }();
    const auto add = [&](const std::string& name, const Data& bytes) {
        row.reset();
        row.bind(1, name);
        row.bind(2, static_cast<int>(S_IFREG | modeOf(name)));
        row.bind(3, now);
        row.bind(4, static_cast<std::int64_t>(bytes.size()));
        row.bind(5, static_cast<const void*>(bytes.data()), static_cast<int>(bytes.size()));
        row.exec();
    };
    add(names.front(), settings);
    const std::vector<std::string> all = filesOf(root);
    if (all.size() > kMaximumBackedUpFiles)
        throw Failure(EX_DATAERR, format("%@ holds more than %zu files", root, kMaximumBackedUpFiles));
    for (const std::string& name : all) {
        if (name == names.front()) continue;
        // restore() would refuse it.
        if (!isNameInBackup(name))
            throw Failure(EX_DATAERR,
                          format("%@/%@ has no place in a backup: it is in too many folders, or is "
                                 "named as the records are",
                                 root, name));
        const auto bytes = base::readSmallFile(root + "/" + name, kMaximumBackedUpFile);
        if (!bytes) throw Failure(EX_NOINPUT, bytes.error().localizedDescription());
        add(name, *bytes);
    }
    transaction.commit();
}

/// A file that is removed again unless it gets its final name.
class UnfinishedFile {
  public:
    explicit UnfinishedFile(const std::string& finalPath)
        : finalPath_(finalPath), path_(temporarySiblingOf(finalPath)) {
        writeNewFile(path_, {}, kPrivateFileMode);
    }
    ~UnfinishedFile() { ::unlink(path_.c_str()); }
    UnfinishedFile(const UnfinishedFile&) = delete;
    UnfinishedFile& operator=(const UnfinishedFile&) = delete;

    const std::string& path() const noexcept { return path_; }

    void publish() const {
        const base::FileDescriptor file(::open(path_.c_str(), O_RDONLY | O_CLOEXEC));
        if (!file || ::fsync(file.get()) != 0) fail(EX_IOERR, "flush");
        // Neither call replaces a file made by another process; some file systems have only one of them.
        if (::renameat2(AT_FDCWD, path_.c_str(), AT_FDCWD, finalPath_.c_str(), RENAME_NOREPLACE) != 0 &&
            (errno != EINVAL || ::link(path_.c_str(), finalPath_.c_str()) != 0)) {
            fail(EX_CANTCREAT, "create");
        }
        const fs::path folder = fs::path(finalPath_).parent_path();
        flushDirectory(folder.empty() ? "." : folder.string());
    }

  private:
    [[noreturn]] void fail(int status, const char* action) const {
        throw Failure(status,
                      format("cannot %s %@: %@", action, finalPath_, std::generic_category().message(errno)));
    }

    std::string finalPath_;
    std::string path_;
};

void extractFiles(SQLite::Database& database, const std::string& file, const std::string& root) {
    const auto refuse = [&](const std::string& what) {
        throw Failure(EX_DATAERR, format("%@: %@", file, what));
    };
    if (!database.tableExists("sqlar")) refuse("this is no backup of a record service");
    SQLite::Statement row(database, "SELECT name, sz, length(data), data FROM sqlar ORDER BY name");
    std::size_t count = 0;
    while (row.executeStep()) {
        const std::string name = row.getColumn(0).getString();
        const std::int64_t size = row.getColumn(1).getInt64();
        if (!isNameInBackup(name)) refuse(format("%@ is not a file of a service", name));
        if (++count > kMaximumBackedUpFiles) refuse("it holds too many files");
        if (size < 0 || size > std::int64_t{kMaximumBackedUpFile} || row.getColumn(2).getInt64() != size) {
            refuse(format("%@ is compressed or too large", name));
        }
        const fs::path path = fs::path(root) / name;
        fs::create_directories(path.parent_path());
        const auto* bytes = static_cast<const std::byte*>(row.getColumn(3).getBlob());
        writeNewFile(path.string(), {bytes, bytes == nullptr ? 0 : static_cast<std::size_t>(size)},
                     modeOf(name));
    }
}

/// Bytes of a regular file; its length is its reader's, not ours.
void copyBackup(const std::string& file, const std::string& target) {
    std::error_code error;
    const fs::file_status status = fs::status(file, error);
    if (!fs::exists(status)) throw Failure(EX_NOINPUT, format("cannot read %@: there is no such file", file));
    if (!fs::is_regular_file(status)) throw Failure(EX_NOINPUT, format("%@ is no regular file", file));
    fs::copy_file(file, target, error);
    if (error) throw Failure(EX_IOERR, format("cannot copy %@: %@", file, error.message()));
    fs::permissions(target, fs::perms::owner_read | fs::perms::owner_write);
}

}  // namespace

void backUp(const ServiceDirectory& directory, const std::string& file) {
    if (directory.storeUrl()) {
        throw Failure(EX_CONFIG, format("the records of %@ are in PostgreSQL: back that up by its own means "
                                        "(pg_dump), and copy the directory",
                                        directory.path()));
    }
    std::error_code ignored;
    if (fs::exists(fs::symlink_status(file, ignored))) {
        throw Failure(EX_CANTCREAT, format("%@ exists already and is left as it is", file));
    }
    static_cast<void>(SqliteStore(directory.storePath()));  // brings an early store forward
    const UnfinishedFile unfinished(file);
    withDatabase(file, [&] {
        {
            SQLite::Database records(directory.storePath(), SQLite::OPEN_READWRITE, kWaitMilliseconds);
            SQLite::Statement copy(records, "VACUUM INTO ?");
            copy.bind(1, unfinished.path());
            copy.exec();
        }
        SQLite::Database backup(unfinished.path(), SQLite::OPEN_READWRITE, kWaitMilliseconds);
        backup.exec("PRAGMA journal_mode = MEMORY");
        archiveFiles(backup, directory.path());
    });
    unfinished.publish();
}

void restore(const std::string& file, const std::string& path) {
    PendingDirectory pending(path, kPublicDirectoryMode);
    const std::string service = pending.path() + "/service";
    makeDirectory(service, kPrivateDirectoryMode);
    const std::string store = service + "/records.sqlite";
    copyBackup(file, store);
    withDatabase(file, [&] {
        SQLite::Database database(store, SQLite::OPEN_READWRITE, kWaitMilliseconds);
        configureSqlite(database);
        database.exec("PRAGMA trusted_schema = OFF");
        if (database.execAndGet("PRAGMA integrity_check").getString() != "ok") {
            throw Failure(EX_DATAERR, format("%@: the backup is damaged", file));
        }
        extractFiles(database, file, pending.path());
        database.exec("DROP TABLE sqlar");
        database.exec("PRAGMA journal_mode = WAL");
    });
    static_cast<void>(ServiceDirectory::open(pending.path()));
    {
        SqliteStore records(store);
        static_cast<void>(verifyHistory(records, std::nullopt));
    }
    flushDirectory(service);
    flushDirectory(pending.path());
    pending.publish();
}

}  // namespace pinwell::lumora
