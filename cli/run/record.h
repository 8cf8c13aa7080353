// The result of one file. Follows analyse.h; precedes write/format.h, write/markers.h and
// report/report.h, which write it.
#pragma once

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "include/tavo.h"

enum class outcome {
    ok,
    failed,   // error has the reason
    stopped,  // stopped by the user before the end
};

struct record {
    std::string file = {};  // name from the options, a list or a folder; any bytes
    int32_t mode = 0;       // TAVO_MODE_*
    outcome status = outcome::failed;
    std::string error = {};  // reason of a failure, or empty

    int32_t sample_rate = 0;  // Hz; 0 if the stream is not known
    int32_t channels = 0;     // of the decoder's output
    int64_t duration_ms = 0;
    double offset_ms = 0.0;  // time in this record minus time in a player, see player_offset.h

    bool has_highlight = false;
    int32_t hl_pos_ms = 0;
    int32_t length_s = 0;  // requested length of the highlight, or 0
    double loudest = 0.0;  // mean square of the loudest 6 s, full scale 1
    bool raised = false;   // the highlight was found in the amplified song (--normalize)

    bool has_beats = false;
    int32_t bpm = 0;
    std::vector<float> beats_ms = {};  // ascending, from the start of the file

    std::string decoder = {};     // "ffmpeg" if that program decoded the file, otherwise empty
    std::string sound_path = {};  // path for the library, while the song is open

    int64_t cpu_ms = -1;  // processor time of all threads; -1 if not analysed

    std::string written = {};  // path of the written marker file, or empty
};

// Converts a time in the record to a player's time, at least 0.
inline double player_ms(const record &result, double ms) {
    return std::max(ms - result.offset_ms, 0.0);
}

// Returns the end of a highlight of length_s seconds, or the end of the song if that is earlier.
inline double highlight_end_ms(const record &result, int32_t length_s) {
    const double start = result.hl_pos_ms;
    const double end = std::min(start + 1000.0 * length_s, static_cast<double>(result.duration_ms));
    return std::max(start, end);
}

// True if the result shows whether the start of the highlight is accurate to 0.4 s. In mode both,
// it does not, because a seek has moved the start.
inline bool has_refinement(const record &result) {
    return result.has_highlight && result.mode == TAVO_MODE_HIGHLIGHT;
}

// True if the start of the highlight is exact. Otherwise it is on the loudness curve's 2 s grid.
inline bool is_refined(const record &result) {
    return result.hl_pos_ms % TAVO_LOUDNESS_HOP_MS != 0;
}
