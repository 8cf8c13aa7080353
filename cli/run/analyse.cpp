#include "cli/run/analyse.h"

#include <sys/resource.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <future>

#include "cli/input/player_offset.h"
#include "cli/input/recognise.h"
#include "cli/system.h"
#include "cli/write/sound_files.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr int64_t kMsPerMinute = 60'000;
constexpr std::chrono::milliseconds kStopCheck{50};  // time between two checks for a stop

// Mean square, full scale 1, to which --normalize raises the loudest 6 s: -8 dBFS. At this level,
// any rise of 3 dB is large enough for the library to refine the highlight.
constexpr double kRaisedPower = 0.1585;

using job_end = std::promise<const TAVO_INFO *>;

void on_result(TAVO_INFO *info, void *end) {
    static_cast<job_end *>(end)->set_value(info);
}

// Waits for the end of the job or a stop. Returns the job's result; null after a stop.
const TAVO_INFO *wait_for_result(job_end &end, int stop_fd) {
    std::future<const TAVO_INFO *> result = end.get_future();
    while (result.wait_for(kStopCheck) != std::future_status::ready) {
        if (is_readable(stop_fd)) return nullptr;
    }
    return result.get();
}

// Returns the mean square of the loudest window, full scale 1; 0 in mode beats.
double loudest_passage(const TAVO_CTX *ctx) {
    int32_t count = 0;
    const float *curve = tavo_get_loudness(ctx, &count);
    if (count == 0) return 0.0;
    return std::pow(10.0, *std::max_element(curve, curve + count) / 10.0) - 1.0;
}

// Copies the result. Called after the callback, when the job no longer changes the instance.
void read_result(const TAVO_CTX *ctx, const TAVO_INFO *info, const song_file &song, record &out) {
    if (tavo_has_audio(ctx) == 0 || tavo_is_complete(ctx) == 0) {
        out.error = explain_lost_audio(song.path, tavo_has_audio(ctx) != 0);
        return;
    }
    out.has_highlight = out.mode != TAVO_MODE_BEATS;
    out.hl_pos_ms = info->hl_pos;
    out.loudest = loudest_passage(ctx);
    if (info->status != 0) {
        out.error = out.mode == TAVO_MODE_BOTH
                        ? "No beats were found after the highlight."
                        : "No beats were found: the file may be silent or too short for a rhythm.";
        return;
    }
    out.status = outcome::ok;
    if (out.mode == TAVO_MODE_HIGHLIGHT) return;
    out.has_beats = true;
    out.bpm = tavo_get_tempo(ctx);
    out.beats_ms.assign(info->beat_times, info->beat_times + info->beat_count);
}

// Runs an instance's job and releases the instance.
void run_job(TAVO_CTX *ctx, const options &opts, int stop_fd, const song_file &song, record &out) {
    job_end end;
    tavo_set_listener(ctx, on_result, &end);
    if (const int32_t code = tavo_analyze(ctx, opts.length_s, opts.max_beats, 0)) {
        out.error =
            std::string("The analysis could not be started: ") + tavo_error_text(code) + ".";
    } else if (const TAVO_INFO *info = wait_for_result(end, stop_fd)) {
        read_result(ctx, info, song, out);
    } else {
        out.error = "The analysis was stopped.";
    }
    tavo_deinit(ctx);  // after a stop it waits for the callback, which uses `end`
}

void analyse_opened(const options &opts, int stop_fd, song_file &song, record &out);

// Replaces a coarse highlight with that of the amplified song. In mode both, the result does not
// show whether the highlight is coarse, so the original song is first searched again.
void refine_quiet_song(const options &opts, int stop_fd, song_file &song, record &out) {
    options search = opts;
    search.mode = TAVO_MODE_HIGHLIGHT;
    search.normalize = false;
    record found = out;
    found.mode = search.mode;
    if (opts.mode != search.mode) analyse_opened(search, stop_fd, song, found);
    if (found.error.empty()) {
        if (is_refined(found) || found.loudest <= 0.0 || found.loudest >= kRaisedPower) return;
        const double gain = std::sqrt(kRaisedPower / found.loudest);
        song_file raised;
        found.error =
            raise_song(out.file, opts, stop_fd, song, gain, out.offset_ms, raised).sentence;
        if (found.error.empty()) analyse_opened(search, stop_fd, raised, found);
        close_song(raised);
    }
    if (!found.error.empty()) {
        out.status = outcome::failed;
        out.error = "The song could not be raised in level. " + found.error;
        return;
    }
    out.raised = true;
    out.hl_pos_ms = found.hl_pos_ms;
    std::vector<float> &beats = out.beats_ms;
    beats.erase(beats.begin(), std::lower_bound(beats.begin(), beats.end(), out.hl_pos_ms));
}

// Decodes a refused song with ffmpeg and analyses the output, or explains the refusal.
void analyse_refused(const options &opts, int stop_fd, int32_t code, song_file &song, record &out) {
    TAVO_STREAM stream{};
    if (code != TAVO_ERR_MEMORY) code = tavo_probe(song.path.c_str(), &stream);
    const bool may_decode = code == TAVO_ERR_FORMAT || code == TAVO_ERR_OPEN ||
                            code == TAVO_ERR_CODEC || code == TAVO_ERR_LOW_RATE;
    failure failed;
    if (may_decode && !song.by_ffmpeg) {
        failed = decode_song(out.file, opts, stop_fd, song);
        if (!failed) {
            out.decoder = "ffmpeg";
            return analyse_opened(opts, stop_fd, song, out);
        }
    }
    out.sample_rate = stream.rate;
    out.channels = stream.channels;
    out.duration_ms = stream.duration_ms;
    out.error = explain_refusal(song.path, code, stream);
    if (failed) out.error += " " + failed.sentence;
}

void analyse_opened(const options &opts, int stop_fd, song_file &song, record &out) {
    const TAVO_PARAM param = {song.path.c_str(), opts.mode};
    int32_t code = TAVO_OK;
    TAVO_CTX *ctx = tavo_init(&param, &code);
    if (ctx == nullptr) return analyse_refused(opts, stop_fd, code, song, out);
    tavo_get_stream(ctx, &out.sample_rate, &out.channels, &out.duration_ms);
    out.offset_ms = find_player_offset_ms(song.path, out.sample_rate, out.channels);
    if (out.duration_ms > opts.max_minutes * kMsPerMinute) {
        out.error = "The audio lasts " + whole_clock_text(static_cast<double>(out.duration_ms)) +
                    ", as the file states; the limit is --max-minutes " +
                    std::to_string(opts.max_minutes) + ".";
        tavo_deinit(ctx);
        return;
    }
    run_job(ctx, opts, stop_fd, song, out);
    const bool has_result = out.status == outcome::ok && out.has_highlight;
    if (opts.normalize && has_result) refine_quiet_song(opts, stop_fd, song, out);
}

// Returns the user and system time of all threads of this process and its ffmpeg processes.
int64_t cpu_time_ms() {
    int64_t sum = 0;
    for (const auto who : {RUSAGE_SELF, RUSAGE_CHILDREN}) {
        rusage used{};
        getrusage(who, &used);
        for (const timeval &time : {used.ru_utime, used.ru_stime}) {
            sum += 1000 * time.tv_sec + time.tv_usec / 1000;
        }
    }
    return sum;
}

}  // namespace

record analyse(const std::string &path, const options &opts, int stop_fd, song_file &song) {
    record out = {path, opts.mode};
    out.error = open_song(path, stop_fd, song).sentence;
    output_file click;
    if (out.error.empty()) out.error = begin_click(click, opts, path).sentence;
    if (!out.error.empty()) return out;

    const int64_t before_ms = cpu_time_ms();
    analyse_opened(opts, stop_fd, song, out);
    out.sound_path = song.path;
    out.cpu_ms = cpu_time_ms() - before_ms;
    if (failure failed = finish_click(click, opts, out.status == outcome::ok)) {
        out.status = outcome::failed;
        out.error = failed.sentence;
    }
    return out;
}
