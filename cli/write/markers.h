// Marker files: what an editor imports, one file beside each song or in --output-dir.
//
// In: a record and the options. Out: the file's content, for worker_process.cpp to write.
#ifndef TAVO_CLI_WRITE_MARKERS_H
#define TAVO_CLI_WRITE_MARKERS_H

#include <string>
#include <vector>

#include "cli/options.h"
#include "cli/run/record.h"
#include "cli/write/frame_rate.h"

// The highlight, from its start to its end, or a beat, whose times are equal. Milliseconds as
// players count them.
struct mark {
    double start_ms;
    double end_ms;
    std::string name;
};

// All marks of a song, the highlight first.
std::vector<mark> marks_of(const record &result);

// The end of the highlight's region: after --length, or after what a preview usually lasts.
double region_end_ms(const record &result);

struct marker_format {
    const char *word;    // of --format
    const char *suffix;  // of the file's name, after the song's
    bool drops_ending;   // the song's name loses its ending first
    bool counts_frames;  // --fps applies
    std::string (*content)(const record &result, const frame_rate &rate);
};

// In the order of the help.
const std::vector<marker_format> &marker_formats();

// Returns null for another word.
const marker_format *find_marker_format(const std::string &word);

// The marker file of an input. A name too long for a file system is cut and numbered.
std::string marker_path(const std::string &input, const options &opts);

// The file's whole content.
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
