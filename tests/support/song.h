// Synthetic songs with a known loud section, tempo and drum hits, and WAV files of them. The same
// plan always gives the same samples.
#ifndef TAVO_TESTS_SUPPORT_SONG_H
#define TAVO_TESTS_SUPPORT_SONG_H

#include <cstdint>
#include <string>
#include <vector>

namespace support {

// A song with a quiet opening, a loud section that starts at loud_at and a quiet tail that starts
// at tail_at. The first hit is at half a second, then one follows per beat.
struct song_spec {
    int32_t rate = 44100;  // Hz
    int32_t channels = 2;  // the first is the loudest; each has its own noise floor
    double seconds = 60.0;
    double bpm = 120.0;
    uint32_t seed = 1;  // varies the strength of the hits (all different), the noise and the bed
    double loud_at = 20.0;     // seconds; 0 or less: loud from the start
    double tail_at = 50.0;     // seconds; no tail if it is past the end
    double drum_level = 0.30;  // relative to full scale, before the gain
    double bed_level = 0.40;   // relative to full scale, before the gain; 0 for drums only
};

struct song {
    song_spec plan;
    std::vector<int16_t> pcm;  // [frames * channels] interleaved
    std::vector<double> hits;  // seconds
};

song make_song(const song_spec &plan);

// A whole WAV file of interleaved 16-bit samples, with a 44-byte header.
std::string wav_bytes(const std::vector<int16_t> &pcm, int32_t rate, int32_t channels);

// Returns false, with errno set, if the file cannot be written completely.
bool write_wav(const std::string &path, const song &source);

}  // namespace support

#endif
