// The result of one file. In: an analysis (analyse.h). Out: text, JSON, CSV and markers (format.h,
// markers.h).
#ifndef TAVO_CLI_RUN_RECORD_H
#define TAVO_CLI_RUN_RECORD_H

#include <cstdint>
#include <string>
#include <vector>

enum class outcome {
    ok,
    failed,   // error has the reason
    stopped,  // stopped by the user before the end
};

struct record {
    std::string file;  // name from the user or the folder, any bytes
    int32_t mode = 0;  // TAVO_MODE_*
    outcome status = outcome::failed;
    std::string error;  // a sentence, or empty

    bool has_stream = false;  // the next three fields are known
    int32_t sample_rate = 0;  // Hz
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
    std::vector<float> beats_ms;  // ascending, from the start of the file

    std::string decoder;     // "ffmpeg" if that program decoded the file, otherwise empty
    std::string sound_path;  // file with its output, while the song is open

    int64_t cpu_ms = -1;  // processor time of all threads; -1 if not analysed

    std::string written;  // path of the written marker file, or empty
};

record failed_record(const std::string &file, int32_t mode, const std::string &error);

// Converts a time of the record to the time of a player, at least 0.
double player_ms(const record &result, double ms);

// End of a highlight of length_s seconds, at most the end of the song.
double highlight_end_ms(const record &result, int32_t length_s);

// has_refinement: the result shows whether the start of the highlight is exact to 0.4 s. In mode
// both it does not, because a seek has moved the start. is_refined: the start is exact; otherwise
// it is a point of the loudness curve.
bool has_refinement(const record &result);
bool is_refined(const record &result);

#endif
