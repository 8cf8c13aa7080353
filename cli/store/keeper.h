// The store's part in a run: which songs it knows already, and the results of the others.
//
// In: options, inputs, replies. Out: rows (store.h), a summary. Called by workers.cpp; nothing is
// done where opts names no store.
#ifndef TAVO_CLI_STORE_KEEPER_H
#define TAVO_CLI_STORE_KEEPER_H

#include <string>
#include <vector>

#include "cli/options.h"
#include "cli/store/store.h"

struct store_keeper {
    store db;
    bool open = false;
    bool failed = false;  // the store was given up; the run ends
    int64_t known = 0;    // songs left out because they are stored
    int64_t known_failed = 0;
    std::vector<song_row> page;  // with --from-store: rows to hand out, the last first
    std::string last_path;       // of the page
};

// These return an empty string or lines for standard error.

std::string open_keeper(store_keeper &keeper, const options &opts);

// Whether a song is to be analysed: false when it is stored as it is now.
bool wants_song(store_keeper &keeper, const options &opts, const std::string &path,
                file_state &file, std::string &message);

// Takes a result, as JSON; a file's state is that from before the analysis.
std::string keep_result(store_keeper &keeper, const std::string &path, const file_state &file,
                        const std::string &json);

// Writes the open batch when it is old.
std::string keep_time(store_keeper &keeper);
int keeper_timeout_ms(const store_keeper &keeper);  // for poll; -1 for never

// With --from-store: the next stored song that succeeded. False at the end or, with a message,
// after a failure.
bool next_stored(store_keeper &keeper, std::string &path, std::string &json, std::string &message);

// Writes what is left and sums up. Results that could not be stored go to standard output as JSON.
std::string close_keeper(store_keeper &keeper, const options &opts);

#endif
