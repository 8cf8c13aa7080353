// make_song OUT.wav [OPTION NUMBER]...: writes a synthetic song, whose last sixth is quiet.
#include <cstdio>
#include <map>

#include "tests/support/song.h"

int main(int argc, char **argv) {
    support::song_spec plan;
    std::map<std::string, double> options = {
        {"--seconds", plan.seconds},   {"--loud-at", -1.0},  // default: a third of the song
        {"--bpm", plan.bpm},           {"--rate", plan.rate},
        {"--channels", plan.channels}, {"--seed", plan.seed},
        {"--drums", plan.drum_level},  {"--bed", plan.bed_level}};  // relative to full scale
    bool good = argc % 2 == 0;
    for (int i = 2; good && i < argc; i += 2) {
        good = options.count(argv[i]) > 0 && sscanf(argv[i + 1], "%lf", &options[argv[i]]) == 1;
    }
    if (!good) {
        fputs("usage: make_song OUT.wav [OPTION NUMBER]...\n", stderr);
        for (const auto &[name, value] : options) fprintf(stderr, "  %s %g\n", name.c_str(), value);
        return 2;
    }
    plan = {static_cast<int32_t>(options["--rate"]),
            static_cast<int32_t>(options["--channels"]),
            options["--seconds"],
            options["--bpm"],
            static_cast<uint32_t>(options["--seed"]),
            options["--loud-at"],
            options["--seconds"] * 5.0 / 6.0,
            options["--drums"],
            options["--bed"]};
    if (plan.loud_at < 0.0) plan.loud_at = plan.seconds / 3.0;
    if (support::write_wav(argv[1], support::make_song(plan))) return 0;
    perror(argv[1]);
    return 1;
}
