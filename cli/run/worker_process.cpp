#include "cli/run/worker_process.h"

#include <malloc.h>
#include <unistd.h>

#include <cerrno>
#include <exception>
#include <fstream>
#include <functional>
#include <iterator>
#include <nlohmann/json.hpp>

#include "cli/report/report.h"
#include "cli/run/analyse.h"
#include "cli/write/clip.h"
#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "cli/write/output_file.h"

namespace {

constexpr int kLargestHeapBlock = 32 << 20;  // bytes; the most that malloc takes
constexpr int kFreeMemoryKept = 64 << 20;    // bytes

// The result that the store had, or that of an analysis.
record find_result(const request &asked, const options &opts, int stop_fd, song_file &song) {
    if (asked.stored.empty()) return analyse(asked.path, opts, stop_fd, song);
    record out;
    try {
        out = record_from_json(asked.stored);
    } catch (const nlohmann::json::exception &) {
        out.mode = opts.mode;
        out.error = "Its row in the store is damaged.";
    }
    out.file = asked.path;
    out.length_s = opts.length_s;
    const bool is_decoded = !out.decoder.empty() && !opts.report.empty() &&
                            !open_song(asked.path, stop_fd, song) &&
                            !decode_song(asked.path, opts, stop_fd, song);
    if (is_decoded) out.sound_path = song.path;
    return out;
}

// True if results go into a store.
bool is_stored(const options &opts) {
    return !opts.store.empty() && !opts.from_store;
}

// A file that is written beside the result. A target that cannot be written is found out before the
// analysis. write enters what goes wrong into the record.
struct companion {
    bool wanted;
    std::string refusal;
    std::function<void(record &)> write;
};

bool has_content(const std::string &path, const std::string &content) {
    std::ifstream file(path, std::ios::binary);
    const std::string there((std::istreambuf_iterator<char>(file)),
                            std::istreambuf_iterator<char>());
    return file && there == content;
}

void write_markers(record &result, const options &opts, const std::string &target) {
    const std::string content = marker_content(result, opts);
    // A run that was killed after it wrote the file and before its row was committed left it.
    if (is_stored(opts) && has_content(target, content)) {
        result.written = target;
        return;
    }
    const std::string error = write_file(target, content, opts.force);
    if (error.empty()) {
        result.written = target;
    } else {
        result = failed_record(result.file, result.mode, error);
    }
}

companion markers_of(const request &asked, const options &opts) {
    if (!writes_files(opts.format)) return {};
    const std::string target = marker_path(asked.path, opts);
    // With a store an existing file may be this song's: write_markers compares.
    return {true, check_target(target, opts.force || is_stored(opts)),
            [=](record &result) { write_markers(result, opts, target); }};
}

companion page_of(const request &asked, const options &opts, int stop_fd, std::string &row) {
    if (opts.report.empty()) return {};
    const std::string target = report_page_path(opts, asked.index, asked.path);
    return {true, check_report(target, opts.force),
            [=, &row](record &result) { write_report_page(result, opts, target, stop_fd, row); }};
}

companion clip_of(const request &asked, const options &opts, int stop_fd, const song_file &song) {
    if (opts.clip.empty()) return {};
    const std::string target = clip_path(asked.path, opts);
    return {true, check_target(target, opts.force),
            [=, &opts, &song](record &result) { write_clip(result, opts, target, stop_fd, song); }};
}

// is_kept becomes false if the song could be analysed and only a file beside it failed: the store
// does not take that for a song that fails.
record analyse_and_write(const request &asked, const options &opts, int stop_fd, std::string &row,
                         bool &is_kept) {
    song_file song;
    const companion companions[] = {page_of(asked, opts, stop_fd, row), markers_of(asked, opts),
                                    clip_of(asked, opts, stop_fd, song)};
    for (const companion &each : companions) {
        is_kept = each.refusal.empty();
        if (!is_kept) return failed_record(asked.path, opts.mode, each.refusal);
    }
    record out = find_result(asked, opts, stop_fd, song);
    const bool is_ok = out.status == outcome::ok;
    for (const companion &each : companions) {
        if (each.wanted && out.status == outcome::ok) each.write(out);
    }
    close_song(song);
    is_kept = !is_ok || out.status == outcome::ok;
    return out;
}

reply answer(const request &asked, const options &opts, int stop_fd) {
    std::string row;
    bool is_kept = true;
    const record result = analyse_and_write(asked, opts, stop_fd, row, is_kept);
    reply out = make_reply(result, opts);
    if (!is_kept) out.json.clear();
    if (result.status == outcome::ok) out.row = row;
    return out;
}

// The reply, ready to be sent.
std::string encoded_answer(const request &asked, const options &opts, int stop_fd) {
    try {
        return encode(answer(asked, opts, stop_fd));
    } catch (const std::exception &) {  // memory is all that can fail here
        return kEmptyReply;
    }
}

}  // namespace

reply make_reply(const record &result, const options &opts) {
    reply out;
    out.status = result.status;
    out.result = format_record(opts, result);
    const std::string line = shown(result.file) + ": " + result.error + "\n";
    if (opts.failed) {  // a failure that the store holds is a result here
        out.status = outcome::ok;
        if (opts.format == result_format::text) out.result = line;
    } else if (result.status == outcome::failed) {
        out.message = "tavo: " + line;
        if (!opts.report.empty()) out.row = report_index_row(result, {}, "");
    }
    if (is_stored(opts) && result.status != outcome::stopped) out.json = json_record(result);
    return out;
}

int serve_requests(int request_fd, int reply_fd, const options &opts) {
    // Large buffers of one job are the next one's, instead of new pages from the system each time.
    mallopt(M_MMAP_THRESHOLD, kLargestHeapBlock);
    mallopt(M_TRIM_THRESHOLD, kFreeMemoryKept);
    std::string received;
    char part[4096];
    while (true) {
        const ssize_t got = read(request_fd, part, sizeof part);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) return kExitOk;
        received.append(part, static_cast<size_t>(got));
        request asked;
        if (!decode(received, asked)) continue;
        const std::string message = encoded_answer(asked, opts, request_fd);
        if (write_all(reply_fd, message.data(), message.size()) != 0) return kExitOk;
    }
}
