// The command line, read once. In: argc, argv. Out: options. Before: inputs.h, analyse_inputs.h.
#ifndef TAVO_CLI_OPTIONS_H
#define TAVO_CLI_OPTIONS_H

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
    markers,  // a file for each input, of the kind options.markers
    // without a word for --format
    print,  // --print
    none,   // nothing: the store has the results
};

struct marker_format;  // write/markers.h

struct options {
    int32_t mode = TAVO_MODE_BOTH;
    int32_t length_s = 0;       // 0 for none
    int32_t max_beats = 0;      // 0 for no limit
    int32_t max_minutes = 600;  // longer audio is refused
    result_format format = result_format::text;
    const marker_format *markers = nullptr;  // of the format markers
    std::string print;                       // template of the format print
    std::string click;                       // where the click track goes, empty for none
    std::string clip;                        // where clips go, a file or a folder; empty for none
    double fade_s = 0.0;                     // of a clip, at either end
    std::string report;                      // where the page goes, empty for none
    bool embed = false;                      // the sound goes into the page
    std::string output_dir;                  // of marker files; empty: beside each input
    std::string fps = "30";                  // of the formats that count in frames, frame_rate.h
    bool force = false;
    bool skip_existing = false;
    bool quiet = false;
    std::string store;        // URL of the database, empty for none
    bool from_store = false;  // its results are written out, nothing is analysed
    bool failed = false;      // with from_store: failures instead of results
    bool retry_failed = false;
    bool redo = false;
    int32_t patience_s = 60;  // how long a database that is away is asked again
    shard share;
    bool recursive = false;
    int32_t jobs = 1;
    int32_t timeout_s = 0;            // of one file's analysis, 0 for none
    bool normalize = false;           // coarse highlights are refined in the raised song
    std::string ffmpeg;               // path of the program, empty to do without
    char list_separator = '\n';       // of the lists that name files
    std::vector<std::string> lists;   // files that name files, "-" for standard input
    std::vector<std::string> inputs;  // in the order given; "-" is a list on standard input
};

constexpr int kExitOk = 0;
constexpr int kExitFailed = 1;  // a file failed
constexpr int kExitUsage = 2;
constexpr int kExitSignal = 128;  // plus the number of the signal that stopped the command

// Returns the exit status when the command is done already (help, version, wrong usage).
std::optional<int> parse_options(int argc, char **argv, options &out);

// True if the one input is a file, neither a folder nor a list.
bool takes_one_file(const options &opts);

#endif
