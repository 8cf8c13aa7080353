#include "cli/run/ordered_output.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "cli/run/stop.h"
#include "cli/write/format.h"
#include "cli/write/value_text.h"

namespace {

void write_result(ordered_output &out, const std::string &text) {
    if (text.empty() || output_failed(out)) return;
    clear_progress(out.bar);
    const int code = write_all(STDOUT_FILENO, text.data(), text.size());
    if (code == EPIPE) {
        out.reader_gone = true;
    } else if (code != 0) {
        out.write_error = code;
    }
}

// A part of the index could not be written.
void note_index_failure(ordered_output &out, const failure &failed) {
    if (!failed) return;
    out.a_file_failed = true;
    write_message(out, "tavo: " + failed.sentence + "\n");
}

void write_reply(ordered_output &out, const reply &made) {
    if (made.status == outcome::stopped) return;
    note_index_failure(out, {add_report_row(out.index, made.row)});
    if (made.status == outcome::failed) out.a_file_failed = true;
    write_result(out, made.result);
    if (!output_failed(out)) write_message(out, made.message);
}

}  // namespace

failure start_output(ordered_output &out, const options &opts) {
    failure failed = {begin_report_index(out.index, opts)};
    if (failed) return failed;
    struct stat info {};
    out.to_pipe = fstat(STDOUT_FILENO, &info) == 0 && S_ISFIFO(info.st_mode);
    out.bar = start_progress(opts.quiet);
    write_result(out, format_head(opts.format));
    return {};
}

void set_total(ordered_output &out, size_t total) {
    out.total = total;
    out.bar.total = total;
}

void accept_reply(ordered_output &out, size_t index, reply &&made) {
    if (made.status != outcome::stopped) ++out.done;
    out.waiting.emplace(index, std::move(made));
    auto first = out.waiting.begin();
    while (first != out.waiting.end() && first->first == out.next) {
        write_reply(out, first->second);
        first = out.waiting.erase(first);
        ++out.next;
    }
}

void write_message(ordered_output &out, const std::string &text) {
    if (text.empty()) return;
    clear_progress(out.bar);
    write_all(STDERR_FILENO, text.data(), text.size());
}

void note_reader_gone(ordered_output &out) {
    out.reader_gone = true;
}

bool output_failed(const ordered_output &out) {
    return out.reader_gone || out.write_error != 0;
}

int redraw_timeout_ms(const ordered_output &out) {
    return out.bar.shown ? kRedrawMs : -1;
}

void redraw(ordered_output &out) {
    draw_progress(out.bar, out.done);
}

int finish_output(ordered_output &out, const options &opts, bool has_other_error) {
    clear_progress(out.bar);
    note_index_failure(out, {finish_report_index(out.index, opts)});
    if (out.write_error != 0) {
        write_message(
            out,
            "tavo: " + system_sentence("The results cannot be written", out.write_error) + "\n");
    }
    if (stop_signal() != 0) {
        const std::string done =
            out.total == 0 ? count_text(out.done, "file")
                           : std::to_string(out.done) + " of " + count_text(out.total, "file");
        write_message(out, "tavo: stopped; " + done + " done.\n");
        return kExitSignal + stop_signal();
    }
    if (out.reader_gone) return kExitSignal + SIGPIPE;
    return out.a_file_failed || out.write_error != 0 || has_other_error ? kExitFailed : kExitOk;
}
