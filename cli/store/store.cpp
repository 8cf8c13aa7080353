#include "cli/store/store.h"

#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <ctime>

#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

using nlohmann::json;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr size_t kBatchRows = 100;
constexpr milliseconds kBatchAge{2000};
constexpr int64_t kFirstWaitMs = 500;  // doubled each time
constexpr int64_t kLongestWaitMs = 30'000;
constexpr int64_t kPageRows = 500;

// A column beside the key and the file's state, and the key of the result that it holds.
struct result_column {
    const char *name;
    const char *type;  // null: the database's type for JSON
    const char *key;
};
constexpr result_column kResultColumns[] = {
    {"status", "TEXT NOT NULL", "status"},
    {"sentence", "TEXT", "error"},
    {"sample_rate", "INTEGER", "sample_rate"},
    {"channels", "INTEGER", "channels"},
    {"duration_ms", "BIGINT", "duration_ms"},
    {"hl_pos_ms", "INTEGER", "hl_pos_ms"},
    {"hl_end_ms", "BIGINT", "hl_end_ms"},
    {"hl_refined", "INTEGER", "hl_refined"},
    {"bpm", "INTEGER", "bpm"},
    {"beats_ms", nullptr, "beats_ms"},
    {"cpu_ms", "BIGINT", "cpu_ms"},
};
constexpr const char *kKey = "path, mode, length_s, max_beats";

std::string table_sql(const database_kind &kind) {
    std::string sql = "CREATE TABLE IF NOT EXISTS songs (path " + std::string(kind.bytes_type) +
                      " NOT NULL, mode TEXT NOT NULL, length_s INTEGER NOT NULL, max_beats INTEGER "
                      "NOT NULL, size BIGINT NOT NULL, mtime_ns BIGINT NOT NULL";
    for (const result_column &column : kResultColumns) {
        sql += std::string(", ") + column.name + " " +
               (column.type == nullptr ? kind.json_type : column.type);
    }
    return sql + ", version TEXT NOT NULL, host TEXT NOT NULL, finished " + kind.time_type +
           " NOT NULL, PRIMARY KEY (" + kKey + "))";
}

// Inserts a row or replaces what is there under its key.
std::string put_sql() {
    std::vector<std::string> others = {"size", "mtime_ns"};
    for (const result_column &column : kResultColumns) others.emplace_back(column.name);
    others.insert(others.end(), {"version", "host", "finished"});
    std::string names = kKey;
    std::string values = "$1, $2, $3, $4";
    std::string changes;
    for (size_t i = 0; i < others.size(); ++i) {
        names += ", " + others[i];
        values += ", $" + std::to_string(i + 5);
        changes += (i == 0 ? "" : ", ") + others[i] + " = excluded." + others[i];
    }
    return "INSERT INTO songs (" + names + ") VALUES (" + values + ") ON CONFLICT (" + kKey +
           ") DO UPDATE SET " + changes;
}

cell cell_of(const json &result, const char *key) {
    const auto found = result.find(key);
    if (found == result.end()) return std::monostate();
    if (found->is_boolean()) return int64_t{found->get<bool>() ? 1 : 0};
    if (found->is_number_integer()) return found->get<int64_t>();
    if (found->is_string()) return found->get<std::string>();
    return found->dump();
}

// The key's cells, in its order.
row key_of(const store &of, const std::string &path) {
    return {bytes{path}, std::string(mode_word(of.mode)), int64_t{of.length_s},
            int64_t{of.max_beats}};
}

std::string now_text() {
    const time_t now = time(nullptr);
    tm parts{};
    gmtime_r(&now, &parts);
    std::array<char, 32> text{};
    strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &parts);
    return text.data();
}

std::string host_name() {
    std::array<char, 256> name{};
    gethostname(name.data(), name.size() - 1);
    return as_utf8(name.data());
}

row row_of(const store &of, const song_row &song) {
    row out = key_of(of, song.path);
    out.insert(out.end(), {song.file.size, song.file.mtime_ns});
    for (const result_column &column : kResultColumns) {
        out.push_back(cell_of(song.result, column.key));
    }
    out.insert(out.end(), {std::string(TAVO_VERSION), host_name(), now_text()});
    return out;
}

std::string run(const store &in, const std::string &sql, const row &values = {},
                const std::function<void(const row &)> &on_row = nullptr) {
    return in.kind->run(in.handle, sql, values, on_row);
}

void disconnect(store &from) {
    if (from.handle != nullptr) from.kind->close(from.handle);
    from.handle = nullptr;
}

std::string connect(store &to) {
    if (to.handle != nullptr) return "";
    const std::string error = to.kind->open(to.where, &to.handle);
    if (!error.empty()) to.handle = nullptr;
    return error;
}

// Runs the work until it succeeds, waiting longer after each failure, on a new connection each
// time.
std::string persist(store &to, int stop_fd, const std::function<std::string()> &work) {
    const auto start = steady_clock::now();
    for (int64_t wait_ms = kFirstWaitMs;; wait_ms = std::min(2 * wait_ms, kLongestWaitMs)) {
        std::string error = connect(to);
        if (error.empty()) error = work();
        if (error.empty()) return "";
        disconnect(to);
        const auto left = std::chrono::seconds(to.patience_s) - (steady_clock::now() - start);
        const int64_t left_ms = std::chrono::duration_cast<milliseconds>(left).count();
        if (left_ms <= 0) return error;
        wait_ms = std::min(wait_ms, left_ms);
        fprintf(stderr, "tavo: the store does not answer (%s); trying again in %.1f s.\n",
                shown(error).c_str(), static_cast<double>(wait_ms) / 1000.0);
        pollfd stop = {stop_fd, POLLIN, 0};
        if (poll(&stop, 1, static_cast<int>(wait_ms)) > 0) return error;
    }
}

std::string write_batch(const store &to) {
    static const std::string sql = put_sql();
    std::string error = run(to, "BEGIN");
    for (size_t i = 0; error.empty() && i < to.batch.size(); ++i) {
        error = run(to, sql, row_of(to, to.batch[i]));
    }
    return error.empty() ? run(to, "COMMIT") : error;
}

song_row song_of(const row &cells) {
    song_row song;
    song.path = std::get<bytes>(cells[0]).value;
    song.result = json::object();
    for (size_t i = 0; i < std::size(kResultColumns); ++i) {
        const result_column &column = kResultColumns[i];
        const cell &value = cells[i + 1];
        if (const auto *number = std::get_if<int64_t>(&value)) {
            song.result[column.key] = *number;
        } else if (const auto *text = std::get_if<std::string>(&value)) {
            song.result[column.key] = column.type == nullptr ? json::parse(*text) : json(*text);
        }
    }
    return song;
}

}  // namespace

int read_file_state(const std::string &path, file_state &state) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return errno;
    state.size = info.st_size;
    state.mtime_ns = int64_t{info.st_mtim.tv_sec} * 1'000'000'000 + info.st_mtim.tv_nsec;
    return 0;
}

std::string open_store(store &to, const std::string &url, const options &opts) {
    std::string error;
    to.kind = find_database(url, to.where, error);
    if (to.kind == nullptr) return error;
    to.mode = opts.mode;
    to.length_s = opts.length_s;
    to.max_beats = opts.max_beats;
    to.patience_s = opts.patience_s;
    error = connect(to);
    if (error.empty()) error = run(to, table_sql(*to.kind));
    return error.empty() ? "" : "The store cannot be used: " + shown(error) + ".";
}

std::string find_song(store &in, const std::string &path, const file_state &file, int stop_fd,
                      known_as &found) {
    return persist(in, stop_fd, [&] {
        found = known_as::unknown;
        row values = key_of(in, path);
        values.insert(values.end(), {file.size, file.mtime_ns});
        return run(in,
                   "SELECT status FROM songs WHERE path = $1 AND mode = $2 AND length_s = $3 AND "
                   "max_beats = $4 AND size = $5 AND mtime_ns = $6",
                   values, [&](const row &cells) {
                       found = std::get<std::string>(cells[0]) == "ok" ? known_as::ok
                                                                       : known_as::failed;
                   });
    });
}

std::string add_song(store &to, song_row &&song, int stop_fd) {
    if (to.batch.empty()) to.batch_since = steady_clock::now();
    to.batch.push_back(std::move(song));
    const bool full = to.batch.size() >= kBatchRows || batch_timeout_ms(to) == 0;
    return full ? commit_batch(to, stop_fd) : "";
}

std::string commit_batch(store &to, int stop_fd) {
    if (to.batch.empty()) return "";
    const std::string error = persist(to, stop_fd, [&] { return write_batch(to); });
    if (!error.empty()) return error;
    to.stored += static_cast<int64_t>(to.batch.size());
    to.batch.clear();
    return "";
}

int batch_timeout_ms(const store &of) {
    if (of.batch.empty()) return -1;
    const auto left = kBatchAge - (steady_clock::now() - of.batch_since);
    return static_cast<int>(std::max<int64_t>(std::chrono::ceil<milliseconds>(left).count(), 0));
}

std::string read_page(store &from, const std::string &after, std::vector<song_row> &page) {
    std::string columns = "path";
    for (const result_column &column : kResultColumns) columns += std::string(", ") + column.name;
    row values = key_of(from, after);
    values.emplace_back(kPageRows);
    return run(from,
               "SELECT " + columns +
                   " FROM songs WHERE path > $1 AND mode = $2 AND length_s = $3 AND max_beats = $4 "
                   "AND status = 'ok' ORDER BY path LIMIT $5",
               values, [&](const row &cells) {
                   page.push_back(song_of(cells));
                   page.back().result["mode"] = mode_word(from.mode);
               });
}

void close_store(store &which) {
    disconnect(which);
    which.batch.clear();
}
