#include "cli/run/ordered_output.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "cli/run/stop.h"
#include "cli/system.h"
#include "cli/write/format.h"
#include "cli/write/value_text.h"

namespace {

void write_result(ordered_output &output, const std::string &text) {
    if (text.empty() || output_failed(output)) return;
    clear_progress(output.bar);
    const int code = write_all(STDOUT_FILENO, text);
    output.reader_gone = code == EPIPE;
    if (code != EPIPE) output.write_error = code;
}

// Records that part of the index could not be written.
void note_index_failure(ordered_output &output, const failure &failed) {
    if (!failed) return;
    output.a_file_failed = true;
    write_message(output, "tavo: " + failed.sentence + "\n");
}

void write_reply(ordered_output &output, const reply &answer) {
    if (answer.status == outcome::stopped) return;
    note_index_failure(output, add_report_row(output.index, answer.row));
    if (answer.status == outcome::failed) output.a_file_failed = true;
    write_result(output, answer.result);
    if (!output_failed(output)) write_message(output, answer.message);
}

}  // namespace

failure start_output(ordered_output &output, const options &opts) {
    if (failure failed = begin_report_index(output.index, opts)) return failed;
    struct stat info {};
    output.to_pipe = fstat(STDOUT_FILENO, &info) == 0 && S_ISFIFO(info.st_mode);
    output.bar = start_progress(opts.quiet);
    write_result(output, format_head(opts.format));
    return {};
}

void accept_reply(ordered_output &output, size_t index, reply &&answer) {
    if (answer.status != outcome::stopped) ++output.done;
    output.waiting.emplace(index, std::move(answer));
    auto first = output.waiting.begin();
    while (first != output.waiting.end() && first->first == output.next) {
        write_reply(output, first->second);
        first = output.waiting.erase(first);
        ++output.next;
    }
}

void write_message(ordered_output &output, const std::string &text) {
    if (text.empty()) return;
    clear_progress(output.bar);
    write_all(STDERR_FILENO, text);
}

bool output_failed(const ordered_output &output) {
    return output.reader_gone || output.write_error != 0;
}

int finish_output(ordered_output &output, const options &opts, bool has_other_error) {
    clear_progress(output.bar);
    note_index_failure(output, finish_report_index(output.index, opts));
    if (output.write_error != 0) {
        write_message(
            output,
            "tavo: " + system_sentence("The results cannot be written", output.write_error) + "\n");
    }
    if (stop_signal() != 0) {
        const std::string total = output.total == 0 ? "" : std::to_string(output.done) + " of ";
        const size_t counted = output.total == 0 ? output.done : output.total;
        write_message(output, "tavo: stopped; " + total + count_text(counted, "file") + " done.\n");
        return kExitSignal + stop_signal();
    }
    if (output.reader_gone) return kExitSignal + SIGPIPE;
    return output.a_file_failed || output.write_error != 0 || has_other_error ? kExitFailed
                                                                              : kExitOk;
}
