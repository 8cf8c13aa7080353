#include <sqlite3.h>

#include "cli/store/database.h"

namespace {

constexpr int kBusyMs = 2000;  // several processes may write to one file

std::string open_file(const std::string &where, void **handle) {
    sqlite3 *db = nullptr;
    const int code = sqlite3_open(where.c_str(), &db);
    const std::string error = code == SQLITE_OK ? "" : sqlite3_errmsg(db);
    if (code != SQLITE_OK) {
        sqlite3_close(db);
        return error;
    }
    sqlite3_busy_timeout(db, kBusyMs);
    // A write-ahead log lets readers go on, and survives a kill at any moment.
    sqlite3_exec(db, "PRAGMA journal_mode=WAL; PRAGMA synchronous=NORMAL", nullptr, nullptr,
                 nullptr);
    *handle = db;
    return "";
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
    const auto size = [&] { return static_cast<size_t>(sqlite3_column_bytes(statement, index)); };
    switch (sqlite3_column_type(statement, index)) {
        case SQLITE_INTEGER:
            return int64_t{sqlite3_column_int64(statement, index)};
        case SQLITE_NULL:
            return std::monostate();
        case SQLITE_BLOB: {
            const auto *data = static_cast<const char *>(sqlite3_column_blob(statement, index));
            return data == nullptr ? bytes{} : bytes{std::string(data, size())};
        }
        default: {
            const auto *text =
                reinterpret_cast<const char *>(sqlite3_column_text(statement, index));
            return text == nullptr ? std::string() : std::string(text, size());
        }
    }
}

std::string run(void *handle, const std::string &sql, const row &values,
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
    const std::string error = code == SQLITE_DONE ? "" : sqlite3_errmsg(db);
    sqlite3_finalize(statement);
    return error;
}

void close_file(void *handle) {
    sqlite3_close(static_cast<sqlite3 *>(handle));
}

constexpr database_kind kSqlite = {"BLOB", "TEXT", "TEXT", 1U << 20, open_file, run, close_file};

}  // namespace

const database_kind *sqlite_database() {
    return &kSqlite;
}
