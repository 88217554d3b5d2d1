#include "lumora-local/postgres_search.h"

#include "lumora-local/postgres_rows.h"
#include "lumora-local/store_rules.h"

namespace pinwell::lumora {
namespace {

static_assert(kSearchedLabelBytes == 64);  // as the index record_by_label has it

std::vector<FoundRecord> foundIn(const PostgresRows& rows) {
    std::vector<FoundRecord> found;
    for (std::size_t row = 0; row < rows.size(); ++row) found.push_back(cutHashes(readRecord(rows, row)));
    return found;
}

std::int64_t oneMore(std::size_t limit) {
    return static_cast<std::int64_t>(limit) + 1;
}

PostgresRows rowsByName(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    static const std::string sql =
        std::string("SELECT ") + kPostgresFoundRecordColumns +
        " FROM record r WHERE r.environment = $1 AND r.name >= $2 AND r.name < $3 ORDER BY r.name LIMIT $4";
    const SearchRange range = rangeOf(search);
    return connection.query(
        sql.c_str(), {nameOf(search.environment), range.firstName, range.endName, oneMore(search.limit)},
        deadline);
}

PostgresRows rowsByHash(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    static const std::string sql =
        std::string("SELECT ") + kPostgresFoundRecordColumns +
        " FROM (SELECT DISTINCT name FROM hash WHERE environment = $1 AND hash = $2 AND name >= $3"
        " ORDER BY name LIMIT $4) f JOIN record r ON r.environment = $1 AND r.name = f.name ORDER BY r.name";
    return connection.query(sql.c_str(),
                            {nameOf(search.environment), PostgresParameter::bytes(*search.hash),
                             rangeOf(search).firstName, oneMore(search.limit)},
                            deadline);
}

PostgresRows rowsByLabel(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    static const std::string sql =
        std::string("SELECT ") + kPostgresFoundRecordColumns +
        " FROM record r WHERE r.environment = $1 AND substring(r.label from 1 for 64) < $2"
        " AND (substring(r.label from 1 for 64), r.name) > ($3, $4)"
        " ORDER BY substring(r.label from 1 for 64), r.name LIMIT $5";
    const SearchRange range = rangeOf(search);
    return connection.query(
        sql.c_str(),
        {nameOf(search.environment), PostgresParameter::bytes(range.endLabel),
         PostgresParameter::bytes(range.firstLabel), range.firstName, oneMore(search.limit)},
        deadline);
}

}  // namespace

RecordPage searchRecords(PostgresConnection& connection, const RecordSearch& search, Deadline deadline) {
    const PostgresRows rows = search.hash    ? rowsByHash(connection, search, deadline)
                              : search.label ? rowsByLabel(connection, search, deadline)
                                             : rowsByName(connection, search, deadline);
    return makePage(foundIn(rows), search.limit, search.label.has_value());
}

EventPage searchEvents(PostgresConnection& connection, const EventSearch& search, Deadline deadline) {
    static const std::string select =
        std::string("SELECT ") + kPostgresEventColumns + ", position FROM event WHERE ";
    static const std::string ofRecord =
        select + "environment = $1 AND record = $2 AND position > $3 ORDER BY position LIMIT $4";
    static const std::string ofTime = select + "(time, position) > ($1, $2) ORDER BY time, position LIMIT $3";
    static const std::string ofAll = select + "position > $1 ORDER BY position LIMIT $2";
    EventPageMaker maker(search);
    const auto limit = static_cast<std::int64_t>(maker.rows());
    const std::int64_t position = search.after ? search.after->position : 0;
    const auto query = [&]() {
        if (search.record) {
            return connection.query(ofRecord.c_str(),
                                    {nameOf(search.environment), *search.record, position, limit}, deadline);
        }
        if (search.since) {
            const std::int64_t time = search.after ? search.after->time : search.since->seconds;
            return connection.query(ofTime.c_str(), {time, position, limit}, deadline);
        }
        return connection.query(ofAll.c_str(), {position, limit}, deadline);
    };
    const PostgresRows rows = query();
    for (std::size_t row = 0; row < rows.size(); ++row) {
        if (!maker.take(readEvent(rows, row), rows.integer(row, 11))) break;
    }
    return maker.finish();
}

}  // namespace pinwell::lumora
