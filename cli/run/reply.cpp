#include "cli/run/reply.h"

#include <cstdint>
#include <exception>

#include "cli/input/recognise.h"
#include "cli/report/report.h"
#include "cli/run/analyse.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "cli/write/output_file.h"
#include "cli/write/sound_files.h"
#include "cli/write/value_text.h"

namespace {

// Returns a result from the store. Opens the song if its page is requested.
record read_stored(const input &next, const options &opts, int stop_fd, song_file &song) {
    record out;
    try {
        out = record_from_json(next.stored);
    } catch (const std::exception &) {
        out.mode = opts.mode;
        out.error = "Its row in the store is damaged.";
    }
    out.file = next.path;
    if (!opts.report.empty() && !open_song(next.path, stop_fd, song)) {
        const bool needs_ffmpeg = !out.decoder.empty();
        if (!needs_ffmpeg || !decode_song(next.path, opts, stop_fd, song)) {
            out.sound_path = song.path;
        }
    }
    return out;
}

failure write_markers(record &result, const options &opts) {
    const std::string target = marker_path(result.file, opts);
    const std::string content = marker_content(result, opts);
    // An earlier command may have left the file, if it was killed before it committed the row.
    int code = 0;
    if (read_bytes(target, 0, INT64_MAX, code) != content) {
        if (failure failed = write_file(target, content, opts.force)) return failed;
    }
    result.written = target;
    return {};
}

// Checks, before the analysis, that the page, the marker file and the clip can be written.
failure check_side_files(const input &next, const options &opts) {
    failure failed;
    if (!opts.report.empty()) {
        failed = check_report(report_page_path(opts, next.index, next.path), opts.force);
    }
    if (!failed && opts.markers != nullptr) {
        // With a store, an existing file may be from this song, so write_markers compares contents.
        const bool may_exist = opts.force || !opts.store.empty();
        failed = check_target(marker_path(next.path, opts), may_exist);
    }
    if (!failed && !opts.clip.empty()) {
        failed = check_target(clip_path(next.path, opts), opts.force);
    }
    return failed;
}

// Writes the requested page, markers and clip. `row` receives the song's index row, if any.
failure write_side_files(record &result, const options &opts, uint64_t index, int stop_fd,
                         const song_file &song, std::string &row) {
    failure failed;
    if (!opts.report.empty()) {
        const std::string page = report_page_path(opts, index, result.file);
        failed = write_report_page(result, opts, page, stop_fd, row);
    }
    if (!failed && opts.markers != nullptr) failed = write_markers(result, opts);
    if (!failed && !opts.clip.empty()) {
        failed = write_clip(result, opts, clip_path(result.file, opts), stop_fd, song);
    }
    return failed;
}

}  // namespace

reply make_reply(const record &result, const options &opts) {
    reply out;
    out.status = result.status;
    out.result = format_record(opts, result);
    const std::string line = shown(result.file) + ": " + result.error + "\n";
    if (opts.failed) {  // then a stored failure is a result
        out.status = outcome::ok;
        if (opts.format == result_format::text) out.result = line;
    } else if (result.status == outcome::failed) {
        out.message = "tavo: " + line;
        if (!opts.report.empty()) out.row = failed_report_row(result);
    }
    if (!opts.store.empty() && !opts.from_store) out.json = json_record(result);
    return out;
}

reply serve(const input &next, const options &opts, int stop_fd) {
    song_file song;
    std::string index_row;
    record result;
    failure failed = check_side_files(next, opts);
    if (!failed) {
        result = next.stored.empty() ? analyse(next.path, opts, stop_fd, song)
                                     : read_stored(next, opts, stop_fd, song);
        result.length_s = opts.length_s;
        if (result.status == outcome::ok) {
            failed = write_side_files(result, opts, next.index, stop_fd, song, index_row);
        }
    }
    close_song(song);
    if (failed) result = {next.path, opts.mode, outcome::failed, failed.sentence};
    reply answer = make_reply(result, opts);
    if (failed) answer.json.clear();  // not the song's fault, so the store does not record it
    if (result.status == outcome::ok) answer.row = index_row;
    return answer;
}
