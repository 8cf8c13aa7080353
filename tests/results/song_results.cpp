// song_results SONGS OUT [REFERENCE]
// Analyses every file in the directory SONGS in every mode and writes each result to OUT, all
// digits of it. With REFERENCE, the file of another run or of another processor's build, the two
// must be equal. Exit status: 0; 1 different, or a song without a result; 2 wrong usage.
#include <algorithm>
#include <condition_variable>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <vector>

#include "core/tavo_ctx.h"

namespace {

std::mutex done_lock;
std::condition_variable done_signal;
bool done = false;  // under done_lock

void on_result(TAVO_INFO *) {
    const std::lock_guard<std::mutex> hold(done_lock);
    done = true;
    done_signal.notify_one();
}

void add_beats(const TAVO_CTX *ctx, std::vector<std::string> &lines) {
    lines.back() += " bpm " + std::to_string(ctx->onset->bpm);
    lines.back() += " beats " + std::to_string(ctx->info->beat_count);
    for (int32_t i = 0; i < ctx->info->beat_count; ++i) {
        char text[64];
        snprintf(text, sizeof(text), "  %.9g", static_cast<double>(ctx->info->beat_times[i]));
        lines.emplace_back(text);
    }
}

// Adds one line for the result and one for each beat. False when there is none.
bool add_result(const std::filesystem::path &song, int32_t mode, std::vector<std::string> &lines) {
    const std::string path = song.string();
    const TAVO_PARAM param = {path.c_str(), mode};
    int32_t err = TAVO_OK;
    TAVO_CTX *ctx = tavo_init(&param, &err);
    if (ctx == nullptr) {
        fprintf(stderr, "%s: mode %d: tavo_init failed with %d\n", path.c_str(), mode, err);
        return false;
    }
    tavo_setcallback(ctx, on_result);
    done = false;
    const bool started = tavo_analyze(ctx, 0, 0, 0) == TAVO_OK;
    if (started) {
        std::unique_lock<std::mutex> hold(done_lock);
        done_signal.wait(hold, [] { return done; });
        lines.push_back(song.filename().string() + " mode " + std::to_string(mode) + " status " +
                        std::to_string(ctx->info->status) + " highlight " +
                        std::to_string(ctx->info->hl_pos));
        if (ctx->onset != nullptr) add_beats(ctx, lines);
    }
    tavo_deinit(ctx);
    return started;
}

bool read_lines(const char *path, std::vector<std::string> &lines) {
    std::ifstream in(path);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return !lines.empty();
}

bool write_lines(const char *path, const std::vector<std::string> &lines) {
    std::ofstream out(path);
    for (const std::string &line : lines) out << line << '\n';
    return out.flush().good();
}

// Prints the first line that differs.
bool same(const std::vector<std::string> &got, const std::vector<std::string> &expected) {
    const size_t common = std::min(got.size(), expected.size());
    for (size_t i = 0; i < common; ++i) {
        if (got[i] == expected[i]) continue;
        fprintf(stderr, "line %zu: %s\ninstead of: %s\n", i + 1, got[i].c_str(),
                expected[i].c_str());
        return false;
    }
    if (got.size() == expected.size()) return true;
    fprintf(stderr, "%zu lines instead of %zu\n", got.size(), expected.size());
    return false;
}

}  // namespace

int main(int argc, char **argv) {
    if (argc < 3 || argc > 4) return 2;
    fnamedec = "";
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
    if (!write_lines(argv[2], lines)) {
        perror(argv[2]);
        return 1;
    }
    printf("%zu songs, %zu lines of results\n", songs.size(), lines.size());
    if (!all) return 1;
    std::vector<std::string> expected;
    if (argc == 4 && !read_lines(argv[3], expected)) {
        fprintf(stderr, "%s: no results to compare with\n", argv[3]);
        return 1;
    }
    return argc < 4 || same(lines, expected) ? 0 : 1;
}
