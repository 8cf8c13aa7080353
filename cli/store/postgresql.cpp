// The module libtavo_postgresql.so, which needs PostgreSQL's client library.
#include <libpq-fe.h>

#include <algorithm>
#include <cctype>
#include <cstdint>
#include <memory>
#include <string_view>

#include "cli/store/database.h"

namespace {

using database = std::shared_ptr<PGconn>;

// Returns the server's text on one line.
std::string message_of(const database &db) {
    std::string text = PQerrorMessage(db.get());
    while (!text.empty() && text.back() == '\n') text.pop_back();
    std::replace(text.begin(), text.end(), '\n', ' ');
    return text;
}

// Returns the text with *** in place of each occurrence of the word, but not of a part of a longer
// word.
std::string without(std::string text, const std::string &word) {
    if (word.empty()) return text;
    const auto is_letter = [&](size_t i) { return isalnum(static_cast<uint8_t>(text[i])) != 0; };
    for (size_t at = text.find(word); at != std::string::npos; at = text.find(word, at)) {
        const size_t end = at + word.size();
        const bool is_whole = (at == 0 || !is_letter(at - 1)) && !is_letter(end);
        if (is_whole) text.replace(at, word.size(), "***");
        at += is_whole ? 3 : 1;
    }
    return text;
}

// True unless the error is temporary: a lost connection, conflicting transactions, a lack of
// resources, a lock, or a server shutdown or failure. A missing code means a lost connection.
bool is_permanent(const char *sql_state) {
    if (sql_state == nullptr) return false;
    constexpr std::string_view kTemporary = "08 40 53 55 57 58";  // classes of codes
    return kTemporary.find(std::string_view(sql_state, 2)) == std::string_view::npos;
}

failure run(const database &db, const std::string &sql, const row &values,
            const row_reader &on_row) {
    std::vector<const char *> data;
    std::vector<int> sizes;
    std::vector<int> formats;
    for (const cell &value : values) {
        formats.push_back(data.empty() ? 1 : 0);  // a path is sent as bytes, other values as text
        data.push_back(value ? value->c_str() : nullptr);
        sizes.push_back(value ? static_cast<int>(value->size()) : 0);
    }
    // With values, the results have binary form: the bytes of a path or a text.
    const std::unique_ptr<PGresult, decltype(&PQclear)> result(
        values.empty() ? PQexec(db.get(), sql.c_str())
                       : PQexecParams(db.get(), sql.c_str(), static_cast<int>(data.size()), nullptr,
                                      data.data(), sizes.data(), formats.data(), 1),
        PQclear);
    const ExecStatusType status = PQresultStatus(result.get());
    if (status != PGRES_COMMAND_OK && status != PGRES_TUPLES_OK) {
        return {message_of(db), is_permanent(PQresultErrorField(result.get(), PG_DIAG_SQLSTATE))};
    }
    for (int line = 0; on_row && line < PQntuples(result.get()); ++line) {
        row found;
        for (int i = 0; i < PQnfields(result.get()); ++i) {
            const std::string value(PQgetvalue(result.get(), line, i),
                                    static_cast<size_t>(PQgetlength(result.get(), line, i)));
            found.push_back(PQgetisnull(result.get(), line, i) != 0 ? cell() : value);
        }
        on_row(found);
    }
    return {};
}

failure open_server(const std::string &url, bool /*read_only*/, connection &out) {
    const size_t last_at = url.rfind('@');
    const bool has_user = last_at != std::string::npos;
    const bool has_password = has_user || url.find("password") != std::string::npos;
    const bool is_ambiguous = has_user && url.find_first_of("/@", url.find("://") + 3) < last_at;
    const std::unique_ptr<PQconninfoOption, decltype(&PQconninfoFree)> options(
        PQconninfoParse(url.c_str(), nullptr), PQconninfoFree);
    // libpq's messages may quote parts of a password if it cannot parse the URL, or if it finds the
    // end of the password before the last @.
    if (is_ambiguous || (has_password && options == nullptr)) {
        return {"the URL is not valid; a user name or password has %2F, %40 and %25 for / @ and %",
                true};
    }
    const database db(PQconnectdb(url.c_str()), PQfinish);
    if (PQstatus(db.get()) != CONNECTION_OK) {
        const char *user = has_user ? PQuser(db.get()) : nullptr;
        return {without(message_of(db), user == nullptr ? "" : user)};
    }
    PQsetNoticeProcessor(
        db.get(), [](void *, const char *) {}, nullptr);
    out = [db](const auto &...arguments) { return run(db, arguments...); };
    return {};
}

}  // namespace

// The command finds this record by its name.
extern "C" const database_kind tavo_postgresql_database = {
    // Reading pg_class makes the server notice a table that another command has just created.
    "SELECT coalesce((SELECT substring(obj_description(oid, 'pg_class') FROM 'version ([0-9]+)') "
    "FROM pg_class WHERE oid = to_regclass('songs')), '0')::int",
    "COMMENT ON TABLE songs IS 'tavo, version %d'",
    "BEGIN; SELECT pg_advisory_xact_lock(hashtext('tavo songs'))", open_server};
