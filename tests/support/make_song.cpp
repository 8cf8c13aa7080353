// make_song OUT.wav [--seconds S] [--bpm B] [--rate HZ] [--channels N] [--seed N] [--loud-at S]
// Writes a synthetic song and prints where its loud section starts.
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <map>

#include "tests/support/song.h"

namespace {

constexpr const char *kUsage =
    "usage: make_song OUT.wav [--seconds S] [--bpm B] [--rate HZ] [--channels N] [--seed N]\n"
    "                 [--loud-at S]\n";

bool usable(const support::song_spec &plan) {
    return plan.seconds > 0.0 && plan.seconds <= 7200.0 && plan.bpm >= 1.0 && plan.rate >= 1000 &&
           plan.rate <= 192000 && plan.channels >= 1 && plan.channels <= 8;
}

}  // namespace

int main(int argc, char **argv) {
    support::song_spec plan;
    std::map<std::string, double> options = {
        {"--seconds", plan.seconds},   {"--bpm", plan.bpm},   {"--rate", plan.rate},
        {"--channels", plan.channels}, {"--seed", plan.seed}, {"--loud-at", NAN}};
    const char *path = nullptr;
    bool good = true;
    for (int i = 1; i < argc; ++i) {
        const auto option = options.find(argv[i]);
        if (option != options.end() && i + 1 < argc) {
            char *end = nullptr;
            option->second = strtod(argv[++i], &end);
            good = good && end != argv[i] && *end == '\0';
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
    if (!good || path == nullptr || !usable(plan)) {
        fputs(kUsage, stderr);
        return 2;
    }

    const support::song song = support::make_song(plan);
    if (!support::write_wav(path, song)) {
        perror(path);
        return 1;
    }
    printf("%s: %.1f s, %d Hz, %d channels, %.1f BPM, loud from %.3f s to %.3f s\n", path,
           plan.seconds, plan.rate, plan.channels, plan.bpm, plan.loud_at, plan.tail_at);
    return 0;
}
