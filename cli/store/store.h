// Results in a database: --store.
//
// In: results as JSON (format.h), in the command's own process. Out: one row per song and
// parameters, in batches of one transaction each: a kill at any moment loses at most the open batch
// and leaves no row half written. Called by workers.h. Several commands may share one store.
#ifndef TAVO_CLI_STORE_STORE_H
#define TAVO_CLI_STORE_STORE_H

#include <chrono>
#include <cstdint>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "cli/options.h"
#include "cli/store/database.h"

// What tells whether a file is the one that was analysed.
struct file_state {
    int64_t size = 0;      // bytes
    int64_t mtime_ns = 0;  // last change, since 1970
};

// Returns 0 or errno.
int read_file_state(const std::string &path, file_state &state);

struct song_row {
    std::string path;  // as it was named, any bytes
    file_state file;
    nlohmann::json result;  // the object of --format json
};

struct store {
    const database_kind *kind = nullptr;
    std::string where;
    void *handle = nullptr;  // null while the database is away
    int32_t mode = 0;        // the parameters of every row written and looked up
    int32_t length_s = 0;
    int32_t max_beats = 0;
    int32_t patience_s = 0;       // how long a database that is away is asked again
    std::vector<song_row> batch;  // not committed yet
    std::chrono::steady_clock::time_point batch_since;
    int64_t stored = 0;  // rows committed
};

enum class known_as { unknown, ok, failed };

// These return an empty string or a sentence. Those that write try again, waiting longer each time,
// for patience_s; each wait is announced on standard error and ends when stop_fd becomes readable.

// Connects and makes the table if it is missing. Does not try again.
std::string open_store(store &to, const std::string &url, const options &opts);

// Whether the file is stored for these parameters as it is now.
std::string find_song(store &in, const std::string &path, const file_state &file, int stop_fd,
                      known_as &found);

// Adds a row to the batch, which is committed when it is full or old.
std::string add_song(store &to, song_row &&song, int stop_fd);
std::string commit_batch(store &to, int stop_fd);

// Milliseconds until the batch is old; -1 without one. For poll.
int batch_timeout_ms(const store &of);

// The next rows with these parameters and a result, in the order of the paths, after the given one.
std::string read_page(store &from, const std::string &after, std::vector<song_row> &page);

void close_store(store &which);  // the open batch is dropped; harmless when called twice

#endif
