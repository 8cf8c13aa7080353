// Makes synthetic songs whose loud section, tempo and drum hits are known, and WAV files of them.
// The same plan always gives the same samples.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace support {

// A song of chords (the bed) and drum hits. It is quiet until loud_at, then loud until tail_at,
// then quiet again. The first hit is at half a second, and one follows on each beat.
struct song_spec {
    int32_t rate = 44100;  // Hz
    int32_t channels = 2;  // the first one is the loudest
    double seconds = 60.0;
    double bpm = 120.0;
    uint32_t seed = 1;         // varies the strength of the hits, the noise and the bed
    double loud_at = 20.0;     // seconds; if 0 or less, there is no quiet opening
    double tail_at = 50.0;     // seconds; if past the end, there is no quiet tail
    double drum_level = 0.30;  // in the loud section, relative to full scale
    double bed_level = 0.40;   // in the loud section, relative to full scale
};

struct song {
    song_spec plan;
    std::vector<int16_t> pcm;  // [frames * channels] interleaved
    std::vector<double> hits;  // seconds
};

song make_song(const song_spec &plan);

// Returns a WAV file of interleaved 16-bit samples. Its header has 44 bytes.
std::string wav_bytes(const std::vector<int16_t> &pcm, int32_t rate, int32_t channels);

// Returns false, with errno set, if the file cannot be written completely.
bool write_wav(const std::string &path, const song &source);

}  // namespace support
