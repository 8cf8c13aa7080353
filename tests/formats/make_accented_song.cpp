// make_accented_song OUT.wav: a song of 80 s at 120 BPM, loud from 31 s on, every fourth hit of
// which is far stronger than the others.
//
// The beats are the strongest hits: among equals, the smallest change in the signal, or where it
// stands between the frames of the analysis, chooses others. Here there is nothing to choose.
#include <algorithm>
#include <cstdio>

#include "tests/support/song.h"

int main(int argc, char **argv) {
    if (argc != 2) return 2;
    support::song_spec plan;
    plan.seconds = 80.0;  // a quarter of it and its highlight are whole seconds: a WAV file's seeks
    plan.loud_at = 31.0;
    plan.tail_at = 66.0;
    plan.seed = 2;
    plan.drum_level = 0.08;
    plan.bed_level = 0.37;
    support::song song = support::make_song(plan);

    plan.bpm /= 4.0;
    plan.seed = 9;
    plan.drum_level = 0.6;
    plan.bed_level = 0.0;
    const support::song accents = support::make_song(plan);
    for (size_t i = 0; i < song.pcm.size(); ++i) {
        song.pcm[i] = static_cast<int16_t>(std::clamp(song.pcm[i] + accents.pcm[i], -32768, 32767));
    }
    if (!support::write_wav(argv[1], song)) {
        perror(argv[1]);
        return 1;
    }
    return 0;
}
