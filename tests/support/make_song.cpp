// make_song OUT.wav [OPTION NUMBER]...
// Writes a synthetic song and prints where its loud section starts.
#include <cstdio>
#include <cstdlib>
#include <map>

#include "tests/support/song.h"

int main(int argc, char **argv) {
    support::song_spec plan;
    std::map<std::string, double> options = {
        {"--seconds", plan.seconds},   {"--loud-at", -1.0},  // a third of the song
        {"--bpm", plan.bpm},           {"--rate", plan.rate},
        {"--channels", plan.channels}, {"--seed", plan.seed},
        {"--drums", plan.drum_level},  {"--bed", plan.bed_level}};  // parts of full scale
    bool good = argc % 2 == 0;
    for (int i = 2; good && i < argc; i += 2) {
        char *end = argv[i + 1];
        good = options.count(argv[i]) > 0 && *end != '\0';
        if (good) options[argv[i]] = strtod(argv[i + 1], &end);
        good = good && *end == '\0';
    }
    plan.seconds = options["--seconds"];
    plan.bpm = options["--bpm"];
    plan.rate = static_cast<int32_t>(options["--rate"]);
    plan.channels = static_cast<int32_t>(options["--channels"]);
    plan.seed = static_cast<uint32_t>(options["--seed"]);
    plan.loud_at = options["--loud-at"] < 0.0 ? plan.seconds / 3.0 : options["--loud-at"];
    plan.tail_at = plan.seconds * 5.0 / 6.0;
    plan.drum_level = options["--drums"];
    plan.bed_level = options["--bed"];
    if (!good || plan.seconds <= 0.0 || plan.bpm <= 0.0 || plan.rate <= 0 || plan.channels <= 0) {
        fputs("usage: make_song OUT.wav [OPTION NUMBER]...\n", stderr);
        for (const auto &[name, value] : options) fprintf(stderr, "  %s %g\n", name.c_str(), value);
        return 2;
    }
    if (!support::write_wav(argv[1], support::make_song(plan))) {
        perror(argv[1]);
        return 1;
    }
    printf("%s: %.1f s, %d Hz, %d channels, %.1f BPM, loud from %.3f s to %.3f s\n", argv[1],
           plan.seconds, plan.rate, plan.channels, plan.bpm, plan.loud_at, plan.tail_at);
    return 0;
}
