#include "cli/store/store.h"

#include <dlfcn.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
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
constexpr int64_t kFirstWaitMs = 500;  // doubled each time
constexpr int64_t kLongestWaitMs = 30'000;
constexpr useconds_t kSliceUs = 50'000;  // time between two checks for a stop

// ---- The table and its SQL.

// Version 2 added offset_ms and decoder. A table without a version (0) has the columns of
// version 1.
constexpr int kTableVersion = 2;
constexpr size_t kAddedColumns = 2;

enum class column_type { text, whole, real, list };  // list: a JSON array of numbers

// A column that holds part of the result, and the key of that part in JSON.
struct result_column {
    const char *name;
    const char *key;
    column_type type;
};
constexpr result_column kResultColumns[] = {
    {"status", "status", column_type::text},
    {"sentence", "error", column_type::text},
    {"sample_rate", "sample_rate", column_type::whole},
    {"channels", "channels", column_type::whole},
    {"duration_ms", "duration_ms", column_type::whole},
    {"hl_pos_ms", "hl_pos_ms", column_type::whole},
    {"hl_end_ms", "hl_end_ms", column_type::whole},
    {"hl_refined", "hl_refined", column_type::whole},
    {"bpm", "bpm", column_type::whole},
    {"beats_ms", "beats_ms", column_type::list},
    {"cpu_ms", "cpu_ms", column_type::whole},
    {"offset_ms", "offset_ms", column_type::real},
    {"decoder", "decoder", column_type::text},
};
constexpr const char *kKey = "path, mode, length_s, max_beats";

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
// the key, the size, the modification time and the cells of append_result_cells.
std::string put_statement() {
    std::vector<std::string> others = {"size", "mtime_ns"};
    for (const result_column &column : kResultColumns) others.emplace_back(column.name);
    others.insert(others.end(), {"version", "host"});
    std::string names = kKey;
    std::string values = "$1, $2, $3, $4";
    std::string changes = "finished = excluded.finished";
    for (size_t i = 0; i < others.size(); ++i) {
        names += ", " + others[i];
        values += ", $" + std::to_string(i + 5);
        changes += ", " + others[i] + " = excluded." + others[i];
    }
    return "INSERT INTO songs (" + names + ", finished) VALUES (" + values +
           ", CURRENT_TIMESTAMP) ON CONFLICT (" + kKey + ") DO UPDATE SET " + changes;
}

// Returns the query for the next songs after a path, in the order of their paths. $1 to $4 are the
// key, with that path as $1; $5 is the status.
std::string page_query(int version) {
    const size_t count = std::size(kResultColumns) - (version < kTableVersion ? kAddedColumns : 0);
    std::string columns = "path";
    for (size_t i = 0; i < count; ++i) columns += std::string(", ") + kResultColumns[i].name;
    return "SELECT " + columns +
           " FROM songs WHERE path > $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 AND "
           "status = $5 ORDER BY path LIMIT 500";
}

// ---- Conversion between rows and JSON.

cell cell_of(const json &result, const char *key) {
    const auto found = result.find(key);
    if (found == result.end()) return std::nullopt;
    if (found->is_boolean()) return found->get<bool>() ? "1" : "0";
    return found->is_string() ? found->get<std::string>() : found->dump();
}

void append_result_cells(row &cells, const std::string &text) {
    const json result = json::parse(text);
    for (const result_column &column : kResultColumns) {
        cells.push_back(cell_of(result, column.key));
    }
    std::array<char, 256> host{};
    gethostname(host.data(), host.size() - 1);
    cells.insert(cells.end(), {TAVO_VERSION, as_utf8(host.data())});
}

// Reads the text of a cell as JSON. Returns false if it is damaged.
bool read_value(const std::string &text, column_type type, json &value) {
    if (type == column_type::text) {
        value = as_utf8(text);
        return true;
    }
    value = json::parse(text, nullptr, false);
    if (type == column_type::whole) return value.is_number_integer();
    if (type == column_type::real) return value.is_number();
    return value.is_array() &&
           std::all_of(value.begin(), value.end(), std::mem_fn(&json::is_number));
}

// Converts a row of page_query to a song. Its result lacks the file's name.
stored_song song_of(const row &cells, int32_t mode) {
    stored_song song;
    song.path = cells[0].value_or("");
    json object = {{"mode", mode_word(mode)}};
    for (size_t i = 1; i < cells.size(); ++i) {
        const result_column &column = kResultColumns[i - 1];
        if (!cells[i] || read_value(*cells[i], column.type, object[column.key])) continue;
        song.damage = {std::string("Its row in the store is damaged: ") + column.name +
                       " cannot be read."};
        return song;
    }
    song.result = object.dump();
    return song;
}

// ---- The connection.

// Returns null if the program was built without PostgreSQL. PostgreSQL's client library depends on
// two dozen others, so the module that needs it is loaded on demand.
const database_kind *postgresql_database() {
    void *module = dlopen("libtavo_postgresql.so", RTLD_NOW | RTLD_LOCAL);
    if (module == nullptr) return nullptr;
    return static_cast<const database_kind *>(dlsym(module, "tavo_postgresql_database"));
}

// Finds the kind of database for the store's URL.
failure find_database(store &db) {
    const std::string &url = db.opts.store;
    db.location = url;
    if (url.rfind("postgresql://", 0) == 0 || url.rfind("postgres://", 0) == 0) {
        db.kind = postgresql_database();
        return {db.kind == nullptr ? "This tavo was built without PostgreSQL." : ""};
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

failure connect(store &db) {
    return db.run ? failure() : db.kind->open(db.location, db.opts.from_store, db.run);
}

// Connects and does the work. After a temporary failure, retries both for at most --patience.
failure persist(store &db, const std::function<failure()> &work) {
    const auto start = steady_clock::now();
    for (int64_t wait_ms = kFirstWaitMs;; wait_ms = std::min(2 * wait_ms, kLongestWaitMs)) {
        failure failed = connect(db);
        if (!failed) failed = work();
        if (!failed) return {};
        db.run = nullptr;
        const auto left = std::chrono::seconds(db.opts.patience_s) - (steady_clock::now() - start);
        const int64_t left_ms = std::chrono::duration_cast<milliseconds>(left).count();
        const std::string reason = shown(failed.sentence);
        if (!failed.is_permanent && left_ms > 0) {
            wait_ms = std::min(wait_ms, left_ms);
            fprintf(stderr, "tavo: the store does not answer (%s); trying again in %.1f s.\n",
                    reason.c_str(), static_cast<double>(wait_ms) / 1000.0);
            const auto end = steady_clock::now() + milliseconds(wait_ms);
            while (stop_signal() == 0 && steady_clock::now() < end) usleep(kSliceUs);
            if (stop_signal() == 0) continue;
        }
        db.has_failed = true;
        return {"the store is given up: " + reason + "."};
    }
}

failure read_version(store &db) {
    return db.run(db.kind->version_query, {}, [&](const row &cells) {
        db.version = static_cast<int>(strtol(cells[0].value_or("0").c_str(), nullptr, 10));
    });
}

// Creates the table or adds missing columns, in one transaction.
failure upgrade(store &db) {
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

failure open_table(store &db) {
    if (failure failed = connect(db)) return failed;
    if (failure failed = read_version(db)) return failed;
    if (db.version > kTableVersion) return {"it was written by a newer tavo", true};
    return db.opts.from_store || db.version == kTableVersion ? failure() : upgrade(db);
}

// ---- Batches and pages.

// Returns the four values of the key, in order.
row key_of(const store &db, const std::string &path) {
    return {path, mode_word(db.opts.mode), std::to_string(db.opts.length_s),
            std::to_string(db.opts.max_beats)};
}

// Returns the values of the key, the size and the modification time.
row values_of(const store &db, const std::string &path, const file_state &file) {
    row values = key_of(db, path);
    values.insert(values.end(), {std::to_string(file.size), std::to_string(file.mtime_ns)});
    return values;
}

failure write_batch(const store &db) {
    const std::string sql = put_statement();
    if (failure failed = db.run("BEGIN", {}, nullptr)) return failed;
    for (const stored_song &song : db.batch) {
        row values = values_of(db, song.path, song.file);
        append_result_cells(values, song.result);
        if (failure failed = db.run(sql, values, nullptr)) return failed;
    }
    return db.run("COMMIT", {}, nullptr);
}

failure commit_batch(store &db) {
    if (db.batch.empty() || db.has_failed) return {};
    if (failure failed = persist(db, [&] { return write_batch(db); })) return failed;
    db.stored += static_cast<int64_t>(db.batch.size());
    db.batch.clear();
    return {};
}

failure read_page(store &db) {
    return persist(db, [&] {
        db.page.clear();
        row values = key_of(db, db.last_path);
        values.emplace_back(db.opts.failed ? "failed" : "ok");
        return db.run(page_query(db.version), values,
                      [&](const row &cells) { db.page.push_back(song_of(cells, db.opts.mode)); });
    });
}

std::string summary_text(const store &db) {
    std::string text = std::to_string(db.stored) + " stored";
    if (db.known > 0) text += ", " + std::to_string(db.known) + " known already";
    if (db.known_failed > 0) {
        text += " (" + std::to_string(db.known_failed) + " failed; --retry-failed)";
    }
    if (!db.batch.empty()) {
        text += "; " + count_text(db.batch.size(), "result") +
                " could not be stored and went to standard output";
    }
    return "tavo: " + text + ".\n";
}

}  // namespace

failure open_store(store &db, const options &opts) {
    if (opts.store.empty()) return {};
    db.opts = opts;
    if (failure failed = find_database(db)) return failed;
    const failure failed = open_table(db);
    if (!failed) return {};
    return {"The store cannot be used: " + shown(failed.sentence) + "."};
}

failure find_song(store &db, const std::string &path, file_state &file, bool &is_new) {
    is_new = true;
    struct stat info {};
    if (db.kind == nullptr || db.has_failed || stat(path.c_str(), &info) != 0) return {};
    file.size = info.st_size;
    file.mtime_ns = int64_t{info.st_mtim.tv_sec} * 1'000'000'000 + info.st_mtim.tv_nsec;
    if (db.opts.redo) return {};
    std::string status;
    failure failed = persist(db, [&] {
        return db.run(kStatusQuery, values_of(db, path, file),
                      [&](const row &cells) { status = cells[0].value_or(""); });
    });
    const bool is_failed = status == "failed";
    is_new = status.empty() || (is_failed && db.opts.retry_failed);
    if (!is_new) ++db.known;
    if (!is_new && is_failed) ++db.known_failed;
    return failed;
}

failure add_song(store &db, stored_song &&song) {
    if (db.kind == nullptr || song.result.empty()) return {};
    if (song.path.size() > kLongestPath) {
        return {shown(song.path) + ": the name is too long for the store."};
    }
    if (db.batch.empty()) db.batch_since = steady_clock::now();
    db.batch.push_back(std::move(song));
    return db.batch.size() >= kBatchRows ? commit_batch(db) : commit_old_batch(db);
}

failure commit_old_batch(store &db) {
    const bool is_old = steady_clock::now() - db.batch_since >= kBatchAge;
    return is_old ? commit_batch(db) : failure();
}

failure read_next(store &db, stored_song &song, bool &found) {
    found = false;
    if (db.page.empty()) {
        if (failure failed = read_page(db)) return failed;
        if (db.page.empty()) return {};
        db.last_path = db.page.back().path;
    }
    song = std::move(db.page.front());
    db.page.pop_front();
    found = true;
    return {};
}

failure close_store(store &db, std::string &summary) {
    if (db.kind == nullptr) return {};
    failure failed = commit_batch(db);
    for (const stored_song &song : db.batch) write_all(STDOUT_FILENO, song.result);
    if ((!db.opts.quiet && !db.opts.from_store) || !db.batch.empty()) summary = summary_text(db);
    return failed;
}
