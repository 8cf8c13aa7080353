// Marker files for editors, one beside each song or in --output-dir.
//
// Input: a record (run/record.h) and the options. Output: the content of the file, which
// run/reply.h writes. Follows run/analyse.h.
#pragma once

#include <map>
#include <string>

#include "cli/options.h"
#include "cli/run/record.h"

// A video frame rate and its timecode format.
struct frame_rate {
    int32_t frames;  // the rate is frames / seconds
    int32_t seconds;
    int32_t base;  // frame numbers per second of timecode
    bool drop;     // the timecode skips frame numbers to match the clock
};

// The rates of --fps by name.
extern const std::map<std::string, frame_rate> kFrameRates;

struct marker_format {
    const char *suffix;  // of the file name, after the song's name
    bool drops_ending;   // the extension of the song's name is removed first
    bool counts_frames;  // --fps applies
    std::string (*content)(const record &result, const frame_rate &rate);
};

// The formats by their word in --format.
extern const std::map<std::string, marker_format> kMarkerFormats;

// Returns the path of an input's marker file. A name that is too long for a file system is cut, and
// a hash is added.
std::string marker_path(const std::string &input, const options &opts);

// Returns the whole content of the file.
std::string marker_content(const record &result, const options &opts);

// Returns the end of the highlight. Without --length, a highlight is as long as a usual preview.
double region_end_ms(const record &result);
