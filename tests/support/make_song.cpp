// make_song OUT.wav [--seconds S] [--bpm B] [--rate HZ] [--channels N] [--seed N] [--loud-at S]
//           [--level L] [--accents]
// Writes a synthetic song and prints where its loud section starts. --level: 1 unless given, 0.25
// is 12 dB softer. --accents: every fourth hit is far stronger than the others, so that no small
// change of the signal chooses other beats.
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>

#include "tests/support/song.h"

namespace {

constexpr const char *kUsage =
    "usage: make_song OUT.wav [--seconds S] [--bpm B] [--rate HZ] [--channels N] [--seed N]\n"
    "                 [--loud-at S] [--level L] [--accents]\n";

bool usable(const support::song_spec &plan) {
    return plan.seconds > 0.0 && plan.seconds <= 7200.0 && plan.bpm >= 1.0 && plan.rate >= 1000 &&
           plan.rate <= 192000 && plan.channels >= 1 && plan.channels <= 8;
}

support::song accented(support::song_spec plan) {
    plan.drum_level = 0.08;
    plan.bed_level = 0.37;
    support::song song = support::make_song(plan);
    plan.bpm /= 4.0;
    plan.seed += 7;
    plan.drum_level = 0.6;
    plan.bed_level = 0.0;
    const support::song accents = support::make_song(plan);
    for (size_t i = 0; i < song.pcm.size(); ++i) {
        song.pcm[i] = static_cast<int16_t>(std::clamp(song.pcm[i] + accents.pcm[i], -32768, 32767));
    }
    return song;
}

}  // namespace

int main(int argc, char **argv) {
    support::song_spec plan;
    std::map<std::string, double> options = {{"--seconds", plan.seconds},
                                             {"--bpm", plan.bpm},
                                             {"--rate", plan.rate},
                                             {"--channels", plan.channels},
                                             {"--seed", plan.seed},
                                             {"--loud-at", NAN},
                                             {"--level", 1.0}};
    const char *path = nullptr;
    bool good = true;
    bool accents = false;
    for (int i = 1; i < argc; ++i) {
        const auto option = options.find(argv[i]);
        if (option != options.end() && i + 1 < argc) {
            char *end = nullptr;
            option->second = strtod(argv[++i], &end);
            good = good && end != argv[i] && *end == '\0';
        } else if (strcmp(argv[i], "--accents") == 0) {
            accents = true;
        } else {
            good = good && path == nullptr && argv[i][0] != '-';
            path = argv[i];
        }
    }
    plan.seconds = options.at("--seconds");
    plan.bpm = options.at("--bpm");
    plan.rate = static_cast<int32_t>(options.at("--rate"));
    plan.channels = static_cast<int32_t>(options.at("--channels"));
    plan.seed = static_cast<uint32_t>(options.at("--seed"));
    plan.loud_at =
        std::isnan(options.at("--loud-at")) ? plan.seconds / 3.0 : options.at("--loud-at");
    plan.tail_at = plan.seconds * 5.0 / 6.0;
    plan.drum_level *= options.at("--level");
    plan.bed_level *= options.at("--level");
    if (!good || path == nullptr || !usable(plan)) {
        fputs(kUsage, stderr);
        return 2;
    }

    const support::song song = accents ? accented(plan) : support::make_song(plan);
    if (!support::write_wav(path, song)) {
        perror(path);
        return 1;
    }
    printf("%s: %.1f s, %d Hz, %d channels, %.1f BPM, loud from %.3f s to %.3f s\n", path,
           plan.seconds, plan.rate, plan.channels, plan.bpm, plan.loud_at, plan.tail_at);
    return 0;
}
