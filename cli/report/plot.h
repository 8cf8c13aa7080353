// The picture of one file's result: --plot.
//
// In: a record (record.h) and the file it is about. Out: an SVG file, written atomically.
// draw_plot: after analyse.h, in the worker. gather_plot reads the sound, plot_svg draws.
#ifndef TAVO_CLI_REPORT_PLOT_H
#define TAVO_CLI_REPORT_PLOT_H

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "cli/options.h"
#include "cli/run/record.h"

constexpr int kPlotColumns = 1000;  // pixels of the time axis

constexpr double kPointMs = 2000.0;   // from one loudness value to the next
constexpr double kWindowMs = 6000.0;  // that a loudness value is about

// The least and the greatest sample of a stretch.
struct extent {
    int16_t low = 0;
    int16_t high = 0;
};

struct plot_data {
    double length_ms = 0.0;        // of the time axis: what was read, and the results
    double read_ms = 0.0;          // of sound
    std::vector<extent> waveform;  // one per column from the start; fewer than kPlotColumns when
                                   // the axis goes on after the sound
    std::vector<float> loudness;   // value k: over the 6 s that start at 2 k s; none below 6 s
    double mean = 0.0;             // of loudness
    int32_t peak = 0;              // greatest magnitude of a sample, 0 to 32768
};

// Checks that the picture can be written and would not replace the input. Creates nothing. Returns
// an empty string or a sentence.
std::string check_plot(const std::string &target, const std::string &input, bool force);

// Draws what was found into opts.plot. A failure or a stop is entered into the record.
void draw_plot(record &result, const options &opts, int stop_fd);

// Reads the sound of result.file once, from its start. Memory does not grow with the sound, but for
// the loudness: 4 bytes each 2 s. Where reading fails it ends. columns: of the waveform. stop_fd as
// for analyse.
outcome gather_plot(const record &result, int columns, int stop_fd, plot_data &out,
                    std::string &error);

// Where a rise counts as the entry of a highlight, milliseconds from first to second. The last
// window that is looked at may hold a rise at its very end. Needs a loudness curve.
std::pair<double, double> searched_span(const record &result, const plot_data &data);

// The whole SVG document, UTF-8.
std::string plot_svg(const record &result, const plot_data &data);

#endif
