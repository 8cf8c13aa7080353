// What the page of a song draws besides the result: waveform and loudness.
//
// In: a record (record.h) and the file that it describes. Out: a song_view. After: report.h.
#ifndef TAVO_CLI_REPORT_SONG_VIEW_H
#define TAVO_CLI_REPORT_SONG_VIEW_H

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "cli/run/record.h"

// The lowest and the highest sample of a span.
struct extent {
    int16_t low = 0;
    int16_t high = 0;
};

struct song_view {
    double length_ms = 0.0;        // length of the time axis: covers the samples and the result
    double read_ms = 0.0;          // length of the samples that could be read
    std::vector<extent> waveform;  // one entry a column, from the start; fewer than the columns
                                   // if the axis goes on after the last sample
    std::vector<float> loudness;   // entry k covers 6 s from 2 k s on; empty below 6 s
    double mean = 0.0;             // of loudness
    int32_t peak = 0;              // greatest magnitude of a sample, 0 to 32768
};

// Reads result.file once, from its start, and keeps only the columns and 4 bytes per 2 s. A read
// error ends the waveform there. columns: of the whole time axis. stop_fd: as for analyse.
// Returns ok; failed or stopped with a sentence in error.
outcome read_song_view(const record &result, int columns, int stop_fd, song_view &view,
                       std::string &error);

// The span in which an entry can be found as the highlight, start and end in ms. Needs a loudness
// curve.
std::pair<double, double> searched_span(const record &result, const song_view &view);

#endif
