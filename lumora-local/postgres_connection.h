// One connection to a PostgreSQL server, with a bound on every wait.
//
// libpq's blocking calls wait for a server for as long as it likes. This class uses the calls that do not
// block, and waits for the socket until a deadline.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "failure.h"

struct pg_conn;
struct pg_result;

namespace pinwell::lumora {

using Deadline = std::chrono::steady_clock::time_point;

/// A failure that the server or the library reports. The text is one line; not yet escaped for a terminal.
class PostgresError : public std::runtime_error {
  public:
    PostgresError(std::string state, bool lost, const std::string& text)
        : std::runtime_error(text), state_(std::move(state)), lost_(lost) {}

    /// SQLSTATE, five characters; empty if the failure is not the server's.
    const std::string& state() const noexcept { return state_; }

    /// True if the connection is no longer usable. Another connection may succeed.
    bool lost() const noexcept { return lost_; }

  private:
    std::string state_;
    bool lost_;
};

/// The failure of a command that meets `error`; its exit status follows from SQLSTATE.
Failure asFailure(const PostgresError& error);

/// A parameter of a statement: text, bytes (the type `bytea`), or NULL.
class PostgresParameter {
  public:
    PostgresParameter(std::nullopt_t) {}
    PostgresParameter(std::string text) : value_(std::move(text)) {}
    PostgresParameter(const char* text) : value_(text) {}
    PostgresParameter(std::int64_t number) : value_(std::to_string(number)) {}
    PostgresParameter(bool value) : value_(value ? "t" : "f") {}
    PostgresParameter(const std::optional<std::string>& text) : value_(text) {}
    static PostgresParameter bytes(base::ByteView bytes);
    static PostgresParameter bytes(std::string_view bytes) {
        return PostgresParameter::bytes(base::asBytes(bytes));
    }

    const std::optional<std::string>& value() const noexcept { return value_; }
    bool isBinary() const noexcept { return binary_; }

  private:
    std::optional<std::string> value_;
    bool binary_ = false;
};

/// The rows of a result, in PostgreSQL's binary format.
class PostgresRows {
  public:
    explicit PostgresRows(pg_result* result);

    std::size_t size() const;
    bool isNull(std::size_t row, int column) const;
    base::ByteView bytes(std::size_t row, int column) const;
    std::string text(std::size_t row, int column) const;
    std::int64_t integer(std::size_t row, int column) const;  // smallint, integer and bigint
    bool boolean(std::size_t row, int column) const;

  private:
    struct Clear {
        void operator()(pg_result* result) const;
    };
    std::unique_ptr<pg_result, Clear> result_;
};

/// Is used by one thread at a time. Each call throws PostgresError.
class PostgresConnection {
  public:
    /// Connects to the database of the URL (or of the text of keywords). Each session has UTF-8 as its
    /// encoding, the schema `lumora` as its search path, commits that return after the server's disk has
    /// them, and a bound on statements and locks. `user` is the user if neither the URL nor the environment
    /// names one; if empty, the library uses the caller's login name.
    PostgresConnection(const std::string& url, Deadline deadline, const std::string& user = {});
    ~PostgresConnection();
    PostgresConnection(const PostgresConnection&) = delete;
    PostgresConnection& operator=(const PostgresConnection&) = delete;

    /// Runs SQL without parameters; several statements are one transaction.
    void execute(const std::string& sql, Deadline deadline);

    /// Runs one statement. It is prepared when this connection first meets it.
    PostgresRows query(const char* sql, const std::vector<PostgresParameter>& parameters, Deadline deadline);

    /// Runs one statement and hands over its rows one at a time, each as row 0. `silence` bounds the wait for
    /// a row. If `visit` throws, the connection is lost.
    void forEachRow(const char* sql, const std::vector<PostgresParameter>& parameters,
                    std::chrono::milliseconds silence, const std::function<void(const PostgresRows&)>& visit);

    /// False after a failure that leaves the connection without use.
    bool usable() const noexcept { return usable_; }

    /// A setting that the server reports: "in_hot_standby", "server_encoding".
    std::string setting(const char* name) const;

  private:
    struct Finish {
        void operator()(pg_conn* connection) const;
    };

    void connect(const std::string& url, const std::string& user, Deadline deadline);
    void waitFor(short events, Deadline deadline);
    void flush(Deadline deadline);
    void send(const char* sql, const std::vector<PostgresParameter>& parameters, Deadline deadline);
    pg_result* nextResult(Deadline deadline);
    PostgresRows lastResult(Deadline deadline);
    const std::string& prepared(const char* sql, Deadline deadline);
    [[noreturn]] void fail(const pg_result* result);
    [[noreturn]] void lose(const std::string& text);

    std::unique_ptr<pg_conn, Finish> connection_;
    std::map<std::string, std::string, std::less<>> statements_;  // SQL to name
    bool usable_ = true;
};

}  // namespace pinwell::lumora
