// Parses the command line once.
//
// Input: argc and argv. Output: options, which every part of the command reads.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "cli/input/shard.h"
#include "include/tavo.h"

enum class result_format {
    text,
    json,
    csv,
    markers,  // one file per input, in the format options.markers
    // The next two are not values of --format.
    print,  // --print
    none,   // no output, because the store has the results
};

struct marker_format;  // write/markers.h

struct options {
    int32_t mode = TAVO_MODE_BOTH;
    int32_t length_s = 0;       // requested length of the highlight, or 0
    int32_t max_beats = 0;      // 0 means no limit
    int32_t max_minutes = 600;  // longer audio is refused
    result_format format = result_format::text;
    const marker_format *markers = nullptr;  // set if `format` is markers
    std::string print;                       // template of --print
    std::string click;                       // path of the click track, or empty
    std::string clip;                        // file or folder of the clips, or empty
    double fade_s = 0.0;                     // fade at each end of a clip
    std::string report;                      // path of the page, or empty
    bool embed = false;                      // the page contains the sound
    std::string output_dir;                  // folder of marker files; if empty, beside each input
    std::string fps = "30";                  // for formats that count frames, see markers.h
    bool force = false;
    bool skip_existing = false;
    bool quiet = false;
    std::string store;        // URL of the database, or empty
    bool from_store = false;  // writes the stored results and analyses nothing
    bool failed = false;      // with from_store: writes the failures, not the results
    bool retry_failed = false;
    bool redo = false;
    int32_t patience_s = 60;  // time to retry a database that does not respond
    shard share;
    bool recursive = false;
    int32_t jobs = 1;
    int32_t timeout_s = 0;            // limit for the analysis of one file, or 0
    bool normalize = false;           // refine coarse highlights in the amplified song
    std::string ffmpeg;               // path of the program, or empty
    char list_separator = '\n';       // ends each name in a list
    std::vector<std::string> lists;   // lists of files; "-" is standard input
    std::vector<std::string> inputs;  // in order; "-" is a list on standard input
};

constexpr int kExitOk = 0;
constexpr int kExitFailed = 1;  // a file failed
constexpr int kExitUsage = 2;
constexpr int kExitSignal = 128;  // the number of the signal is added

// Returns an exit status after printing the help, the version or a usage error; otherwise nothing.
std::optional<int> parse_options(int argc, char **argv, options &out);

// True if the only input is a file, not a folder or a list.
bool takes_one_file(const options &opts);
