#include "cli/run/worker_process.h"

#include <malloc.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <exception>
#include <nlohmann/json.hpp>

#include "cli/input/recognise.h"
#include "cli/report/report.h"
#include "cli/run/analyse.h"
#include "cli/system.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "cli/write/output_file.h"
#include "cli/write/sound_files.h"
#include "cli/write/value_text.h"

NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(input, index, path, stored)
NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(reply, status, result, message, json, row)

namespace {

// The sizes are in bytes.
constexpr int kHeapAtStart = 12 << 20;       // the buffers of a short song
constexpr int kLargestHeapBlock = 4 << 20;   // larger blocks get separate mappings
constexpr int kLargestThreshold = 32 << 20;  // largest value that malloc accepts
constexpr int kFreeMemoryKept = 64 << 20;

void send_message(int fd, const nlohmann::json &message) {
    std::string bytes;
    nlohmann::json::to_cbor(message, bytes);
    const size_t size = bytes.size();
    write_all(fd, {reinterpret_cast<const char *>(&size), sizeof size});
    write_all(fd, bytes);
}

// Returns false at the end of the connection.
template <typename record_type>
bool receive_message(int fd, record_type &message) {
    size_t size = 0;
    if (recv(fd, &size, sizeof size, MSG_WAITALL) != sizeof size) return false;
    std::string bytes(size, '\0');
    if (recv(fd, bytes.data(), size, MSG_WAITALL) != static_cast<ssize_t>(size)) return false;
    nlohmann::json::from_cbor(bytes).get_to(message);
    return true;
}

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

// Analyses an input and writes its files. A failure to write one is not the song's fault, so the
// store does not record it.
reply serve(const input &next, const options &opts, int stop_fd) {
    song_file song;
    std::string row;
    record result;
    failure failed = check_side_files(next, opts);
    if (!failed) {
        result = next.stored.empty() ? analyse(next.path, opts, stop_fd, song)
                                     : read_stored(next, opts, stop_fd, song);
        result.length_s = opts.length_s;
        if (result.status == outcome::ok) {
            failed = write_side_files(result, opts, next.index, stop_fd, song, row);
        }
    }
    close_song(song);
    if (failed) result = {next.path, opts.mode, outcome::failed, failed.sentence};
    reply answer = make_reply(result, opts);
    if (failed) answer.json.clear();
    if (result.status == outcome::ok) answer.row = row;
    return answer;
}

// Each job reuses the heap of the previous one instead of asking the system for new pages. The heap
// starts large enough for a song, in huge pages: each takes one page fault instead of 512.
void prepare_heap() {
    mallopt(M_TRIM_THRESHOLD, kFreeMemoryKept);
    mallopt(M_MMAP_THRESHOLD, kLargestThreshold);  // so that the block below is part of the heap
    const auto page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    void *block = nullptr;
    if (posix_memalign(&block, page, kHeapAtStart) == 0) {
        madvise(block, kHeapAtStart, MADV_HUGEPAGE);
        free(block);
    }
    mallopt(M_MMAP_THRESHOLD, kLargestHeapBlock);
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

void send_input(int fd, const input &next) {
    send_message(fd, next);
}

bool receive_reply(int fd, reply &answer) {
    return receive_message(fd, answer);
}

void serve_inputs(int fd, const options &opts) {
    prepare_heap();
    for (input next; receive_message(fd, next);) {
        reply answer;
        try {
            answer = serve(next, opts, fd);
        } catch (const std::exception &) {  // only allocations can fail here
            const char *error = "There is not enough memory for the result.";
            answer = make_reply({next.path, opts.mode, outcome::failed, error}, opts);
            answer.json.clear();
        }
        send_message(fd, answer);
    }
}
