#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <iterator>

#include "cli/store/database.h"
#include "cli/write/file_names.h"

namespace {

constexpr int kBusyMs = 2000;  // maximum wait while another process writes to the file

bool is_permanent(int code) {
    constexpr int kTemporary[] = {SQLITE_BUSY, SQLITE_LOCKED, SQLITE_CANTOPEN, SQLITE_IOERR,
                                  SQLITE_FULL, SQLITE_NOMEM,  SQLITE_PROTOCOL, SQLITE_INTERRUPT};
    const auto *end = std::end(kTemporary);
    return std::find(std::begin(kTemporary), end, code & 0xFF) == end;
}

// Returns SQLite's code.
int connect(const std::string &name, int flags, sqlite3 **db) {
    int code = sqlite3_open_v2(name.c_str(), db, flags, nullptr);
    if (code != SQLITE_OK) return code;
    sqlite3_busy_timeout(*db, kBusyMs);
    // With a write-ahead log others can read at the same time, and a kill at any moment does no
    // damage.
    const char *first = (flags & SQLITE_OPEN_READONLY) != 0
                            ? "SELECT count(*) FROM sqlite_master"
                            : "PRAGMA journal_mode=WAL; PRAGMA synchronous=NORMAL";
    code = sqlite3_exec(*db, first, nullptr, nullptr, nullptr);
    // A file that cannot be written fails at the first statement that changes it.
    return (flags & SQLITE_OPEN_READONLY) != 0 ? code : SQLITE_OK;
}

// In a read-only folder SQLite opens a database with a write-ahead log only as immutable, which
// ignores the log. That is safe if the log is empty.
bool has_empty_log(const std::string &location) {
    struct stat info {};
    return stat((location + "-wal").c_str(), &info) != 0 || info.st_size == 0;
}

// True if SQLite cannot create the log: the second code means that its user may not write there.
bool lacks_log(int code) {
    return (code & 0xFF) == SQLITE_CANTOPEN || (code & 0xFF) == SQLITE_READONLY;
}

failure open_file(const std::string &location, bool read_only, void **handle) {
    sqlite3 *db = nullptr;
    const int flags = read_only ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
    int code = connect(location, flags, &db);
    if (read_only && lacks_log(code) && has_empty_log(location)) {
        sqlite3_close(db);
        const std::string host = location[0] == '/' ? "file://" : "file:";
        code = connect(host + percent_encoded(location) + "?immutable=1", flags | SQLITE_OPEN_URI,
                       &db);
    }
    *handle = db;
    if (code != SQLITE_OK) return {sqlite3_errmsg(db), is_permanent(code)};
    const char *file = sqlite3_db_filename(db, "main");
    if (file != nullptr && *file != '\0') return {};
    return {"'" + location + "' is not a file and would be lost at the end", true};
}

void bind(sqlite3_stmt *statement, int index, const cell &value) {
    if (const auto *number = std::get_if<int64_t>(&value)) {
        sqlite3_bind_int64(statement, index, *number);
    } else if (const auto *text = std::get_if<std::string>(&value)) {
        sqlite3_bind_text64(statement, index, text->data(), text->size(), SQLITE_STATIC,
                            SQLITE_UTF8);
    } else if (const auto *blob = std::get_if<bytes>(&value)) {
        sqlite3_bind_blob64(statement, index, blob->value.data(), blob->value.size(),
                            SQLITE_STATIC);
    }
}

cell column(sqlite3_stmt *statement, int index) {
    const int type = sqlite3_column_type(statement, index);
    if (type == SQLITE_NULL) return std::monostate();
    if (type == SQLITE_INTEGER) return int64_t{sqlite3_column_int64(statement, index)};
    const auto *data = static_cast<const char *>(sqlite3_column_blob(statement, index));
    std::string value;
    if (data != nullptr) {
        value.assign(data, static_cast<size_t>(sqlite3_column_bytes(statement, index)));
    }
    if (type == SQLITE_BLOB) return bytes{value};
    return value;
}

failure run(void *handle, const std::string &sql, const row &values,
            const std::function<void(const row &)> &on_row) {
    auto *db = static_cast<sqlite3 *>(handle);
    sqlite3_stmt *statement = nullptr;
    int code = sqlite3_prepare_v2(db, sql.c_str(), -1, &statement, nullptr);
    for (size_t i = 0; code == SQLITE_OK && i < values.size(); ++i) {
        bind(statement, static_cast<int>(i) + 1, values[i]);
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
    if (code != SQLITE_DONE) failed = {sqlite3_errmsg(db), is_permanent(code)};
    sqlite3_finalize(statement);
    return failed;
}

void close_file(void *handle) {
    sqlite3_close(static_cast<sqlite3 *>(handle));
}

constexpr database_kind kSqlite = {"BLOB",
                                   "TEXT",
                                   "strftime('%Y-%m-%dT%H:%M:%SZ', 'now')",
                                   "TEXT",
                                   1U << 20,
                                   "PRAGMA user_version",
                                   "PRAGMA user_version = %d",
                                   "BEGIN IMMEDIATE",
                                   open_file,
                                   run,
                                   close_file};

}  // namespace

const database_kind *sqlite_database() {
    return &kSqlite;
}
