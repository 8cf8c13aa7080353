// Marker files for editors, one beside each song or in --output-dir.
//
// Input: a record (run/record.h) and the options. Output: the content of the file, which
// run/reply.h writes. Follows run/analyse.h.
#pragma once

#include <string>
#include <vector>

#include "cli/options.h"
#include "cli/run/record.h"

struct frame_rate;  // of video

struct marker_format {
    const char *word;    // of --format
    const char *suffix;  // of the file name, after the song's name
    bool drops_ending;   // the extension of the song's name is removed first
    bool counts_frames;  // --fps applies
    std::string (*content)(const record &result, const frame_rate &rate);
};

// Returns all formats in the order of --help.
const std::vector<marker_format> &marker_formats();

// Returns the format with this word, or null.
const marker_format *find_marker_format(const std::string &word);

// Returns the names of the --fps rates, in order.
std::vector<std::string> frame_rate_names();

// Returns the path of an input's marker file. A name that is too long for a file system is cut, and
// a hash is added.
std::string marker_path(const std::string &input, const options &opts);

// Returns the whole content of the file.
std::string marker_content(const record &result, const options &opts);

// Returns the end of the highlight. Without --length, a highlight is as long as a usual preview.
double region_end_ms(const record &result);
