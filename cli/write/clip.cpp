#include "cli/write/clip.h"

#include <strings.h>
#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cstdio>

#include "cli/input/ffmpeg_process.h"
#include "cli/system.h"
#include "cli/write/file_names.h"
#include "cli/write/output_file.h"

namespace {

constexpr size_t kLongestEnding = 6;      // ".aiff" and the like, with the dot
constexpr const char *kBitRate = "192k";  // of encodings that take one

// The kind of a clip by that of its input. A clip in ADTS, MPEG Layer II, AC-3, Windows Media,
// Matroska or WebM would start late, because ffmpeg states no encoder delay there.
struct audio_ending {
    const char *input;
    const char *clip;
};
constexpr audio_ending kAudioEndings[] = {
    {".mp3", ".mp3"},   {".mp2", ".mp3"},   {".flac", ".flac"}, {".ogg", ".ogg"},
    {".oga", ".ogg"},   {".mkv", ".ogg"},   {".mka", ".ogg"},   {".opus", ".opus"},
    {".webm", ".opus"}, {".m4a", ".m4a"},   {".m4b", ".m4a"},   {".m4v", ".m4a"},
    {".mp4", ".m4a"},   {".mov", ".m4a"},   {".3gp", ".m4a"},   {".aac", ".m4a"},
    {".ac3", ".m4a"},   {".wma", ".m4a"},   {".wmv", ".m4a"},   {".aif", ".aif"},
    {".aiff", ".aiff"}, {".aifc", ".aiff"}, {".caf", ".caf"},   {".wv", ".wv"}};

// With the dot; empty if the name has none.
std::string ending_of(const std::string &path) {
    const std::string name = base_name(path);
    const size_t dot = name.rfind('.');
    return dot == std::string::npos || name.size() - dot > kLongestEnding ? "" : name.substr(dot);
}

std::string clip_ending(const std::string &input) {
    const std::string ending = ending_of(input);
    for (const audio_ending &entry : kAudioEndings) {
        if (strcasecmp(ending.c_str(), entry.input) == 0) return entry.clip;
    }
    return ".wav";
}

std::string decimal(double seconds) {
    std::array<char, 48> text{};
    snprintf(text.data(), text.size(), "%.6f", seconds);
    return text.data();
}

std::string cut_filter(const record &result, const options &opts) {
    const double start = player_ms(result, result.hl_pos_ms) / 1000;
    const double length = player_ms(result, highlight_end_ms(result, opts.length_s)) / 1000 - start;
    std::string filter = std::string(kPlayerTimeFilter) + ",atrim=start=" + decimal(start) +
                         ":duration=" + decimal(length) + ",asetpts=PTS-STARTPTS";
    if (opts.fade_s > 0.0) {
        const double fade = std::min(opts.fade_s, length / 2);
        filter += ",afade=t=in:d=" + decimal(fade) + ",afade=t=out:st=" + decimal(length - fade) +
                  ":d=" + decimal(fade);
    }
    return filter;
}

// Reports its progress on standard output, so that run_ffmpeg sees it work.
std::vector<std::string> clip_output(const std::string &filter, const std::string &path) {
    return {"-map",   "0:a:0",     "-af",    filter, "-map_chapters", "-1", "-b:a",
            kBitRate, "-progress", "pipe:1", "-y",   "file:" + path};
}

failure cut(const record &result, const options &opts, const std::string &target, int stop_fd,
            const song_file &song) {
    if (same_file(target, result.file)) {
        return {"The clip would replace the file that is analysed."};
    }
    output_file file;
    if (const std::string error = begin_output(file, target, ending_of(target)); !error.empty()) {
        return {error};
    }
    const std::vector<std::string> words = clip_output(cut_filter(result, opts), file.temporary);
    failure failed = run_ffmpeg({opts.ffmpeg, result.file, song.source_fd, words}, stop_fd,
                                [](std::string_view) { return failure(); });
    if (failed) {
        const size_t named = failed.sentence.find(file.temporary);
        if (named != std::string::npos) {
            failed.sentence.replace(named, file.temporary.size(), shown(target));
        }
        abandon_output(file);
        return {"The clip " + shown(target) + " cannot be written. " + failed.sentence};
    }
    return {commit_output(file, opts.force)};
}

}  // namespace

std::string clip_path(const std::string &input, const options &opts) {
    struct stat info {};
    if (stat(opts.clip.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) return opts.clip;
    const std::string folder = opts.clip + (opts.clip.back() == '/' ? "" : "/");
    return folder + fitting_name(base_name(input), ".clip" + clip_ending(input));
}

void write_clip(record &result, const options &opts, const std::string &target, int stop_fd,
                const song_file &song) {
    if (failure failed = cut(result, opts, target, stop_fd, song)) {
        result = failed_record(result.file, result.mode, failed.sentence);
        if (is_readable(stop_fd)) result.status = outcome::stopped;
    }
}
