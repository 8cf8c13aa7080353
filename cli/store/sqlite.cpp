#include <sqlite3.h>
#include <unistd.h>

#include <algorithm>
#include <iterator>
#include <memory>

#include "cli/store/database.h"
#include "cli/system.h"

namespace {

// Waits while another process writes to the file. A stop leaves a quarter of them, so that the
// last rows can still be stored.
constexpr int kBusyWaits = 100;
constexpr useconds_t kBusyWaitUs = 20'000;

using database = std::shared_ptr<sqlite3>;

failure failure_of(const database &db, int code) {
    constexpr int kTemporary[] = {SQLITE_BUSY, SQLITE_LOCKED, SQLITE_CANTOPEN, SQLITE_IOERR,
                                  SQLITE_FULL, SQLITE_NOMEM,  SQLITE_PROTOCOL, SQLITE_INTERRUPT};
    const auto found = std::count(std::begin(kTemporary), std::end(kTemporary), code & 0xFF);
    return {sqlite3_errmsg(db.get()), found == 0};
}

int wait_while_busy(void * /*unused*/, int earlier_waits) {
    usleep(kBusyWaitUs);
    return earlier_waits < (stop_signal() == 0 ? kBusyWaits : kBusyWaits / 4) ? 1 : 0;
}

failure run(const database &db, const std::string &sql, const row &values,
            const row_reader &on_row) {
    sqlite3_stmt *statement = nullptr;
    int code = sqlite3_prepare_v2(db.get(), sql.c_str(), -1, &statement, nullptr);
    for (size_t i = 0; code == SQLITE_OK && i < values.size(); ++i) {
        if (!values[i]) continue;
        const int index = static_cast<int>(i) + 1;
        const std::string &text = *values[i];
        code = i == 0 ? sqlite3_bind_blob64(statement, index, text.data(), text.size(), nullptr)
                      : sqlite3_bind_text64(statement, index, text.data(), text.size(), nullptr,
                                            SQLITE_UTF8);
    }
    while (code == SQLITE_OK || code == SQLITE_ROW) {
        code = sqlite3_step(statement);
        if (code != SQLITE_ROW || !on_row) continue;
        row found;
        for (int i = 0; i < sqlite3_column_count(statement); ++i) {
            const bool is_path = sqlite3_column_type(statement, i) == SQLITE_BLOB;  // not UTF-8
            const auto *bytes = static_cast<const char *>(
                is_path ? sqlite3_column_blob(statement, i) : sqlite3_column_text(statement, i));
            const auto size = static_cast<size_t>(sqlite3_column_bytes(statement, i));
            found.push_back(bytes == nullptr ? cell() : std::string(bytes, size));
        }
        on_row(found);
    }
    failure failed = code == SQLITE_DONE ? failure() : failure_of(db, code);
    sqlite3_finalize(statement);
    return failed;
}

failure open_file(const std::string &location, bool read_only, connection &out) {
    // SQLite opens a write-protected file read-only. Reading needs write access only if a writer
    // was killed during a commit, which the next reader rolls back.
    const int flags = SQLITE_OPEN_READWRITE | (read_only ? 0 : SQLITE_OPEN_CREATE);
    sqlite3 *opened = nullptr;
    const int code = sqlite3_open_v2(location.c_str(), &opened, flags, nullptr);
    const database db(opened, sqlite3_close);
    if (code != SQLITE_OK) return failure_of(db, code);
    const char *file = sqlite3_db_filename(opened, "main");
    if (file == nullptr || *file == '\0') {
        return {"'" + location + "' is not a file and would be lost at the end", true};
    }
    // Earlier versions kept a write-ahead log, which cannot be read in a read-only folder.
    if (!read_only) sqlite3_exec(opened, "PRAGMA journal_mode=DELETE", nullptr, nullptr, nullptr);
    sqlite3_busy_handler(opened, wait_while_busy, nullptr);
    out = [db](const auto &...arguments) { return run(db, arguments...); };
    return {};
}

}  // namespace

const database_kind sqlite_database = {"PRAGMA user_version", "PRAGMA user_version = %d",
                                       "BEGIN IMMEDIATE", open_file};
