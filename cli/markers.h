// Marker files: what an editor imports, one file beside each song or in --output-dir.
//
// In: a record and the options. Out: the file's content, for worker.cpp to write. One writer a
// format, in a file of its own (markers_*.cpp).
#ifndef TAVO_CLI_MARKERS_H
#define TAVO_CLI_MARKERS_H

#include <string>

#include "cli/options.h"
#include "cli/record.h"

// Whether the format writes a file for each input.
bool writes_files(result_format format);

// The file for an input. A name that would get too long for a file system ends in a number made
// from the whole name instead.
std::string marker_path(const std::string &input, const options &opts);

// The file's whole content.
std::string marker_content(const record &result, const options &opts);

// Where the highlight's region ends: after --length, or after what a preview usually lasts.
double region_end_ms(const record &result);

// One writer for each format.
std::string label_track(const record &result, const options &opts);

#endif
