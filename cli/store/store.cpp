#include "cli/store/store.h"

#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "cli/run/stop.h"
#include "cli/store/songs_table.h"
#include "cli/system.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr size_t kBatchRows = 100;
constexpr milliseconds kBatchAge{2000};
constexpr int64_t kFirstWaitMs = 500;  // doubled each time
constexpr int64_t kLongestWaitMs = 30'000;
constexpr int64_t kPageRows = 500;

// Returns the four values of the key, in order.
row key_of(const store &db, const std::string &path) {
    return {bytes{path}, std::string(mode_word(db.opts.mode)), int64_t{db.opts.length_s},
            int64_t{db.opts.max_beats}};
}

failure run(const store &db, const std::string &sql, const row &values = {},
            const std::function<void(const row &)> &on_row = nullptr) {
    return db.kind->run(db.handle, sql, values, on_row);
}

void disconnect(store &db) {
    if (db.handle != nullptr) db.kind->close(db.handle);
    db.handle = nullptr;
}

failure connect(store &db) {
    if (db.handle != nullptr) return {};
    failure failed = db.kind->open(db.location, db.opts.from_store, &db.handle);
    if (failed) disconnect(db);
    return failed;
}

std::string public_text(const store &db, const failure &failed) {
    return shown(without_credentials(failed.sentence, db.opts.store));
}

// Runs the work until it succeeds. Connects again after each temporary failure.
failure persist(store &db, const std::function<failure()> &work) {
    const auto start = steady_clock::now();
    for (int64_t wait_ms = kFirstWaitMs;; wait_ms = std::min(2 * wait_ms, kLongestWaitMs)) {
        failure failed = connect(db);
        if (!failed) failed = work();
        if (!failed) return {};
        disconnect(db);
        const auto left = std::chrono::seconds(db.opts.patience_s) - (steady_clock::now() - start);
        const int64_t left_ms = std::chrono::duration_cast<milliseconds>(left).count();
        const std::string reason = public_text(db, failed);
        bool may_retry = !failed.is_permanent && left_ms > 0;
        if (may_retry) {
            wait_ms = std::min(wait_ms, left_ms);
            fprintf(stderr, "tavo: the store does not answer (%s); trying again in %.1f s.\n",
                    reason.c_str(), static_cast<double>(wait_ms) / 1000.0);
            pollfd stop = {stop_fd(), POLLIN, 0};
            may_retry = poll(&stop, 1, static_cast<int>(wait_ms)) <= 0;
        }
        if (may_retry) continue;
        db.has_failed = true;
        return {"the store is given up: " + reason + "."};
    }
}

failure read_version(store &db) {
    db.version = 0;
    return run(db, db.kind->version_query, {}, [&](const row &cells) {
        if (const auto *number = std::get_if<int64_t>(&cells[0])) {
            db.version = static_cast<int>(*number);
        }
    });
}

// Creates the table or adds missing columns, in one transaction.
failure upgrade(store &db) {
    failure failed = run(db, db.kind->begin_upgrade);
    if (!failed) failed = read_version(db);  // another command may have upgraded it meanwhile
    if (!failed && db.version < kTableVersion) {
        for (const std::string &statement : upgrade_statements(*db.kind)) {
            if (!failed) failed = run(db, statement);
        }
    }
    if (!failed) failed = run(db, "COMMIT");
    if (failed) disconnect(db);  // which rolls back
    return failed;
}

failure open_table(store &db) {
    if (failure failed = connect(db)) return failed;
    if (failure failed = read_version(db)) return failed;
    if (db.version > kTableVersion) return {"it was written by a newer tavo", true};
    return db.opts.from_store || db.version == kTableVersion ? failure() : upgrade(db);
}

failure write_batch(const store &db) {
    const std::string sql = put_statement(*db.kind);
    if (failure failed = run(db, "BEGIN")) return failed;
    for (const stored_song &song : db.batch) {
        row cells = key_of(db, song.path);
        cells.insert(cells.end(), {song.file.size, song.file.mtime_ns});
        append_result_cells(cells, song.result);
        if (failure failed = run(db, sql, cells)) return failed;
    }
    return run(db, "COMMIT");
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
        values.insert(values.end(), {std::string(db.opts.failed ? "failed" : "ok"), kPageRows});
        return run(db, page_query(db.version), values, [&](const row &cells) {
            db.page.emplace_back();
            stored_song &song = db.page.back();
            song.damage = read_result_cells(cells, mode_word(db.opts.mode), song.path, song.result);
        });
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

int read_file_state(const std::string &path, file_state &state) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return errno;
    state.size = info.st_size;
    state.mtime_ns = int64_t{info.st_mtim.tv_sec} * 1'000'000'000 + info.st_mtim.tv_nsec;
    return 0;
}

failure open_store(store &db, const options &opts) {
    if (opts.store.empty()) return {};
    db.opts = opts;
    if (failure failed = find_database(opts.store, &db.kind, db.location)) {
        db.kind = nullptr;
        return failed;
    }
    const failure failed = open_table(db);
    if (!failed) return {};
    const std::string text = public_text(db, failed);
    disconnect(db);
    db.kind = nullptr;
    return {"The store cannot be used: " + text + "."};
}

failure find_song(store &db, const std::string &path, file_state &file, bool &is_new) {
    is_new = true;
    if (db.kind == nullptr || db.has_failed) return {};
    if (read_file_state(path, file) != 0 || db.opts.redo) return {};
    std::string status;
    failure failed = persist(db, [&] {
        row values = key_of(db, path);
        values.insert(values.end(), {file.size, file.mtime_ns});
        return run(db, kStatusQuery, values, [&](const row &cells) {
            const auto *text = std::get_if<std::string>(&cells[0]);
            status = text != nullptr ? *text : "damaged";
        });
    });
    const bool is_failed = status == "failed";
    if (status.empty() || status == "damaged" || (is_failed && db.opts.retry_failed)) return failed;
    is_new = false;
    ++db.known;
    db.known_failed += is_failed ? 1 : 0;
    return failed;
}

failure add_song(store &db, stored_song &&song) {
    if (db.kind == nullptr || song.result.empty()) return {};
    if (song.path.size() > db.kind->longest_path) {
        return {shown(song.path) + ": the name is too long for the store."};
    }
    if (db.batch.empty()) db.batch_since = steady_clock::now();
    db.batch.push_back(std::move(song));
    return db.batch.size() >= kBatchRows ? commit_batch(db) : commit_old_batch(db);
}

failure commit_old_batch(store &db) {
    return batch_timeout_ms(db) == 0 ? commit_batch(db) : failure();
}

int batch_timeout_ms(const store &db) {
    if (db.batch.empty() || db.has_failed) return -1;
    const auto left = kBatchAge - (steady_clock::now() - db.batch_since);
    return static_cast<int>(std::max<int64_t>(std::chrono::ceil<milliseconds>(left).count(), 0));
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
    for (const stored_song &song : db.batch) {
        write_all(STDOUT_FILENO, song.result);
    }
    if ((!db.opts.quiet && !db.opts.from_store) || !db.batch.empty()) summary = summary_text(db);
    disconnect(db);
    db.batch.clear();
    db.kind = nullptr;
    return failed;
}
