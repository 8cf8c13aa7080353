#include "cli/run/worker.h"

#include <unistd.h>

#include <cerrno>
#include <exception>
#include <functional>
#include <iterator>

#include "cli/report/plot.h"
#include "cli/report/report.h"
#include "cli/run/analyse.h"
#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "cli/write/output_file.h"

namespace {

struct request {
    uint64_t index = 0;
    std::string path;
    std::string recalled;  // the result, when it is not to be found again
};

record result_of(const request &asked, const options &opts, int stop_fd) {
    if (asked.recalled.empty()) return analyse(asked.path, opts, stop_fd);
    record out = record_from_json(asked.recalled);
    out.file = asked.path;
    out.length_s = opts.length_s;
    return out;
}

// A file that is written beside the result: a target that cannot be written is found out before the
// work is done. write enters what goes wrong into the record.
struct companion {
    bool wanted;
    std::string refusal;
    std::function<void(record &)> write;
};

std::string write_markers(record &result, const options &opts, const std::string &target) {
    const std::string error = write_file(target, marker_content(result, opts), opts.force);
    if (error.empty()) result.written = target;
    return error;
}

companion markers_of(const request &asked, const options &opts) {
    if (!writes_files(opts.format)) return {};
    const std::string target = marker_path(asked.path, opts);
    return {true, check_target(target, opts.force), [=](record &result) {
                const std::string error = write_markers(result, opts, target);
                if (!error.empty()) result = failed_record(result.file, result.mode, error);
            }};
}

companion picture_of(const request &asked, const options &opts, int stop_fd) {
    if (opts.plot.empty()) return {};
    return {true, check_plot(opts.plot, asked.path, opts.force),
            [=](record &result) { draw_plot(result, opts, stop_fd); }};
}

companion page_of(const request &asked, const options &opts, int stop_fd, std::string &row) {
    if (opts.report.empty()) return {};
    const std::string target = report_page_path(opts, asked.index, asked.path);
    return {true, check_report(target, opts.force),
            [=, &row](record &result) { write_report_page(result, opts, target, stop_fd, row); }};
}

record analyse_and_write(const request &asked, const options &opts, int stop_fd, std::string &row) {
    const companion companions[] = {picture_of(asked, opts, stop_fd),
                                    page_of(asked, opts, stop_fd, row), markers_of(asked, opts)};
    for (const companion &each : companions) {
        if (!each.refusal.empty()) return failed_record(asked.path, opts.mode, each.refusal);
    }
    record out = result_of(asked, opts, stop_fd);
    for (const companion &each : companions) {
        if (each.wanted && out.status == outcome::ok) each.write(out);
    }
    return out;
}

reply answer(const request &asked, const options &opts, int stop_fd) {
    try {
        std::string row;
        const record result = analyse_and_write(asked, opts, stop_fd, row);
        reply out = make_reply(result, opts);
        if (result.status == outcome::ok) out.row = row;
        return out;
    } catch (const std::exception &) {  // the strings' memory is all that can fail here
        reply out;
        out.message = "tavo: there is not enough memory for the result of a file.\n";
        return out;
    }
}

bool read_all(int fd, void *data, size_t size) {
    for (size_t done = 0; done < size;) {
        const ssize_t got = read(fd, static_cast<char *>(data) + done, size - done);
        if (got == 0 || (got < 0 && errno != EINTR)) return false;
        if (got > 0) done += static_cast<size_t>(got);
    }
    return true;
}

bool read_request(int fd, request &asked) {
    request_head head{};
    if (!read_all(fd, &head, sizeof head)) return false;
    asked.index = head.index;
    asked.path.resize(head.path_bytes);
    asked.recalled.resize(head.recalled_bytes);
    return read_all(fd, asked.path.data(), asked.path.size()) &&
           read_all(fd, asked.recalled.data(), asked.recalled.size());
}

}  // namespace

bool needs_json(const options &opts) {
    return !opts.forecast.empty() || (!opts.store.empty() && !opts.from_store);
}

reply make_reply(const record &result, const options &opts) {
    reply out;
    out.status = result.status;
    out.result = format_record(opts.format, result);
    if (result.status == outcome::failed) {
        out.message = "tavo: " + shown(result.file) + ": " + result.error + "\n";
        if (!opts.report.empty()) out.row = report_index_row(result, {}, "");
    }
    if (needs_json(opts) && result.status != outcome::stopped) out.json = json_record(result);
    return out;
}

int write_all(int fd, const char *data, size_t size) {
    for (size_t done = 0; done < size;) {
        const ssize_t got = write(fd, data + done, size - done);
        if (got < 0 && errno != EINTR) return errno;
        if (got > 0) done += static_cast<size_t>(got);
    }
    return 0;
}

int serve_requests(int request_fd, int reply_fd, const options &opts) {
    request asked;
    while (read_request(request_fd, asked)) {
        const reply made = answer(asked, opts, request_fd);
        reply_head head = {asked.index, made.status, {}};
        std::string texts;
        for (size_t i = 0; i < std::size(kReplyTexts); ++i) {
            const std::string &text = made.*kReplyTexts[i];
            head.text_bytes[i] = static_cast<uint32_t>(text.size());
            texts += text;
        }
        const std::string sent(reinterpret_cast<const char *>(&head), sizeof head);
        if (write_all(reply_fd, (sent + texts).data(), sent.size() + texts.size()) != 0) break;
    }
    return 0;
}
