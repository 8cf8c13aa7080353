#include "cli/write/sound_files.h"

#include <strings.h>

#include <algorithm>
#include <filesystem>

#include "cli/input/ffmpeg.h"
#include "cli/input/recognise.h"
#include "cli/system.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

namespace fs = std::filesystem;

constexpr const char *kBitRate = "192k";  // of lossy encodings

// The extensions of an input and of its clip. No clip is written as ADTS, MPEG Layer II, AC-3,
// Windows Media, Matroska or WebM: in these, ffmpeg states no encoder delay, so the clip would
// start late.
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

std::string ending_of(const std::string &path) {
    return fs::path(path).extension();
}

std::string clip_ending(const std::string &input) {
    const std::string ending = ending_of(input);
    for (const audio_ending &entry : kAudioEndings) {
        if (strcasecmp(ending.c_str(), entry.input) == 0) return entry.clip;
    }
    return ".wav";
}

std::string cut_filter(const record &result, const options &opts) {
    const double start = player_ms(result, result.hl_pos_ms) / 1000;
    const double length = player_ms(result, highlight_end_ms(result, opts.length_s)) / 1000 - start;
    std::string filter = formatted("%s,atrim=start=%.6f:duration=%.6f,asetpts=PTS-STARTPTS",
                                   kPlayerTimeFilter, start, length);
    if (opts.fade_s > 0.0) {
        const double fade = std::min(opts.fade_s, length / 2);
        filter +=
            formatted(",afade=t=in:d=%.6f,afade=t=out:st=%.6f:d=%.6f", fade, length - fade, fade);
    }
    return filter;
}

// The library ignores write errors, so only the length shows that the disk was full.
bool is_whole_track(const std::string &path) {
    int code = 0;
    const std::string size = read_bytes(path, 40, 4, code);  // of the samples, little-endian
    std::error_code failed;
    return fs::file_size(path, failed) ==
           44 + big_endian(std::string(size.rbegin(), size.rend()), 0, 4);
}

}  // namespace

failure begin_click(output_file &track, const options &opts, const std::string &input) {
    fnamedec = "";
    if (opts.click.empty()) return {};
    if (same_file(opts.click, input)) {
        return {"The click track would replace the file that is analysed."};
    }
    failure failed = check_target(opts.click, opts.force);
    if (!failed) failed = begin_output(track, opts.click);
    if (!failed) fnamedec = track.temporary.c_str();
    return failed;
}

failure finish_click(output_file &track, const options &opts, bool is_analysed) {
    fnamedec = "";
    if (track.temporary.empty()) return {};
    if (is_analysed && is_whole_track(track.temporary)) return commit_output(track, opts.force);
    abandon_output(track);
    if (!is_analysed) return {};
    return {"The click track " + shown(opts.click) +
            " could not be written whole; the disk may be full."};
}

std::string clip_path(const std::string &input, const options &opts) {
    std::error_code failed;
    if (!fs::is_directory(opts.clip, failed)) return opts.clip;
    return fs::path(opts.clip) / fitting_name(base_name(input), ".clip" + clip_ending(input));
}

failure write_clip(const record &result, const options &opts, const std::string &target,
                   int stop_fd, const song_file &song) {
    if (same_file(target, result.file)) {
        return {"The clip would replace the file that is analysed."};
    }
    output_file file;
    if (failure failed = begin_output(file, target, ending_of(target))) return failed;
    // The progress reports on standard output keep run_ffmpeg from ending a busy ffmpeg.
    const std::vector<std::string> words = {
        "-map",          "0:a:0",  "-af",  cut_filter(result, opts),
        "-map_chapters", "-1",     "-b:a", kBitRate,
        "-progress",     "pipe:1", "-y",   "file:" + file.temporary};
    int progress = -1;
    failure failed =
        run_ffmpeg({opts.ffmpeg, result.file, song.source_fd, words}, stop_fd, nullptr, progress);
    close_fd(progress);
    if (!failed) return commit_output(file, opts.force);
    const size_t at = failed.sentence.find(file.temporary);
    if (at != std::string::npos) {
        failed.sentence.replace(at, file.temporary.size(), shown(target));
    }
    abandon_output(file);
    return {"The clip " + shown(target) + " cannot be written. " + failed.sentence};
}
