#include "cli/store/store.h"

#include <dlfcn.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <functional>
#include <iterator>
#include <nlohmann/json.hpp>

#include "cli/system.h"
#include "cli/write/value_text.h"

namespace {

using nlohmann::json;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

// In bytes. An index entry of PostgreSQL may take at most a third of an 8-KiB page.
constexpr size_t kLongestPath = 2600;
constexpr size_t kBatchRows = 100;
constexpr milliseconds kBatchAge{2000};
constexpr milliseconds kFirstWait{500};  // doubled each time
constexpr milliseconds kLongestWait{30'000};
constexpr useconds_t kSliceUs = 50'000;  // time between two checks for a stop

// ---- The table and its SQL.

// Version 2 added offset_ms and decoder. A table without a version (0) has the columns of
// version 1.
constexpr int kTableVersion = 2;
constexpr size_t kAddedColumns = 2;

// A column that holds part of the result, and the key and type of that part in JSON. An array has
// numbers only.
struct result_column {
    const char *name;
    const char *key;
    bool (json::*has_type)() const noexcept;
};
constexpr result_column kResultColumns[] = {
    {"status", "status", &json::is_string},
    {"sentence", "error", &json::is_string},
    {"sample_rate", "sample_rate", &json::is_number_integer},
    {"channels", "channels", &json::is_number_integer},
    {"duration_ms", "duration_ms", &json::is_number_integer},
    {"hl_pos_ms", "hl_pos_ms", &json::is_number_integer},
    {"hl_end_ms", "hl_end_ms", &json::is_number_integer},
    {"hl_refined", "hl_refined", &json::is_number_integer},
    {"bpm", "bpm", &json::is_number_integer},
    {"beats_ms", "beats_ms", &json::is_array},
    {"cpu_ms", "cpu_ms", &json::is_number_integer},
    {"offset_ms", "offset_ms", &json::is_number},
    {"decoder", "decoder", &json::is_string},
};

// Selects a song's status. The values are the key, the size and the modification time, $1 to $6.
constexpr const char *kStatusQuery =
    "SELECT status FROM songs WHERE path = $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 "
    "AND size = $5 AND mtime_ns = $6";

// The types are PostgreSQL's. SQLite accepts them, and every column takes any value there.
constexpr const char *kCreateTable =
    "CREATE TABLE IF NOT EXISTS songs (path BYTEA NOT NULL, mode TEXT NOT NULL, "
    "length_s INTEGER NOT NULL, max_beats INTEGER NOT NULL, size BIGINT NOT NULL, "
    "mtime_ns BIGINT NOT NULL, status TEXT NOT NULL, sentence TEXT, sample_rate INTEGER, "
    "channels INTEGER, duration_ms BIGINT, hl_pos_ms INTEGER, hl_end_ms BIGINT, "
    "hl_refined INTEGER, bpm INTEGER, beats_ms JSON, cpu_ms BIGINT, version TEXT NOT NULL, "
    "host TEXT NOT NULL, finished TIMESTAMPTZ NOT NULL, "
    "PRIMARY KEY (path, mode, length_s, max_beats))";

// Returns the statement that inserts a row or replaces the row with the same key. The values are
// the key and the cells of cells_of.
std::string put_statement() {
    std::vector<std::string> names = {"path", "mode", "length_s", "max_beats", "size", "mtime_ns"};
    for (const result_column &column : kResultColumns) names.emplace_back(column.name);
    names.insert(names.end(), {"version", "host"});
    std::string columns = "finished";
    std::string values = "CURRENT_TIMESTAMP";
    for (size_t i = 0; i < names.size(); ++i) {
        columns += ", " + names[i];
        values += ", $" + std::to_string(i + 1);
    }
    return "INSERT INTO songs (" + columns + ") VALUES (" + values +
           ") ON CONFLICT (path, mode, length_s, max_beats) DO UPDATE SET (" + columns + ") = (" +
           values + ")";
}

// Returns the query for the next songs after a path, in the order of their paths. $1 to $4 are the
// key, with that path as $1; $5 is the status. Its columns are bytes or text.
std::string page_query(int version) {
    const size_t count = std::size(kResultColumns) - (version < kTableVersion ? kAddedColumns : 0);
    std::string columns = "path";
    for (size_t i = 0; i < count; ++i) {
        columns += std::string(", CAST(") + kResultColumns[i].name + " AS TEXT)";
    }
    return "SELECT " + columns +
           " FROM songs WHERE path > $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 AND "
           "status = $5 ORDER BY path LIMIT 500";
}

// ---- Conversion between rows and JSON.

cell cell_of(const json &value) {
    if (value.is_null()) return std::nullopt;
    if (value.is_boolean()) return value.get<bool>() ? "1" : "0";
    return value.is_string() ? value.get<std::string>() : value.dump();
}

// Returns the cells of a row after its key, except the time.
row cells_of(const input &song) {
    row cells = {std::to_string(song.file.size), std::to_string(song.file.mtime_ns)};
    const json result = json::parse(song.stored);
    for (const result_column &column : kResultColumns) {
        cells.push_back(cell_of(result.value(column.key, json())));
    }
    std::string host(256, '\0');
    gethostname(host.data(), host.size());
    cells.insert(cells.end(), {TAVO_VERSION, as_utf8(host.c_str())});
    return cells;
}

// Reads the text of a cell as JSON. Returns false if it is damaged.
bool read_value(const std::string &text, const result_column &column, json &value) {
    const bool is_text = column.has_type == &json::is_string;
    value = is_text ? json(as_utf8(text)) : json::parse(text, nullptr, false);
    return (value.*column.has_type)() &&
           (is_text || std::all_of(value.begin(), value.end(), std::mem_fn(&json::is_number)));
}

// Converts a row of page_query to a song. Its result lacks the file's name.
input song_of(const row &cells, int32_t mode) {
    input song;
    song.path = cells[0].value_or("");
    json object = {{"mode", mode_word(mode)}};
    for (size_t i = 1; i < cells.size(); ++i) {
        const result_column &column = kResultColumns[i - 1];
        if (!cells[i] || read_value(*cells[i], column, object[column.key])) continue;
        song.refusal = {std::string("Its row in the store is damaged: ") + column.name +
                        " cannot be read."};
        return song;
    }
    song.stored = object.dump();
    return song;
}

// ---- The connection.

// Finds the kind of database for the store's URL.
failure find_database(store &db) {
    const std::string &url = db.opts.store;
    db.location = url;
    if (url.rfind("postgresql://", 0) == 0 || url.rfind("postgres://", 0) == 0) {
        // PostgreSQL's client library depends on two dozen others, so the module that needs it is
        // loaded on demand. A program that was built without PostgreSQL lacks the module.
        void *module = dlopen("libtavo_postgresql.so", RTLD_NOW | RTLD_LOCAL);
        void *kind = module == nullptr ? nullptr : dlsym(module, "tavo_postgresql_database");
        db.kind = static_cast<const database_kind *>(kind);
        return {kind == nullptr ? "This tavo was built without PostgreSQL." : ""};
    }
    if (url.rfind("sqlite:", 0) == 0) {
        db.location = url.substr(7);
    } else if (std::filesystem::path(url).extension() != ".db") {
        return {
            "--store takes sqlite:FILE, a file that ends in .db, or postgresql://HOST/DATABASE."};
    }
    db.kind = &sqlite_database;
    return {db.kind == nullptr ? "This tavo was built without SQLite." : ""};
}

// Connects and does the work. After a temporary failure, retries both for at most --patience.
failure persist(store &db, const std::function<failure()> &work) {
    const auto deadline = steady_clock::now() + std::chrono::seconds(db.opts.patience_s);
    for (milliseconds wait = kFirstWait;; wait = std::min(2 * wait, kLongestWait)) {
        failure failed;
        if (!db.run) failed = db.kind->open(db.location, db.opts.from_store, db.run);
        // At the start of the command, a missing file or server means that the URL is wrong.
        if (failed && !db.is_open) failed.is_permanent = true;
        if (!failed) failed = work();
        if (!failed) return {};
        db.run = nullptr;
        const std::string reason = shown(failed.sentence);
        const auto now = steady_clock::now();
        if (!failed.is_permanent && now < deadline && stop_signal() == 0) {
            const auto end = std::min<steady_clock::time_point>(now + wait, deadline);
            fprintf(stderr, "tavo: the store does not answer (%s); trying again in %.1f s.\n",
                    reason.c_str(), std::chrono::duration<double>(end - now).count());
            while (stop_signal() == 0 && steady_clock::now() < end) usleep(kSliceUs);
            if (stop_signal() == 0) continue;
        }
        db.has_failed = true;
        return {(db.is_open ? "the store is given up: " : "The store cannot be used: ") + reason +
                "."};
    }
}

failure read_version(store &db) {
    return db.run(db.kind->version_query, {}, [&](const row &cells) {
        db.version = static_cast<int>(strtol(cells[0].value_or("0").c_str(), nullptr, 10));
    });
}

// Checks the version of the table. Unless the store is only read, creates the table or adds missing
// columns, in one transaction.
failure open_table(store &db) {
    if (failure failed = read_version(db)) return failed;
    if (db.version > kTableVersion) return {"it was written by a newer tavo", true};
    if (db.opts.from_store || db.version == kTableVersion) return {};
    if (failure failed = db.run(db.kind->begin_upgrade, {}, nullptr)) return failed;
    // Another command may have upgraded the table meanwhile.
    if (failure failed = read_version(db)) return failed;
    if (db.version == kTableVersion) return db.run("COMMIT", {}, nullptr);
    const std::string set_version = formatted(db.kind->set_version, kTableVersion);
    for (const char *sql :
         {kCreateTable, "ALTER TABLE songs ADD COLUMN offset_ms DOUBLE PRECISION",
          "ALTER TABLE songs ADD COLUMN decoder TEXT", set_version.c_str(), "COMMIT"}) {
        if (failure failed = db.run(sql, {}, nullptr)) return failed;
    }
    return {};
}

// ---- Batches and pages.

// Returns the values of the key, followed by other values.
row values_of(const store &db, const std::string &path, row others) {
    others.insert(others.begin(), {path, mode_word(db.opts.mode), std::to_string(db.opts.length_s),
                                   std::to_string(db.opts.max_beats)});
    return others;
}

failure commit_batch(store &db) {
    if (db.batch.empty() || db.has_failed) return {};
    const auto write_rows = [&]() -> failure {
        if (failure failed = db.run("BEGIN", {}, nullptr)) return failed;
        const std::string sql = put_statement();
        for (const input &song : db.batch) {
            const row values = values_of(db, song.path, cells_of(song));
            if (failure failed = db.run(sql, values, nullptr)) return failed;
        }
        return db.run("COMMIT", {}, nullptr);
    };
    if (failure failed = persist(db, write_rows)) return failed;
    db.stored += static_cast<int64_t>(db.batch.size());
    db.batch.clear();
    return {};
}

}  // namespace

failure open_store(store &db, const options &opts) {
    if (opts.store.empty()) return {};
    db.opts = opts;
    if (failure failed = find_database(db)) return failed;
    failure failed = persist(db, [&] { return open_table(db); });
    db.is_open = !failed;
    return failed;
}

failure find_song(store &db, input &song, bool &is_new) {
    is_new = true;
    struct stat info {};
    if (db.kind == nullptr || db.has_failed || stat(song.path.c_str(), &info) != 0) return {};
    song.file.size = info.st_size;
    song.file.mtime_ns = int64_t{info.st_mtim.tv_sec} * 1'000'000'000 + info.st_mtim.tv_nsec;
    if (db.opts.redo) return {};
    std::string status;
    const row values = values_of(
        db, song.path, {std::to_string(song.file.size), std::to_string(song.file.mtime_ns)});
    failure failed = persist(db, [&] {
        return db.run(kStatusQuery, values,
                      [&](const row &cells) { status = cells[0].value_or(""); });
    });
    const bool is_failed = status == "failed";
    is_new = status.empty() || (is_failed && db.opts.retry_failed);
    if (!is_new) ++db.known;
    if (!is_new && is_failed) ++db.known_failed;
    return failed;
}

failure add_song(store &db, input &&song) {
    if (db.kind == nullptr || song.stored.empty()) return {};
    if (song.path.size() > kLongestPath) {
        return {shown(song.path) + ": the name is too long for the store."};
    }
    if (db.batch.empty()) db.batch_since = steady_clock::now();
    db.batch.push_back(std::move(song));
    return db.batch.size() >= kBatchRows ? commit_batch(db) : commit_old_batch(db);
}

failure commit_old_batch(store &db) {
    return steady_clock::now() - db.batch_since < kBatchAge ? failure() : commit_batch(db);
}

failure read_next(store &db, input &song, bool &found) {
    found = false;
    if (db.page.empty()) {
        const row values = values_of(db, db.last_path, {db.opts.failed ? "failed" : "ok"});
        failure failed = persist(db, [&] {
            db.page.clear();  // rows of a failed attempt
            return db.run(page_query(db.version), values, [&](const row &cells) {
                db.page.push_back(song_of(cells, db.opts.mode));
            });
        });
        if (failed || db.page.empty()) return failed;
    }
    song = std::move(db.page.front());
    db.page.pop_front();
    db.last_path = song.path;
    found = true;
    return {};
}

failure close_store(store &db, std::string &summary) {
    if (db.kind == nullptr) return {};
    failure failed = commit_batch(db);
    for (const input &song : db.batch) write_all(STDOUT_FILENO, song.stored);
    if ((db.opts.quiet || db.opts.from_store) && db.batch.empty()) return failed;
    summary = "tavo: " + std::to_string(db.stored) + " stored";
    if (db.known > 0) summary += ", " + std::to_string(db.known) + " known already";
    if (db.known_failed > 0) {
        summary += " (" + std::to_string(db.known_failed) + " failed; --retry-failed)";
    }
    if (!db.batch.empty()) {
        summary += "; " + count_text(db.batch.size(), "result") +
                   " could not be stored and went to standard output";
    }
    summary += ".\n";
    return failed;
}
