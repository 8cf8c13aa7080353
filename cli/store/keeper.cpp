#include "cli/store/keeper.h"

#include <unistd.h>

#include <algorithm>

#include "cli/run/stop.h"
#include "cli/run/worker.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

std::string give_up(store_keeper &keeper, const std::string &error) {
    if (error.empty()) return "";
    keeper.failed = true;
    return "tavo: the store is given up: " + shown(error) + ".\n";
}

}  // namespace

std::string open_keeper(store_keeper &keeper, const options &opts) {
    if (opts.store.empty()) return "";
    const std::string error = open_store(keeper.db, opts.store, opts);
    keeper.open = error.empty();
    return error.empty() ? "" : "tavo: " + error + "\n";
}

bool wants_song(store_keeper &keeper, const options &opts, const std::string &path,
                file_state &file, std::string &message) {
    if (!keeper.open || keeper.failed) return true;
    if (read_file_state(path, file) != 0 || opts.redo) return true;
    known_as found = known_as::unknown;
    message = give_up(keeper, find_song(keeper.db, path, file, stop_fd(), found));
    if (found == known_as::unknown || (found == known_as::failed && opts.retry_failed)) return true;
    ++keeper.known;
    keeper.known_failed += found == known_as::failed ? 1 : 0;
    return false;
}

std::string keep_result(store_keeper &keeper, const std::string &path, const file_state &file,
                        const std::string &json) {
    if (!keeper.open || json.empty()) return "";
    song_row song = {path, file, nlohmann::json::parse(json)};
    if (path.size() > keeper.db.kind->longest_path) {
        return "tavo: " + shown(path) + ": the name is too long for the store.\n";
    }
    if (keeper.failed) {
        keeper.db.batch.push_back(std::move(song));  // for close_keeper
        return "";
    }
    return give_up(keeper, add_song(keeper.db, std::move(song), stop_fd()));
}

std::string keep_time(store_keeper &keeper) {
    if (keeper_timeout_ms(keeper) != 0) return "";
    return give_up(keeper, commit_batch(keeper.db, stop_fd()));
}

int keeper_timeout_ms(const store_keeper &keeper) {
    return keeper.open && !keeper.failed ? batch_timeout_ms(keeper.db) : -1;
}

bool next_stored(store_keeper &keeper, std::string &path, std::string &json, std::string &message) {
    if (keeper.page.empty()) {
        const std::string error = read_page(keeper.db, keeper.last_path, keeper.page);
        message = give_up(keeper, error);
        if (keeper.page.empty()) return false;
        keeper.last_path = keeper.page.back().path;
        std::reverse(keeper.page.begin(), keeper.page.end());
    }
    path = keeper.page.back().path;
    json = keeper.page.back().result.dump();
    keeper.page.pop_back();
    return true;
}

std::string close_keeper(store_keeper &keeper, const options &opts) {
    if (!keeper.open) return "";
    std::string lines;
    if (!keeper.failed) lines = give_up(keeper, commit_batch(keeper.db, stop_fd()));
    const size_t lost = keeper.db.batch.size();
    for (const song_row &song : keeper.db.batch) {
        const std::string line = song.result.dump() + "\n";
        write_all(STDOUT_FILENO, line.data(), line.size());
    }
    if ((!opts.quiet && !opts.from_store) || lost > 0) {
        lines += "tavo: " + std::to_string(keeper.db.stored) + " stored";
        if (keeper.known > 0) lines += ", " + std::to_string(keeper.known) + " known already";
        if (keeper.known_failed > 0) {
            lines += " (" + std::to_string(keeper.known_failed) + " failed; --retry-failed)";
        }
        if (lost > 0) {
            lines += "; " + count_text(lost, "result") +
                     " could not be stored and went to standard output";
        }
        lines += ".\n";
    }
    close_store(keeper.db);
    keeper.open = false;
    return lines;
}
