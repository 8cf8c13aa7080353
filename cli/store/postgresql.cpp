#include <libpq-fe.h>

#include <cstdlib>
#include <memory>
#include <string_view>

#include "cli/store/database.h"

namespace {

constexpr Oid kBytesOid = 17;  // of the server's types, fixed for all versions
constexpr Oid kBigintOid = 20;
constexpr Oid kIntegerOid = 23;

// Returns the server's text on one line.
std::string sentence(const char *words) {
    std::string text = words;
    while (!text.empty() && text.back() == '\n') text.pop_back();
    for (char &c : text) c = c == '\n' ? ' ' : c;
    return text;
}

// True unless the error is temporary: an error of the connection, of concurrent transactions,
// resources or locks, or of a server that shuts down. Without a code the connection was lost.
bool is_permanent(const char *sql_state) {
    if (sql_state == nullptr) return false;
    const std::string_view code_class(sql_state, 2);
    for (const char *temporary : {"08", "40", "53", "55", "57", "58"}) {
        if (code_class == temporary) return false;
    }
    return true;
}

failure connect(const std::string &location, bool /*read_only*/, void **handle) {
    PGconn *connection = PQconnectdb(location.c_str());
    *handle = connection;
    if (PQstatus(connection) != CONNECTION_OK) return {sentence(PQerrorMessage(connection))};
    PQsetNoticeProcessor(
        connection, [](void *, const char *) {}, nullptr);
    return {};
}

cell column(const PGresult *result, int line, int index) {
    if (PQgetisnull(result, line, index) != 0) return std::monostate();
    const char *text = PQgetvalue(result, line, index);
    const Oid type = PQftype(result, index);
    if (type == kBigintOid || type == kIntegerOid) return int64_t{strtoll(text, nullptr, 10)};
    if (type != kBytesOid) return std::string(text);
    size_t size = 0;
    const std::unique_ptr<unsigned char, decltype(&PQfreemem)> raw(
        PQunescapeBytea(reinterpret_cast<const unsigned char *>(text), &size), PQfreemem);
    return raw == nullptr ? bytes{}
                          : bytes{std::string(reinterpret_cast<const char *>(raw.get()), size)};
}

failure run(void *handle, const std::string &sql, const row &values,
            const std::function<void(const row &)> &on_row) {
    auto *connection = static_cast<PGconn *>(handle);
    // Values in the protocol's format: numbers and text as text, bytes unchanged.
    std::vector<std::string> texts(values.size());
    std::vector<const char *> data(values.size());
    std::vector<int> sizes(values.size());
    std::vector<int> formats(values.size());
    std::vector<Oid> types(values.size());
    for (size_t i = 0; i < values.size(); ++i) {
        const auto *number = std::get_if<int64_t>(&values[i]);
        const auto *text = std::get_if<std::string>(&values[i]);
        const auto *blob = std::get_if<bytes>(&values[i]);
        if (number != nullptr) texts[i] = std::to_string(*number);
        if (text != nullptr) texts[i] = *text;
        if (blob != nullptr) texts[i] = blob->value;
        const bool is_null = std::holds_alternative<std::monostate>(values[i]);
        data[i] = is_null ? nullptr : texts[i].data();
        sizes[i] = static_cast<int>(texts[i].size());
        formats[i] = blob != nullptr ? 1 : 0;
        types[i] = blob != nullptr ? kBytesOid : 0;
    }
    const std::unique_ptr<PGresult, decltype(&PQclear)> result(
        values.empty() ? PQexec(connection, sql.c_str())
                       : PQexecParams(connection, sql.c_str(), static_cast<int>(values.size()),
                                      types.data(), data.data(), sizes.data(), formats.data(), 0),
        PQclear);
    const ExecStatusType status = PQresultStatus(result.get());
    if (status != PGRES_COMMAND_OK && status != PGRES_TUPLES_OK) {
        return {sentence(PQerrorMessage(connection)),
                is_permanent(PQresultErrorField(result.get(), PG_DIAG_SQLSTATE))};
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

void disconnect(void *handle) {
    PQfinish(static_cast<PGconn *>(handle));
}

// An index entry is limited to a third of a page of 8 KiB.
constexpr database_kind kPostgresql = {
    "BYTEA", "TIMESTAMPTZ", "date_trunc('second', now())", "JSON", 2600,
    // Reading pg_class makes the server notice a table that another command has just created.
    "SELECT coalesce((SELECT substring(obj_description(oid, 'pg_class') FROM 'version ([0-9]+)') "
    "FROM pg_class WHERE oid = to_regclass('songs')), '0')::int",
    "COMMENT ON TABLE songs IS 'tavo, version %d'",
    "BEGIN; SELECT pg_advisory_xact_lock(hashtext('tavo songs'))", connect, run, disconnect};

}  // namespace

// Looked up by name in this module.
extern "C" const database_kind *tavo_postgresql_database() {
    return &kPostgresql;
}
