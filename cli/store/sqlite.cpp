#include <sqlite3.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <memory>

#include "cli/store/database.h"
#include "cli/write/file_names.h"

namespace {

constexpr int kBusyMs = 2000;  // maximum wait while another process writes to the file

using database = std::shared_ptr<sqlite3>;

failure failure_of(const database &db, int code) {
    constexpr int kTemporary[] = {SQLITE_BUSY, SQLITE_LOCKED, SQLITE_CANTOPEN, SQLITE_IOERR,
                                  SQLITE_FULL, SQLITE_NOMEM,  SQLITE_PROTOCOL, SQLITE_INTERRUPT};
    const auto *end = std::end(kTemporary);
    const bool is_permanent = std::find(std::begin(kTemporary), end, code & 0xFF) == end;
    return {sqlite3_errmsg(db.get()), is_permanent};
}

// Opens a database. Returns SQLite's code.
int connect(const std::string &name, int flags, database &db) {
    sqlite3 *opened = nullptr;
    const int code = sqlite3_open_v2(name.c_str(), &opened, flags, nullptr);
    db.reset(opened, sqlite3_close);
    if (code != SQLITE_OK) return code;
    sqlite3_busy_timeout(opened, kBusyMs);
    if ((flags & SQLITE_OPEN_READONLY) != 0) {
        return sqlite3_exec(opened, "SELECT count(*) FROM sqlite_master", nullptr, nullptr,
                            nullptr);
    }
    // With a write-ahead log, other processes can read during a write, and a killed writer does no
    // damage. If the file cannot be written, the first statement that changes it fails.
    sqlite3_exec(opened, "PRAGMA journal_mode=WAL; PRAGMA synchronous=NORMAL", nullptr, nullptr,
                 nullptr);
    return SQLITE_OK;
}

// A database with a write-ahead log in a read-only folder can be opened only as immutable. SQLite
// then ignores the log, which is safe if the log is empty.
bool has_empty_log(const std::string &location) {
    std::error_code failed;
    const uintmax_t size = std::filesystem::file_size(location + "-wal", failed);
    return failed || size == 0;
}

cell column(sqlite3_stmt *statement, int index) {
    if (sqlite3_column_type(statement, index) == SQLITE_NULL) return std::nullopt;
    const auto *data = static_cast<const char *>(sqlite3_column_blob(statement, index));
    const auto size = static_cast<size_t>(sqlite3_column_bytes(statement, index));
    return data == nullptr ? std::string() : std::string(data, size);
}

failure run(const database &db, const std::string &sql, const row &values,
            const row_reader &on_row) {
    sqlite3_stmt *statement = nullptr;
    int code = sqlite3_prepare_v2(db.get(), sql.c_str(), -1, &statement, nullptr);
    for (size_t i = 0; code == SQLITE_OK && i < values.size(); ++i) {
        if (!values[i]) continue;
        const int index = static_cast<int>(i) + 1;
        const std::string &text = *values[i];
        if (i == 0) sqlite3_bind_blob64(statement, index, text.data(), text.size(), SQLITE_STATIC);
        if (i > 0) {
            sqlite3_bind_text64(statement, index, text.data(), text.size(), SQLITE_STATIC,
                                SQLITE_UTF8);
        }
    }
    while (code == SQLITE_OK || code == SQLITE_ROW) {
        code = sqlite3_step(statement);
        if (code != SQLITE_ROW || !on_row) continue;
        row found;
        for (int i = 0; i < sqlite3_column_count(statement); ++i) {
            found.push_back(column(statement, i));
        }
        on_row(found);
    }
    failure failed;
    if (code != SQLITE_DONE) failed = failure_of(db, code);
    sqlite3_finalize(statement);
    return failed;
}

failure open_file(const std::string &location, bool read_only, connection &out) {
    const int flags = read_only ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
    database db;
    int code = connect(location, flags, db);
    const int general_code = code & 0xFF;
    const bool lacks_log = general_code == SQLITE_CANTOPEN || general_code == SQLITE_READONLY;
    if (read_only && lacks_log && has_empty_log(location)) {
        const std::string host = location[0] == '/' ? "file://" : "file:";
        code =
            connect(host + percent_encoded(location) + "?immutable=1", flags | SQLITE_OPEN_URI, db);
    }
    if (code != SQLITE_OK) return failure_of(db, code);
    const char *file = sqlite3_db_filename(db.get(), "main");
    if (file == nullptr || *file == '\0') {
        return {"'" + location + "' is not a file and would be lost at the end", true};
    }
    out = [db](const std::string &sql, const row &values, const row_reader &on_row) {
        return run(db, sql, values, on_row);
    };
    return {};
}

constexpr database_kind kSqlite = {"BLOB",
                                   "TEXT",
                                   "TEXT",
                                   "strftime('%Y-%m-%dT%H:%M:%SZ', 'now')",
                                   1U << 20,
                                   "PRAGMA user_version",
                                   "PRAGMA user_version = %d",
                                   "BEGIN IMMEDIATE",
                                   open_file};

}  // namespace

const database_kind *sqlite_database() {
    return &kSqlite;
}
