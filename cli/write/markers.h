// Marker files: what an editor imports, one file beside each song or in --output-dir.
//
// In: a record and the options. Out: the file's content, for worker_process.cpp to write.
#ifndef TAVO_CLI_WRITE_MARKERS_H
#define TAVO_CLI_WRITE_MARKERS_H

#include <string>
#include <vector>

#include "cli/options.h"
#include "cli/run/record.h"

// The highlight, from its start to its end, or a beat, whose times are equal. Milliseconds as
// players count them.
struct mark {
    double start_ms;
    double end_ms;
    std::string name;
};

// Where the highlight's region ends: after --length, or after what a preview usually lasts.
double region_end_ms(const record &result);

// All marks of a song, the highlight first.
std::vector<mark> marks_of(const record &result);

// True if the format writes a file for each input.
bool writes_files(result_format format);

// The marker file of an input. A name too long for a file system is cut and numbered.
std::string marker_path(const std::string &input, const options &opts);

// The file's whole content.
std::string marker_content(const record &result, const options &opts);

// The writers.
std::string audacity_labels(const record &result, const options &opts);
std::string kdenlive_guides(const record &result, const options &opts);
std::string losslesscut_project(const record &result, const options &opts);
std::string reaper_markers(const record &result, const options &opts);
std::string ffmetadata_chapters(const record &result, const options &opts);
std::string edl_markers(const record &result, const options &opts);
std::string fcpxml_markers(const record &result, const options &opts);
std::string otio_timeline(const record &result, const options &opts);

#endif
