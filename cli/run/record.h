// The result of one file. In: an analysis (analyse.h). Out: text, JSON, CSV and markers (format.h,
// markers.h).
#ifndef TAVO_CLI_RUN_RECORD_H
#define TAVO_CLI_RUN_RECORD_H

#include <cstdint>
#include <string>
#include <vector>

enum class outcome {
    ok,
    failed,   // error says why
    stopped,  // the user stopped the analysis before its end
};

struct record {
    std::string file;  // the name as the user or the folder gives it, any bytes
    int32_t mode = 0;  // TAVO_MODE_*
    outcome status = outcome::failed;
    std::string error;  // a sentence; empty when ok

    bool has_stream = false;  // the next three fields are known
    int32_t sample_rate = 0;  // Hz
    int32_t channels = 0;     // of the decoder's output
    int64_t duration_ms = 0;
    double offset_ms = 0.0;  // that times here are later than in a player, player_offset.h

    bool has_highlight = false;
    int32_t hl_pos_ms = 0;
    int32_t length_s = 0;  // requested length of the highlight, 0 for none
    double loudest = 0.0;  // mean square of the loudest 6 s, full scale 1
    bool raised = false;   // the highlight is that of the song raised in level, --normalize

    bool has_beats = false;
    int32_t bpm = 0;
    std::vector<float> beats_ms;  // ascending, from the start of the file

    std::string decoder;     // "ffmpeg" if that program decoded the file, else empty
    std::string sound_path;  // what it decoded, while the song is open

    int64_t cpu_ms = -1;  // processor time, all threads; -1 without an analysis

    std::string written;  // the marker file, once it is written
};

record failed_record(const std::string &file, int32_t mode, const std::string &error);

// A time of the record as players count it; not before the song's start.
double player_ms(const record &result, double ms);

// End of a highlight of length_s seconds, at most the end of the song.
double highlight_end_ms(const record &result, int32_t length_s);

// has_refinement: the result shows whether the start of the highlight is exact to 0.4 s, which it
// does not in mode both, where a seek has moved the start. is_refined: the start is exact; if not,
// it is a point of the loudness curve.
bool has_refinement(const record &result);
bool is_refined(const record &result);

#endif
