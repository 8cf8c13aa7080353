#include "cli/run/worker_process.h"

#include <malloc.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
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

// Bytes.
constexpr int kHeapAtStart = 28 << 20;       // the buffers of a song of three minutes
constexpr int kLargestHeapBlock = 4 << 20;   // larger blocks get mappings of their own
constexpr int kLargestThreshold = 32 << 20;  // that malloc accepts
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

// True if results go into a store.
bool is_stored(const options &opts) {
    return !opts.store.empty() && !opts.from_store;
}

// A file that is written besides the result. refusal: the target cannot be written, which is
// checked before the analysis. write turns the record into a failed one if it fails.
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
    // The file of a run that was killed before it committed the row.
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

companion markers_of(const request &message, const options &opts) {
    if (!writes_files(opts.format)) return {};
    const std::string target = marker_path(message.path, opts);
    // With a store an existing file may be this song's: write_markers compares.
    return {true, check_target(target, opts.force || is_stored(opts)),
            [=](record &result) { write_markers(result, opts, target); }};
}

companion page_of(const request &message, const options &opts, int stop_fd, std::string &row) {
    if (opts.report.empty()) return {};
    const std::string target = report_page_path(opts, message.index, message.path);
    return {true, check_report(target, opts.force),
            [=, &row](record &result) { write_report_page(result, opts, target, stop_fd, row); }};
}

companion clip_of(const request &message, const options &opts, int stop_fd, const song_file &song) {
    if (opts.clip.empty()) return {};
    const std::string target = clip_path(message.path, opts);
    return {true, check_target(target, opts.force),
            [=, &opts, &song](record &result) { write_clip(result, opts, target, stop_fd, song); }};
}

// is_storable becomes false if only writing such a file failed: the store does not record that as a
// failure of the song.
record analyse_and_write(const request &message, const options &opts, int stop_fd, std::string &row,
                         bool &is_storable) {
    song_file song;
    const companion companions[] = {page_of(message, opts, stop_fd, row), markers_of(message, opts),
                                    clip_of(message, opts, stop_fd, song)};
    for (const companion &each : companions) {
        is_storable = each.refusal.empty();
        if (!is_storable) return failed_record(message.path, opts.mode, each.refusal);
    }
    record out = find_result(message, opts, stop_fd, song);
    const bool is_ok = out.status == outcome::ok;
    for (const companion &each : companions) {
        if (each.wanted && out.status == outcome::ok) each.write(out);
    }
    close_song(song);
    is_storable = !is_ok || out.status == outcome::ok;
    return out;
}

// Each job reuses the heap of the one before instead of asking the system for new pages. The heap
// starts large enough for a song, in huge pages: one page fault instead of 512.
void prepare_heap() {
    mallopt(M_TRIM_THRESHOLD, kFreeMemoryKept);
    mallopt(M_MMAP_THRESHOLD, kLargestThreshold);  // the block below comes from the heap
    const auto page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    void *block = nullptr;
    if (posix_memalign(&block, page, kHeapAtStart) == 0) {
        madvise(block, kHeapAtStart, MADV_HUGEPAGE);
        free(block);
    }
    mallopt(M_MMAP_THRESHOLD, kLargestHeapBlock);
}

reply make_answer(const request &message, const options &opts, int stop_fd) {
    std::string row;
    bool is_storable = true;
    const record result = analyse_and_write(message, opts, stop_fd, row, is_storable);
    reply out = make_reply(result, opts);
    if (!is_storable) out.json.clear();
    if (result.status == outcome::ok) out.row = row;
    return out;
}

// Returns the reply as it is sent.
std::string encoded_answer(const request &message, const options &opts, int stop_fd) {
    try {
        return encode(make_answer(message, opts, stop_fd));
    } catch (const std::exception &) {  // only allocations can fail here
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
    prepare_heap();
    std::string received;
    char part[4096];
    while (true) {
        const ssize_t got = read(request_fd, part, sizeof part);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) return kExitOk;
        received.append(part, static_cast<size_t>(got));
        request message;
        if (!decode(received, message)) continue;
        const std::string answer_text = encoded_answer(message, opts, request_fd);
        if (write_all(reply_fd, answer_text.data(), answer_text.size()) != 0) return kExitOk;
    }
}
