// song_results SONGS [EXPECTED]: analyses every file in the directory SONGS in several ways and
// prints the results as JSON. With EXPECTED, the output of another run, only the differences are
// printed. The exit status is 1 if there is a difference or no song, and 2 for wrong usage.
#include <filesystem>
#include <fstream>
#include <iostream>
#include <nlohmann/json.hpp>

#include "tests/support/job_harness.h"

namespace {

using nlohmann::json;

struct way {
    const char *name;
    int32_t mode;
    int32_t length;  // requested length of the highlight in seconds, or 0
};

constexpr way kWays[] = {{"highlight", TAVO_MODE_HIGHLIGHT, 0},
                         {"highlight of 20 s", TAVO_MODE_HIGHLIGHT, 20},
                         {"beats", TAVO_MODE_BEATS, 0},
                         {"both", TAVO_MODE_BOTH, 0}};

json analyse(const std::string &path, const way &settings) {
    int32_t err = TAVO_OK;
    TAVO_CTX *ctx = job::create(path, settings.mode, &err);
    if (ctx == nullptr || tavo_analyze(ctx, settings.length, 0, 0) != TAVO_OK)
        return {{"refused", err}};
    const job::result result = job::wait();
    json found = {{"status", result.status}};
    if (ctx->hl != nullptr) found["highlight_ms"] = result.hl_pos;
    if (ctx->onset != nullptr) found["bpm"] = ctx->onset->bpm;
    if (ctx->onset != nullptr) found["beats_ms"] = result.beats;
    tavo_deinit(ctx);
    return found;
}

}  // namespace

int main(int argc, char **argv) {
    if (argc < 2 || argc > 3) return 2;
    json results;
    for (const auto &song : std::filesystem::directory_iterator(argv[1])) {
        for (const way &settings : kWays) {
            results[song.path().filename().string()][settings.name] =
                analyse(song.path().string(), settings);
        }
    }
    if (argc < 3) {
        std::cout << results.dump(1) << '\n';
        return results.empty() ? 1 : 0;
    }
    std::ifstream in(argv[2]);
    const json difference = json::diff(json::parse(in), results);
    for (const json &each : difference) std::cout << each.dump() << '\n';
    std::cout << results.size() << " songs, " << difference.size() << " values differ\n";
    return results.empty() || !difference.empty() ? 1 : 0;
}
