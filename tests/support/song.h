// Synthetic songs whose loud section, tempo and drum hits are known, and the WAV files that carry
// them. The same description always gives the same samples.
#ifndef TAVO_TESTS_SUPPORT_SONG_H
#define TAVO_TESTS_SUPPORT_SONG_H

#include <cstdint>
#include <string>
#include <vector>

namespace support {

// A quiet opening, a loud section from loud_at on, a quiet tail from tail_at on. Hits fall at half
// a second and every beat from there on.
struct song_spec {
    int32_t rate = 44100;  // Hz
    int32_t channels = 2;  // the first is louder; each has a noise floor of its own
    double seconds = 60.0;
    double bpm = 120.0;
    uint32_t seed = 1;         // varies the hits' strengths (no two alike), the noise and the bed
    double loud_at = 20.0;     // seconds; 0 or less: loud from the start
    double tail_at = 50.0;     // seconds; at or past the end: no tail
    double drum_level = 0.30;  // of full scale, before the gain
    double bed_level = 0.40;   // of full scale, before the gain; 0 for drums alone
};

struct song {
    song_spec plan;
    std::vector<int16_t> pcm;  // [frames * channels] interleaved
    std::vector<double> hits;  // seconds
};

song make_song(const song_spec &plan);

// A whole file of interleaved 16-bit samples, its header the canonical 44 bytes.
std::string wav_bytes(const std::vector<int16_t> &pcm, int32_t rate, int32_t channels);

// False, with errno set, when the file cannot be written whole.
bool write_wav(const std::string &path, const song &what);

}  // namespace support

#endif
