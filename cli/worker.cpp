#include "cli/worker.h"

#include <unistd.h>

#include <cerrno>
#include <exception>

#include "cli/analyse.h"
#include "cli/format.h"
#include "cli/markers.h"
#include "cli/names.h"
#include "cli/output_file.h"
#include "cli/plot.h"

namespace {

std::string write_markers(record &result, const options &opts, const std::string &target) {
    output_file file;
    std::string error = begin_output(file, target);
    if (error.empty()) error = write_output(file, marker_content(result, opts));
    if (error.empty()) error = commit_output(file, opts.force);
    abandon_output(file);
    if (error.empty()) result.written = target;
    return error;
}

// The analysis and its picture, when one is wanted. A target that cannot be written is found out
// before the work is done.
record analyse_and_draw(const std::string &path, const options &opts, int stop_fd) {
    if (opts.plot.empty()) return analyse(path, opts, stop_fd);
    const std::string error = check_plot(opts.plot, path, opts.force);
    if (!error.empty()) return failed_record(path, opts.mode, error);
    record out = analyse(path, opts, stop_fd);
    if (out.status == outcome::ok) draw_plot(out, opts, stop_fd);
    return out;
}

// As above, and the file that the format makes of its own.
record analyse_and_write(const std::string &path, const options &opts, int stop_fd) {
    if (!writes_files(opts.format)) return analyse_and_draw(path, opts, stop_fd);
    const std::string target = marker_path(path, opts);
    std::string error = check_target(target, opts.force);
    if (!error.empty()) return failed_record(path, opts.mode, error);
    record out = analyse_and_draw(path, opts, stop_fd);
    if (out.status != outcome::ok) return out;
    error = write_markers(out, opts, target);
    return error.empty() ? out : failed_record(path, opts.mode, error);
}

reply answer(const std::string &path, const options &opts, int stop_fd) {
    try {
        return make_reply(analyse_and_write(path, opts, stop_fd), opts);
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

bool read_request(int fd, uint64_t &index, std::string &path) {
    request_head head{};
    if (!read_all(fd, &head, sizeof head)) return false;
    index = head.index;
    path.resize(head.path_bytes);
    return read_all(fd, path.data(), path.size());
}

}  // namespace

reply make_reply(const record &result, const options &opts) {
    reply out;
    out.status = result.status;
    out.result = format_record(opts.format, result);
    if (result.status == outcome::failed) {
        out.message = "tavo: " + shown(result.file) + ": " + result.error + "\n";
    }
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
    uint64_t index = 0;
    std::string path;
    while (read_request(request_fd, index, path)) {
        const reply made = answer(path, opts, request_fd);
        const reply_head head = {index, made.status, static_cast<uint32_t>(made.result.size()),
                                 static_cast<uint32_t>(made.message.size())};
        std::string sent(reinterpret_cast<const char *>(&head), sizeof head);
        sent += made.result;
        sent += made.message;
        if (write_all(reply_fd, sent.data(), sent.size()) != 0) break;
    }
    return 0;
}
