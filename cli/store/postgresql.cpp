// The module libtavo_postgresql.so, which needs PostgreSQL's client library.
#include <libpq-fe.h>

#include <algorithm>
#include <memory>
#include <string_view>

#include "cli/store/database.h"

namespace {

constexpr Oid kBytesOid = 17;  // type BYTEA in every version of the server

using database = std::shared_ptr<PGconn>;

// Returns the server's text on one line.
std::string message_of(const database &db) {
    std::string text = PQerrorMessage(db.get());
    while (!text.empty() && text.back() == '\n') text.pop_back();
    std::replace(text.begin(), text.end(), '\n', ' ');
    return text;
}

// True unless the error is temporary: a lost connection, conflicting transactions, a lack of
// resources, a lock, or a server shutdown or failure. A missing code means a lost connection.
bool is_permanent(const char *sql_state) {
    if (sql_state == nullptr) return false;
    const std::string_view code_class(sql_state, 2);
    for (const char *temporary : {"08", "40", "53", "55", "57", "58"}) {
        if (code_class == temporary) return false;
    }
    return true;
}

cell column(const PGresult *result, int line, int index) {
    if (PQgetisnull(result, line, index) != 0) return std::nullopt;
    const char *text = PQgetvalue(result, line, index);
    if (PQftype(result, index) != kBytesOid) return text;
    size_t size = 0;
    const std::unique_ptr<unsigned char, decltype(&PQfreemem)> raw(
        PQunescapeBytea(reinterpret_cast<const unsigned char *>(text), &size), PQfreemem);
    if (raw == nullptr) return std::nullopt;
    return std::string(reinterpret_cast<const char *>(raw.get()), size);
}

failure run(const database &db, const std::string &sql, const row &values,
            const row_reader &on_row) {
    std::vector<const char *> data;
    std::vector<int> sizes;
    for (const cell &value : values) {
        data.push_back(value ? value->data() : nullptr);
        sizes.push_back(value ? static_cast<int>(value->size()) : 0);
    }
    // The path is sent as bytes. The other values are sent as text, and the server infers their
    // types.
    std::vector<int> formats(values.size());
    std::vector<Oid> types(values.size());
    if (!values.empty()) {
        formats[0] = 1;
        types[0] = kBytesOid;
    }
    const std::unique_ptr<PGresult, decltype(&PQclear)> result(
        values.empty() ? PQexec(db.get(), sql.c_str())
                       : PQexecParams(db.get(), sql.c_str(), static_cast<int>(values.size()),
                                      types.data(), data.data(), sizes.data(), formats.data(), 0),
        PQclear);
    const ExecStatusType status = PQresultStatus(result.get());
    if (status != PGRES_COMMAND_OK && status != PGRES_TUPLES_OK) {
        return {message_of(db), is_permanent(PQresultErrorField(result.get(), PG_DIAG_SQLSTATE))};
    }
    for (int line = 0; on_row && line < PQntuples(result.get()); ++line) {
        row found;
        for (int i = 0; i < PQnfields(result.get()); ++i) {
            found.push_back(column(result.get(), line, i));
        }
        on_row(found);
    }
    return {};
}

failure open_server(const std::string &location, bool /*read_only*/, connection &out) {
    const database db(PQconnectdb(location.c_str()), PQfinish);
    if (PQstatus(db.get()) != CONNECTION_OK) return {message_of(db)};
    PQsetNoticeProcessor(
        db.get(), [](void *, const char *) {}, nullptr);
    out = [db](const std::string &sql, const row &values, const row_reader &on_row) {
        return run(db, sql, values, on_row);
    };
    return {};
}

}  // namespace

// The command finds this record by its name. The length of a path is limited because an index entry
// may take at most a third of an 8-KiB page.
extern "C" const database_kind tavo_postgresql_database = {
    "BYTEA", "TIMESTAMPTZ", "JSON", "date_trunc('second', now())", 2600,
    // Reading pg_class makes the server notice a table that another command has just created.
    "SELECT coalesce((SELECT substring(obj_description(oid, 'pg_class') FROM 'version ([0-9]+)') "
    "FROM pg_class WHERE oid = to_regclass('songs')), '0')::int",
    "COMMENT ON TABLE songs IS 'tavo, version %d'",
    "BEGIN; SELECT pg_advisory_xact_lock(hashtext('tavo songs'))", open_server};
