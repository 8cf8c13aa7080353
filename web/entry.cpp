// Functions that the page's worker calls. Strings are UTF-8; the caller frees returned strings.
#include <cstdint>
#include <cstring>
#include <nlohmann/json.hpp>
#include <string>

#include "cli/report/song_view.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "include/tavo.h"

namespace {

void store_result(TAVO_INFO *info, void *user) {
    *static_cast<TAVO_INFO *>(user) = *info;  // beat_times is valid until tavo_deinit
}

// Fills in the record with the results or the error of a finished job.
void read_result(const TAVO_CTX *ctx, const TAVO_INFO &info, record &result) {
    result.has_highlight = result.mode != TAVO_MODE_BEATS;
    result.hl_pos_ms = info.hl_pos;
    if (tavo_has_audio(ctx) == 0 || tavo_is_complete(ctx) == 0) {
        result.error = "There is not enough memory to analyse the song.";
    } else if (info.status != 0) {
        result.error =
            result.mode == TAVO_MODE_BOTH
                ? "No beats were found after the highlight."
                : "No beats were found: the file may be silent or too short for a rhythm.";
    } else {
        result.status = outcome::ok;
    }
    if (result.status != outcome::ok || result.mode == TAVO_MODE_HIGHLIGHT) return;
    result.has_beats = true;
    result.bpm = tavo_get_tempo(ctx);
    result.beats_ms.assign(info.beat_times, info.beat_times + info.beat_count);
}

void analyse_song(record &result, int32_t max_beats) {
    const TAVO_PARAM param = {result.file.c_str(), result.mode};
    TAVO_CTX *ctx = tavo_init(&param, nullptr);
    if (ctx == nullptr) {
        const int32_t code = tavo_probe(result.file.c_str(), nullptr);
        const int32_t reason = code == TAVO_OK ? TAVO_ERR_MEMORY : code;
        result.error = "It cannot be analysed: " + std::string(tavo_error_text(reason)) + ".";
        return;
    }
    tavo_get_stream(ctx, &result.sample_rate, &result.channels, &result.duration_ms);
    TAVO_INFO info{};
    tavo_set_listener(ctx, store_result, &info);
    // Here tavo_analyze returns after the job has ended; see threads.c.
    if (tavo_analyze(ctx, result.length_s, max_beats, 0) == TAVO_OK) {
        read_result(ctx, info, result);
    } else {
        result.error = "The analysis could not be started.";
    }
    tavo_deinit(ctx);
}

}  // namespace

// Analyses the WAV file at `path`. `channels` is the channel count of the song before the downmix.
// Returns the JSON that song.js shows. If the analysis fails, it has an "error".
extern "C" char *web_analyse(const char *path, int32_t mode, int32_t length_s, int32_t max_beats,
                             int32_t channels) {
    fnamedec = "";
    record result = {path, mode};
    result.sound_path = path;
    result.length_s = length_s;
    analyse_song(result, max_beats);
    result.channels = channels;
    result_json view = json_object(result);
    if (result.status == outcome::ok) {
        const failure failed = read_song_view(result, -1, view);
        if (failed) view["error"] = failed.sentence;
    }
    return strdup(view.dump().c_str());
}

// Returns a marker file's content for a result of web_analyse, or null for an unknown format.
extern "C" char *web_markers(const char *result, int32_t length_s, const char *format,
                             const char *fps) {
    const auto found = kMarkerFormats.find(format);
    if (found == kMarkerFormats.end()) return nullptr;
    record song = record_from_json(result);
    song.file = result_json::parse(result).value("file", "");
    song.length_s = length_s;
    options opts;
    opts.fps = fps;
    opts.markers = &found->second;
    return strdup(marker_content(song, opts).c_str());
}
