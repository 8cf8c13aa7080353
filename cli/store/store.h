// Results in a database: --store. Several commands may share one store. Without --store these
// functions do nothing.
//
// Input: results as JSON (write/format.h). Output: one row for each song and set of parameters. A
// batch of rows is one transaction, so a command that is killed loses at most the open batch and
// leaves no row half-written. Used by main.cpp, in the command's own process.
#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <string>
#include <vector>

#include "cli/failure.h"
#include "cli/input/inputs.h"
#include "cli/options.h"
#include "cli/store/database.h"

struct store {
    options opts;
    const database_kind *kind = nullptr;  // null without --store
    std::string location;
    connection run;            // null while disconnected
    int version = 0;           // of the table
    bool is_open = false;      // the table was found or created
    bool has_failed = false;   // the store is no longer used, and the command ends
    std::vector<input> batch;  // not committed yet
    std::chrono::steady_clock::time_point batch_since;
    std::deque<input> page;    // with --from-store: rows read but not yet returned
    std::string last_path;     // of the row returned last
    int64_t stored = 0;        // rows committed
    int64_t known = 0;         // songs skipped because they are stored
    int64_t known_failed = 0;  // of these, songs stored as failed
};

// If the database does not answer, these functions retry with growing pauses, for at most
// --patience. Each pause is reported on standard error, and a stop ends it early. After a failure
// the store is no longer used.

// Connects, without a retry. Unless the store is only read, creates or upgrades the table.
failure open_store(store &db, const options &opts);

// Sets is_new if the song must be analysed, because its current file is not stored for these
// parameters or the options request another analysis. Sets the song's file state.
failure find_song(store &db, input &song, bool &is_new);

// Adds a song with its result to the batch and commits the batch if it is full or old. After a
// failure of the store, results stay in the batch until close_store.
failure add_song(store &db, input &&song);

// Commits the batch if it is old.
failure commit_old_batch(store &db);

// With --from-store: reads the next row for the command's parameters, in the order of the paths.
// found is false after the last row.
failure read_next(store &db, input &song, bool &found);

// Commits the last batch. Results that could not be stored are written to standard output as JSON.
// summary receives one line for the user.
failure close_store(store &db, std::string &summary);
