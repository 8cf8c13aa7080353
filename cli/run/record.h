// What the command knows about one file after its analysis. Filled by analyse.h, written out by the
// formats (format.h, markers.h).
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
    std::string file;  // as the user or the folder names it, any bytes
    int32_t mode = 0;  // TAVO_MODE_*
    outcome status = outcome::failed;
    std::string error;  // a sentence; empty when ok

    bool has_stream = false;  // the stream's format is known
    int32_t sample_rate = 0;  // Hz
    int32_t channels = 0;     // of the decoder's output
    int64_t duration_ms = 0;
    double offset_ms = 0.0;  // that times here are later than in a player, player_offset.h

    bool has_highlight = false;
    int32_t hl_pos_ms = 0;
    int32_t length_s = 0;  // highlight length asked for, 0 for none

    bool has_beats = false;
    int32_t bpm = 0;
    std::vector<float> beats_ms;  // ascending, from the start of the file

    std::string decoder;     // "ffmpeg" if that program decoded the file, else empty
    std::string sound_path;  // what it decoded, while the song is open

    int64_t cpu_ms = -1;  // processor time of the analysis, all threads; -1 without one

    std::string written;  // the file that holds the result, where the format makes one
};

record failed_record(const std::string &file, int32_t mode, const std::string &error);

// A time of the record as players count it; not before the song's start.
double player_ms(const record &result, double ms);

// Where a highlight of length_s seconds ends: at the end of the song at the latest.
double highlight_end_ms(const record &result, int32_t length_s);

// Whether the highlight's start is exact to 0.4 s. If not it is a point of the coarse curve.
// In mode both this is not known: a seek has moved the start.
bool has_refinement(const record &result);
bool is_refined(const record &result);

#endif
