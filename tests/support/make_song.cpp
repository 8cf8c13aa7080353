// make_song OUT.wav [--seconds S] [--bpm B] [--rate HZ] [--channels N] [--seed N] [--loud-at S]
// Writes a synthetic song and prints where its loud section starts.
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "tests/support/song.h"

namespace {

constexpr const char *kUsage =
    "usage: make_song OUT.wav [--seconds S] [--bpm B] [--rate HZ] [--channels N] [--seed N]\n"
    "                 [--loud-at S]\n";

bool set_option(support::song_spec &plan, const char *name, const char *text) {
    char *end = nullptr;
    const double value = strtod(text, &end);
    if (end == text || *end != '\0') return false;
    if (strcmp(name, "--seconds") == 0) {
        plan.seconds = value;
    } else if (strcmp(name, "--bpm") == 0) {
        plan.bpm = value;
    } else if (strcmp(name, "--rate") == 0) {
        plan.rate = static_cast<int32_t>(value);
    } else if (strcmp(name, "--channels") == 0) {
        plan.channels = static_cast<int32_t>(value);
    } else if (strcmp(name, "--seed") == 0) {
        plan.seed = static_cast<uint32_t>(value);
    } else if (strcmp(name, "--loud-at") == 0) {
        plan.loud_at = value;
    } else {
        return false;
    }
    return true;
}

bool usable(const support::song_spec &plan) {
    return plan.seconds > 0.0 && plan.seconds <= 7200.0 && plan.bpm >= 1.0 && plan.rate >= 1000 &&
           plan.rate <= 192000 && plan.channels >= 1 && plan.channels <= 8;
}

}  // namespace

int main(int argc, char **argv) {
    support::song_spec plan;
    const char *path = nullptr;
    bool loud_given = false;
    for (int i = 1; i < argc; ++i) {
        const bool option = strncmp(argv[i], "--", 2) == 0;
        if (option && i + 1 < argc && set_option(plan, argv[i], argv[i + 1])) {
            loud_given = loud_given || strcmp(argv[i], "--loud-at") == 0;
            ++i;
        } else if (!option && path == nullptr) {
            path = argv[i];
        } else {
            fputs(kUsage, stderr);
            return 2;
        }
    }
    if (path == nullptr || !usable(plan)) {
        fputs(kUsage, stderr);
        return 2;
    }
    if (!loud_given) plan.loud_at = plan.seconds / 3.0;
    plan.tail_at = plan.seconds * 5.0 / 6.0;

    const support::song song = support::make_song(plan);
    if (!support::write_wav(path, song)) {
        perror(path);
        return 1;
    }
    printf("%s: %.1f s, %d Hz, %d channels, %.1f BPM, loud from %.3f s to %.3f s\n", path,
           plan.seconds, plan.rate, plan.channels, plan.bpm, plan.loud_at, plan.tail_at);
    return 0;
}
