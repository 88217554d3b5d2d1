#include "postgres_connection.h"

#include <libpq-fe.h>
#include <poll.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <limits>

#include "values/format.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr int kBinary = 1;

// A session's own bounds, in milliseconds; the client's deadlines are usually shorter. A commit must survive
// a crash of the server.
constexpr const char* kSessionSettings = R"(
    SET search_path = lumora, pg_temp;
    SET statement_timeout = 30000;
    SET lock_timeout = 20000;
    SET idle_in_transaction_session_timeout = 60000;
    SET bytea_output = hex;
    SELECT set_config('synchronous_commit', 'on', false) WHERE current_setting('synchronous_commit') = 'off';
)";

/// The first line of the library's text, which may have several.
std::string firstLine(std::string_view text) {
    return std::string(text.substr(0, text.find('\n')));
}

/// The server ended the session, or is not ready for one: class 08, its shutdown, its start. After a
/// switchover the old primary refuses to write (25006); another server may not.
bool meansLost(std::string_view state) {
    constexpr std::array<std::string_view, 5> kStates{"57P01", "57P02", "57P03", "57P05", "25006"};
    return state.starts_with("08") || std::find(kStates.begin(), kStates.end(), state) != kStates.end();
}

int exitStatusFor(const PostgresError& error) {
    const std::string& state = error.state();
    if (error.lost() || state.starts_with("53") || state.starts_with("40") || state == "55P03" ||
        state == "57014") {
        return EX_TEMPFAIL;  // lost, out of a resource, blocked by another transaction, too slow
    }
    if (state == "42501") return EX_NOPERM;
    if (state.starts_with("22") || state.starts_with("23")) return EX_DATAERR;
    if (state.starts_with("42") || state.starts_with("3F")) return EX_CONFIG;
    return EX_IOERR;
}

}  // namespace

Failure asFailure(const PostgresError& error) {
    return {exitStatusFor(error), values::format("record store: %@", std::string_view(error.what()))};
}

PostgresParameter PostgresParameter::bytes(ByteView bytes) {
    PostgresParameter parameter{std::nullopt};
    parameter.value_ = base::toString(bytes);
    parameter.binary_ = true;
    return parameter;
}

void PostgresRows::Clear::operator()(pg_result* result) const {
    PQclear(result);
}

PostgresRows::PostgresRows(pg_result* result) : result_(result) {}

std::size_t PostgresRows::size() const {
    return static_cast<std::size_t>(PQntuples(result_.get()));
}

bool PostgresRows::isNull(std::size_t row, int column) const {
    return PQgetisnull(result_.get(), static_cast<int>(row), column) != 0;
}

ByteView PostgresRows::bytes(std::size_t row, int column) const {
    const char* value = PQgetvalue(result_.get(), static_cast<int>(row), column);
    const int length = PQgetlength(result_.get(), static_cast<int>(row), column);
    return base::asBytes(std::string_view(value, static_cast<std::size_t>(length)));
}

std::string PostgresRows::text(std::size_t row, int column) const {
    return base::toString(bytes(row, column));
}

std::int64_t PostgresRows::integer(std::size_t row, int column) const {
    const ByteView field = bytes(row, column);
    if (field.size() != 2 && field.size() != 4 && field.size() != 8) {
        throw PostgresError("", true, "an integer of an unexpected size");
    }
    // Big-endian; the sign is in the first byte.
    std::uint64_t value = (field[0] & std::byte{0x80}) != std::byte{0} ? ~std::uint64_t{0} : 0;
    for (const std::byte byte : field) value = (value << 8) | static_cast<std::uint64_t>(byte);
    return static_cast<std::int64_t>(value);
}

bool PostgresRows::boolean(std::size_t row, int column) const {
    const ByteView field = bytes(row, column);
    return field.size() == 1 && field[0] != std::byte{0};
}

void PostgresConnection::Finish::operator()(pg_conn* connection) const {
    PQfinish(connection);
}

PostgresConnection::PostgresConnection(const std::string& url, Deadline deadline, const std::string& user) {
    connect(url, user, deadline);
    PQsetNoticeProcessor(
        connection_.get(), [](void*, const char*) {}, nullptr);
    if (PQsetnonblocking(connection_.get(), 1) != 0) lose("the connection cannot be used without blocking");
    execute(kSessionSettings, deadline);
}

PostgresConnection::~PostgresConnection() = default;

void PostgresConnection::connect(const std::string& url, const std::string& user, Deadline deadline) {
    // The URL can override the keywords before "dbname", but not the ones after it. A keyword without a value
    // counts as absent.
    constexpr std::array<const char*, 10> kKeywords{"fallback_application_name",
                                                    "user",
                                                    "gssencmode",
                                                    "tcp_user_timeout",
                                                    "keepalives_idle",
                                                    "keepalives_interval",
                                                    "keepalives_count",
                                                    "dbname",
                                                    "client_encoding",
                                                    nullptr};
    const std::array<const char*, 10> values{"lumora-local",
                                             user.empty() ? nullptr : user.c_str(),
                                             "disable",
                                             "4000",
                                             "10",
                                             "5",
                                             "3",
                                             url.c_str(),
                                             "UTF8",
                                             nullptr};
    connection_.reset(PQconnectStartParams(kKeywords.data(), values.data(), 1));
    if (connection_ == nullptr) lose("out of memory");
    PostgresPollingStatusType next = PGRES_POLLING_WRITING;
    while (PQstatus(connection_.get()) != CONNECTION_BAD && next != PGRES_POLLING_OK) {
        if (next == PGRES_POLLING_FAILED) break;
        waitFor(next == PGRES_POLLING_READING ? POLLIN : POLLOUT, deadline);
        next = PQconnectPoll(connection_.get());
    }
    if (PQstatus(connection_.get()) != CONNECTION_OK) lose(firstLine(PQerrorMessage(connection_.get())));
}

void PostgresConnection::waitFor(short events, Deadline deadline) {
    for (;;) {
        const auto left = std::chrono::duration_cast<milliseconds>(deadline - Clock::now());
        if (left.count() <= 0) lose("the server does not answer in time");
        pollfd state{PQsocket(connection_.get()), events, 0};
        const int bounded = static_cast<int>(std::min<std::int64_t>(left.count(), 60'000));
        const int count = ::poll(&state, 1, bounded);
        if (count > 0) return;
        if (count < 0 && errno != EINTR) lose("cannot wait for the server");
    }
}

void PostgresConnection::flush(Deadline deadline) {
    for (;;) {
        const int left = PQflush(connection_.get());
        if (left == 0) return;
        if (left < 0) lose(firstLine(PQerrorMessage(connection_.get())));
        // The server may have to send before it reads on.
        waitFor(POLLIN | POLLOUT, deadline);
        if (PQconsumeInput(connection_.get()) == 0) lose(firstLine(PQerrorMessage(connection_.get())));
    }
}

pg_result* PostgresConnection::nextResult(Deadline deadline) {
    while (PQisBusy(connection_.get()) != 0) {
        waitFor(POLLIN, deadline);
        if (PQconsumeInput(connection_.get()) == 0) lose(firstLine(PQerrorMessage(connection_.get())));
    }
    return PQgetResult(connection_.get());
}

PostgresRows PostgresConnection::lastResult(Deadline deadline) {
    PostgresRows last(nullptr);
    std::unique_ptr<pg_result, decltype(&PQclear)> failure(nullptr, &PQclear);
    while (pg_result* result = nextResult(deadline)) {
        const ExecStatusType status = PQresultStatus(result);
        if (status == PGRES_COMMAND_OK || status == PGRES_TUPLES_OK) {
            last = PostgresRows(result);
        } else if (failure == nullptr) {
            failure.reset(result);
        } else {
            PQclear(result);
        }
        if (PQstatus(connection_.get()) != CONNECTION_OK) break;
    }
    if (failure != nullptr) fail(failure.get());
    return last;
}

void PostgresConnection::execute(const std::string& sql, Deadline deadline) {
    if (PQsendQuery(connection_.get(), sql.c_str()) == 0) lose(firstLine(PQerrorMessage(connection_.get())));
    flush(deadline);
    lastResult(deadline);
}

const std::string& PostgresConnection::prepared(const char* sql, Deadline deadline) {
    const auto known = statements_.find(std::string_view(sql));
    if (known != statements_.end()) return known->second;
    const std::string name = "s" + std::to_string(statements_.size());
    if (PQsendPrepare(connection_.get(), name.c_str(), sql, 0, nullptr) == 0) {
        lose(firstLine(PQerrorMessage(connection_.get())));
    }
    flush(deadline);
    lastResult(deadline);
    return statements_.emplace(sql, name).first->second;
}

void PostgresConnection::send(const char* sql, const std::vector<PostgresParameter>& parameters,
                              Deadline deadline) {
    const std::string& name = prepared(sql, deadline);
    std::vector<const char*> values;
    std::vector<int> lengths;
    std::vector<int> formats;
    for (const PostgresParameter& parameter : parameters) {
        const bool given = parameter.value().has_value();
        if (given && parameter.value()->size() > static_cast<std::size_t>(std::numeric_limits<int>::max())) {
            throw PostgresError("22000", false, "a value too large for the database");
        }
        values.push_back(given ? parameter.value()->c_str() : nullptr);
        lengths.push_back(given ? static_cast<int>(parameter.value()->size()) : 0);
        formats.push_back(parameter.isBinary() ? kBinary : 0);
    }
    if (PQsendQueryPrepared(connection_.get(), name.c_str(), static_cast<int>(values.size()), values.data(),
                            lengths.data(), formats.data(), kBinary) == 0) {
        lose(firstLine(PQerrorMessage(connection_.get())));
    }
}

PostgresRows PostgresConnection::query(const char* sql, const std::vector<PostgresParameter>& parameters,
                                       Deadline deadline) {
    send(sql, parameters, deadline);
    flush(deadline);
    return lastResult(deadline);
}

void PostgresConnection::forEachRow(const char* sql, const std::vector<PostgresParameter>& parameters,
                                    milliseconds silence,
                                    const std::function<void(const PostgresRows&)>& visit) {
    send(sql, parameters, Clock::now() + silence);
    PQsetSingleRowMode(connection_.get());
    flush(Clock::now() + silence);
    usable_ = false;  // until the last row
    while (pg_result* result = nextResult(Clock::now() + silence)) {
        const PostgresRows row(result);
        const ExecStatusType status = PQresultStatus(result);
        if (status == PGRES_SINGLE_TUPLE) {
            visit(row);
        } else if (status != PGRES_TUPLES_OK) {
            fail(result);
        }
    }
    usable_ = true;
}

std::string PostgresConnection::setting(const char* name) const {
    const char* value = PQparameterStatus(connection_.get(), name);
    return value != nullptr ? value : "";
}

void PostgresConnection::fail(const pg_result* result) {
    const auto field = [&](int code) -> std::string {
        const char* text = PQresultErrorField(result, code);
        return text != nullptr ? text : "";
    };
    const std::string state = field(PG_DIAG_SQLSTATE);
    std::string text = field(PG_DIAG_MESSAGE_PRIMARY);
    if (text.empty()) text = firstLine(PQresultErrorMessage(result));
    const bool lost = state.empty() || meansLost(state) || PQstatus(connection_.get()) != CONNECTION_OK;
    if (lost) usable_ = false;
    throw PostgresError(state, lost, text);
}

void PostgresConnection::lose(const std::string& text) {
    usable_ = false;
    throw PostgresError("", true, text);
}

}  // namespace pinwell::lumora
