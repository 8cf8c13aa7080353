// Marker files for editors, one beside each song or in --output-dir.
//
// In: a record and the options. Out: the file's content, which worker_process.cpp writes.
#ifndef TAVO_CLI_WRITE_MARKERS_H
#define TAVO_CLI_WRITE_MARKERS_H

#include <string>
#include <vector>

#include "cli/options.h"
#include "cli/run/record.h"
#include "cli/write/frame_rate.h"

// The highlight with its start and end, or a beat, whose times are equal. Milliseconds, player's
// time.
struct mark {
    double start_ms;
    double end_ms;
    std::string name;
};

// Returns all marks of a song, the highlight first.
std::vector<mark> marks_of(const record &result);

// Returns the end of the highlight: its start plus --length, or plus the usual length of a preview.
double region_end_ms(const record &result);

struct marker_format {
    const char *word;    // of --format
    const char *suffix;  // of the file name, after the song's name
    bool drops_ending;   // the extension of the song's name is removed first
    bool counts_frames;  // --fps applies
    std::string (*content)(const record &result, const frame_rate &rate);
};

// Ordered as in the help.
const std::vector<marker_format> &marker_formats();

// Returns null for any other word.
const marker_format *find_marker_format(const std::string &word);

// Path of the marker file of an input. A name too long for a file system is shortened and numbered.
std::string marker_path(const std::string &input, const options &opts);

// Returns the whole content of the file.
std::string marker_content(const record &result, const options &opts);

// The writers.
std::string audacity_labels(const record &result, const frame_rate &rate);
std::string kdenlive_guides(const record &result, const frame_rate &rate);
std::string losslesscut_project(const record &result, const frame_rate &rate);
std::string ffmetadata_chapters(const record &result, const frame_rate &rate);
std::string edl_markers(const record &result, const frame_rate &rate);
std::string fcpxml_markers(const record &result, const frame_rate &rate);
std::string otio_timeline(const record &result, const frame_rate &rate);
std::string reaper_markers(const record &result, const frame_rate &rate);

#endif
