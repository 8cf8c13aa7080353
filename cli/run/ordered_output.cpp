#include "cli/run/ordered_output.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>

#include "cli/system.h"
#include "cli/write/format.h"
#include "cli/write/value_text.h"

namespace {

constexpr double kFirstDrawSeconds = 1.0;  // shorter work has no progress line
constexpr size_t kMostBarColumns = 40;
constexpr size_t kUsualColumns = 80;
constexpr const char *kClearLine = "\r\x1b[K";

void clear_progress(ordered_output &output) {
    if (output.is_drawn) write_all(STDERR_FILENO, kClearLine);
    output.is_drawn = false;
}

void write_result(ordered_output &output, const std::string &text) {
    if (text.empty() || output.write_error != 0) return;
    clear_progress(output);
    output.write_error = write_all(STDOUT_FILENO, text);
}

void write_reply(ordered_output &output, const reply &answer) {
    if (answer.status == outcome::stopped) return;
    report_failure(output, add_report_row(output.index, answer.row));
    if (answer.status == outcome::failed) output.has_failure = true;
    write_result(output, answer.result);
    if (output.write_error == 0) write_message(output, answer.message);
}

std::string progress_text(const ordered_output &output, double seconds) {
    const double per_second = static_cast<double>(output.done) / seconds;
    const std::string speed = formatted(", %.1f a minute", per_second * 60.0);
    if (output.total == 0) return count_text(output.done, "file") + speed;
    const std::string text = formatted(" %zu/%zu files", output.done, output.total) + speed;
    if (output.done == 0) return text;
    const double left_ms = 1000.0 * static_cast<double>(output.total - output.done) / per_second;
    return text + ", " + whole_clock_text(left_ms) + " left";
}

}  // namespace

failure start_output(ordered_output &output, const options &opts) {
    if (failure failed = begin_report_index(output.index, opts)) return failed;
    output.has_bar = !opts.quiet && isatty(STDERR_FILENO) == 1;
    output.started = std::chrono::steady_clock::now();
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
    clear_progress(output);
    write_all(STDERR_FILENO, text);
}

bool report_failure(ordered_output &output, const failure &failed) {
    if (!failed) return false;
    output.has_failure = true;
    write_message(output, "tavo: " + failed.sentence + "\n");
    return true;
}

void draw_progress(ordered_output &output) {
    if (!output.has_bar || output.total == 1) return;
    const std::chrono::duration<double> run = std::chrono::steady_clock::now() - output.started;
    if (run.count() < kFirstDrawSeconds) return;

    winsize terminal{};
    ioctl(STDERR_FILENO, TIOCGWINSZ, &terminal);
    // Some terminals wrap after the last column, so it stays empty.
    const size_t columns = (terminal.ws_col > 0 ? terminal.ws_col : kUsualColumns) - 1;
    const std::string text = progress_text(output, run.count());
    std::string line;
    if (output.total > 0 && columns > text.size() + 2) {
        const size_t width = std::min(columns - text.size() - 2, kMostBarColumns);
        const size_t filled = width * output.done / output.total;
        line = "[" + std::string(filled, '#') + std::string(width - filled, '-') + "]";
    }
    write_all(STDERR_FILENO, "\r" + (line + text).substr(0, columns) + "\x1b[K");
    output.is_drawn = true;
}

int finish_output(ordered_output &output, const options &opts) {
    clear_progress(output);
    report_failure(output, finish_report_index(output.index, opts));
    if (output.write_error != 0 && output.write_error != EPIPE) {
        report_failure(output,
                       {system_sentence("The results cannot be written", output.write_error)});
    }
    if (stop_signal() != 0) {
        const std::string total = output.total == 0 ? "" : std::to_string(output.done) + " of ";
        const size_t counted = output.total == 0 ? output.done : output.total;
        write_message(output, "tavo: stopped; " + total + count_text(counted, "file") + " done.\n");
        return kExitSignal + stop_signal();
    }
    if (output.write_error == EPIPE) return kExitSignal + SIGPIPE;
    return output.has_failure ? kExitFailed : kExitOk;
}
