// song_results SONGS OUT [REFERENCE]
// Analyses every file in the directory SONGS in every mode and writes each result to OUT, all
// digits of it. With REFERENCE, the file of another run or of another processor's build, the two
// must be equal. Exit status: 0; 1 different, or a song without a result; 2 wrong usage.
#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>

#include "tests/support/job_harness.h"

namespace {

// Adds one line for the result and one for each beat. False when there is none.
bool add_result(const std::filesystem::path &song, int32_t mode, std::vector<std::string> &lines) {
    int32_t err = TAVO_OK;
    TAVO_CTX *ctx = job::create(song.string(), mode, &err);
    if (ctx == nullptr || tavo_analyze(ctx, 0, 0, 0) != TAVO_OK) {
        fprintf(stderr, "%s: mode %d: not analysed, %d\n", song.c_str(), mode, err);
        return false;
    }
    const job::result result = job::wait();
    std::string line = song.filename().string() + " mode " + std::to_string(mode) + " status " +
                       std::to_string(result.status) + " highlight " +
                       std::to_string(result.hl_pos);
    if (ctx->onset != nullptr) {
        line += " bpm " + std::to_string(ctx->onset->bpm) + " beats " +
                std::to_string(result.beat_count);
    }
    lines.push_back(line);
    for (const float beat : result.beats) {
        char text[64];
        snprintf(text, sizeof(text), "  %.9g", static_cast<double>(beat));
        lines.emplace_back(text);
    }
    tavo_deinit(ctx);
    return true;
}

std::vector<std::string> read_lines(const char *path) {
    std::vector<std::string> lines;
    std::ifstream in(path);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

bool write_lines(const char *path, const std::vector<std::string> &lines) {
    std::ofstream out(path);
    for (const std::string &line : lines) out << line << '\n';
    return out.flush().good();
}

// Prints the first line that differs.
bool same(std::vector<std::string> got, std::vector<std::string> expected) {
    const size_t lines = std::max(got.size(), expected.size());
    got.resize(lines, "(end)");
    expected.resize(lines, "(end)");
    const auto [one, other] = std::mismatch(got.begin(), got.end(), expected.begin());
    if (one == got.end()) return true;
    fprintf(stderr, "line %td: %s\ninstead of: %s\n", one - got.begin() + 1, one->c_str(),
            other->c_str());
    return false;
}

}  // namespace

int main(int argc, char **argv) {
    if (argc < 3 || argc > 4) return 2;
    std::vector<std::filesystem::path> songs;
    std::error_code error;
    for (const auto &each : std::filesystem::directory_iterator(argv[1], error)) {
        if (each.is_regular_file()) songs.push_back(each.path());
    }
    std::sort(songs.begin(), songs.end());

    std::vector<std::string> lines;
    bool all = !songs.empty();
    for (const auto &song : songs) {
        for (const int32_t mode : {TAVO_MODE_HIGHLIGHT, TAVO_MODE_BEATS, TAVO_MODE_BOTH}) {
            all = add_result(song, mode, lines) && all;
        }
    }
    printf("%zu songs, %zu lines of results\n", songs.size(), lines.size());
    if (!write_lines(argv[2], lines)) {
        perror(argv[2]);
        return 1;
    }
    return all && (argc < 4 || same(lines, read_lines(argv[3]))) ? 0 : 1;
}
