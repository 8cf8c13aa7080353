#include "cli/run/worker_process.h"

#include <malloc.h>
#include <sys/mman.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
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

namespace {

// Bytes.
constexpr int kHeapAtStart = 28 << 20;       // the buffers of a song of three minutes
constexpr int kLargestHeapBlock = 4 << 20;   // larger blocks get separate mappings
constexpr int kLargestThreshold = 32 << 20;  // largest value that malloc accepts
constexpr int kFreeMemoryKept = 64 << 20;

// Returns the stored result, or analyses the file.
record find_result(const request &message, const options &opts, int stop_fd, song_file &song) {
    if (message.stored.empty()) return analyse(message.path, opts, stop_fd, song);
    record out;
    try {
        out = record_from_json(message.stored);
    } catch (const nlohmann::json::exception &) {
        out.mode = opts.mode;
        out.error = "Its row in the store is damaged.";
    }
    out.file = message.path;
    out.length_s = opts.length_s;
    const bool is_decoded = !out.decoder.empty() && !opts.report.empty() &&
                            !open_song(message.path, stop_fd, song) &&
                            !decode_song(message.path, opts, stop_fd, song);
    if (is_decoded) out.sound_path = song.path;
    return out;
}

// True if results go to a store.
bool is_stored(const options &opts) {
    return !opts.store.empty() && !opts.from_store;
}

bool has_content(const std::string &path, const std::string &content) {
    std::ifstream file(path, std::ios::binary);
    const std::string there((std::istreambuf_iterator<char>(file)), {});
    return file && there == content;
}

failure write_markers(record &result, const options &opts, const std::string &target) {
    const std::string content = marker_content(result, opts);
    // A command that was killed before it committed the row may have left the file.
    if (!is_stored(opts) || !has_content(target, content)) {
        if (failure failed = write_file(target, content, opts.force)) return failed;
    }
    result.written = target;
    return {};
}

// Files written in addition to the result. A path is empty if its file was not requested.
struct side_files {
    std::string page;
    std::string markers;
    std::string clip;
};

side_files find_side_files(const request &message, const options &opts) {
    side_files out;
    if (!opts.report.empty()) out.page = report_page_path(opts, message.index, message.path);
    if (opts.markers != nullptr) out.markers = marker_path(message.path, opts);
    if (!opts.clip.empty()) out.clip = clip_path(message.path, opts);
    return out;
}

// Checks, before the analysis, that the files can be written.
failure check_side_files(const side_files &files, const options &opts) {
    failure failed;
    if (!files.page.empty()) failed = check_report(files.page, opts.force);
    // With a store an existing file may be this song's, so write_markers compares it.
    const bool may_exist = opts.force || is_stored(opts);
    if (!failed && !files.markers.empty()) failed = check_target(files.markers, may_exist);
    if (!failed && !files.clip.empty()) failed = check_target(files.clip, opts.force);
    return failed;
}

reply analyse_and_write(const request &message, const options &opts, int stop_fd) {
    const side_files files = find_side_files(message, opts);
    const failure refused = check_side_files(files, opts);
    if (refused) {
        reply out = make_reply(failed_record(message.path, opts.mode, refused.sentence), opts);
        out.json.clear();
        return out;
    }
    song_file song;
    std::string row;
    record result = find_result(message, opts, stop_fd, song);
    failure failed;
    if (result.status == outcome::ok) {
        if (!files.page.empty()) {
            failed = write_report_page(result, opts, files.page, stop_fd, row);
        }
        if (!failed && !files.markers.empty()) failed = write_markers(result, opts, files.markers);
        if (!failed && !files.clip.empty()) {
            failed = write_clip(result, opts, files.clip, stop_fd, song);
        }
    }
    close_song(song);
    if (failed) {
        result = failed_record(message.path, opts.mode, failed.sentence);
        if (is_readable(stop_fd)) result.status = outcome::stopped;
    }
    reply out = make_reply(result, opts);
    if (result.status == outcome::ok) out.row = row;
    // The store does not record a failure to write a file.
    if (failed) out.json.clear();
    return out;
}

std::string serve(const request &message, const options &opts, int stop_fd) {
    try {
        return encode(analyse_and_write(message, opts, stop_fd));
    } catch (const std::exception &) {  // only allocations can fail here
        const char *error = "There is not enough memory for the result.";
        reply out = make_reply(failed_record(message.path, opts.mode, error), opts);
        out.json.clear();
        return encode(out);
    }
}

// Each job reuses the heap of the one before instead of asking the system for new pages. The heap
// starts large enough for a song, in huge pages: one page fault instead of 512.
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
    if (opts.failed) {  // here a stored failure is a result
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
