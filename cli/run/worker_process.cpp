#include "cli/run/worker_process.h"

#include <malloc.h>
#include <sys/mman.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <fstream>
#include <iterator>
#include <nlohmann/json.hpp>

#include "cli/report/report.h"
#include "cli/run/analyse.h"
#include "cli/system.h"
#include "cli/write/clip.h"
#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/json.h"
#include "cli/write/markers.h"
#include "cli/write/output_file.h"

NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(request, index, path, stored)
NLOHMANN_DEFINE_TYPE_NON_INTRUSIVE(reply, status, result, message, json, row)

namespace {

// The sizes are in bytes.
constexpr int kHeapAtStart = 12 << 20;       // the buffers of a short song
constexpr int kLargestHeapBlock = 4 << 20;   // larger blocks get separate mappings
constexpr int kLargestThreshold = 32 << 20;  // largest value that malloc accepts
constexpr int kFreeMemoryKept = 64 << 20;

// Returns a result from the store. Opens the song if its page is requested.
record read_stored(const request &message, const options &opts, int stop_fd, song_file &song) {
    record out;
    try {
        out = record_from_json(message.stored);
    } catch (const std::exception &) {
        out.mode = opts.mode;
        out.error = "Its row in the store is damaged.";
    }
    out.file = message.path;
    if (!opts.report.empty() && !open_song(message.path, stop_fd, song)) {
        const bool needs_ffmpeg = !out.decoder.empty();
        if (!needs_ffmpeg || !decode_song(message.path, opts, stop_fd, song)) {
            out.sound_path = song.path;
        }
    }
    return out;
}

// True if the results are to be stored.
bool is_stored(const options &opts) {
    return !opts.store.empty() && !opts.from_store;
}

bool has_content(const std::string &path, const std::string &content) {
    std::ifstream file(path, std::ios::binary);
    const std::string there((std::istreambuf_iterator<char>(file)), {});
    return file && there == content;
}

failure write_markers(record &result, const options &opts) {
    const std::string target = marker_path(result.file, opts);
    const std::string content = marker_content(result, opts);
    // An earlier command may have left the file, if it was killed before it committed the row.
    if (!is_stored(opts) || !has_content(target, content)) {
        if (failure failed = write_file(target, content, opts.force)) return failed;
    }
    result.written = target;
    return {};
}

// Checks, before the analysis, that the page, the marker file and the clip can be written.
failure check_side_files(const request &message, const options &opts) {
    failure failed;
    if (!opts.report.empty()) {
        failed = check_report(report_page_path(opts, message.index, message.path), opts.force);
    }
    if (!failed && opts.markers != nullptr) {
        // With a store, an existing file may be from this song, so write_markers compares contents.
        const bool may_exist = opts.force || is_stored(opts);
        failed = check_target(marker_path(message.path, opts), may_exist);
    }
    if (!failed && !opts.clip.empty()) {
        failed = check_target(clip_path(message.path, opts), opts.force);
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

// Returns the reply for a failure that is not the song's fault, so the store does not record it.
reply make_failed_reply(const request &message, const options &opts, int stop_fd,
                        const std::string &error) {
    record result = {message.path, opts.mode, outcome::failed, error};
    if (is_readable(stop_fd)) result.status = outcome::stopped;
    reply out = make_reply(result, opts);
    out.json.clear();
    return out;
}

reply analyse_and_write(const request &message, const options &opts, int stop_fd) {
    song_file song;
    std::string row;
    record result;
    failure failed = check_side_files(message, opts);
    if (!failed) {
        result = message.stored.empty() ? analyse(message.path, opts, stop_fd, song)
                                        : read_stored(message, opts, stop_fd, song);
        result.length_s = opts.length_s;
    }
    if (result.status == outcome::ok) {
        failed = write_side_files(result, opts, message.index, stop_fd, song, row);
    } else if (is_readable(stop_fd)) {
        result.status = outcome::stopped;
    }
    close_song(song);
    if (failed) return make_failed_reply(message, opts, stop_fd, failed.sentence);
    reply out = make_reply(result, opts);
    if (!row.empty()) out.row = row;
    return out;
}

std::string serve(const request &message, const options &opts, int stop_fd) {
    try {
        return encode(analyse_and_write(message, opts, stop_fd));
    } catch (const std::exception &) {  // only allocations can fail here
        const char *error = "There is not enough memory for the result.";
        return encode(make_failed_reply(message, opts, stop_fd, error));
    }
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
    if (is_stored(opts) && result.status != outcome::stopped) out.json = json_record(result);
    return out;
}

int serve_requests(int fd, const options &opts) {
    prepare_heap();
    std::string received;
    std::array<char, 4096> part;
    while (true) {
        const ssize_t got = read(fd, part.data(), part.size());
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) return kExitOk;
        received.append(part.data(), static_cast<size_t>(got));
        request message;
        if (!decode(received, message)) continue;
        if (write_all(fd, serve(message, opts, fd)) != 0) return kExitOk;
    }
}

// An encoded message is a CBOR object, preceded by its size in bytes. Its strings may contain any
// bytes, because neither side checks that they are UTF-8.

template <typename record_type>
std::string encode(const record_type &message) {
    std::string bytes;
    nlohmann::json::to_cbor(message, bytes);
    const size_t size = bytes.size();
    return std::string(reinterpret_cast<const char *>(&size), sizeof size) + bytes;
}

template <typename record_type>
bool decode(std::string &received, record_type &message) {
    size_t size = 0;
    if (received.size() < sizeof size) return false;
    memcpy(&size, received.data(), sizeof size);
    if (received.size() - sizeof size < size) return false;
    nlohmann::json::from_cbor(received.substr(sizeof size, size)).get_to(message);
    received.erase(0, sizeof size + size);
    return true;
}

template std::string encode(const request &message);
template std::string encode(const reply &message);
template bool decode(std::string &received, request &message);
template bool decode(std::string &received, reply &message);
