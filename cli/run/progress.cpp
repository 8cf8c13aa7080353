#include "cli/run/progress.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <string>

#include "cli/write/value_text.h"

namespace {

constexpr double kFirstDrawSeconds = 1.0;  // shorter work has no bar
constexpr size_t kMostBarColumns = 40;
constexpr size_t kUsualColumns = 80;

size_t terminal_columns() {
    winsize size{};
    if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kUsualColumns;
    return size.ws_col;
}

std::string numbers(size_t done, size_t total, double seconds) {
    const double rate = static_cast<double>(done) / seconds;
    std::array<char, 48> speed{};
    snprintf(speed.data(), speed.size(), ", %.1f a minute", rate * 60.0);
    if (total == 0) return count_text(done, "file") + speed.data();
    const double left_ms = 1000.0 * static_cast<double>(total - done) / rate;
    return " " + std::to_string(done) + "/" + std::to_string(total) + " files" + speed.data() +
           (done == 0 ? ", time unknown" : ", " + whole_clock_text(left_ms) + " left");
}

}  // namespace

progress start_progress(bool quiet) {
    progress bar;
    bar.shown = !quiet && isatty(STDERR_FILENO) == 1;
    bar.started = std::chrono::steady_clock::now();
    return bar;
}

void draw_progress(progress &bar, size_t done, size_t total) {
    if (!bar.shown || total == 1) return;
    const std::chrono::duration<double> run = std::chrono::steady_clock::now() - bar.started;
    if (run.count() < kFirstDrawSeconds) return;

    const std::string tail = numbers(done, total, run.count());
    const size_t columns = terminal_columns() - 1;  // some terminals wrap after the last column
    const size_t room = columns > tail.size() + 2 ? columns - tail.size() - 2 : 0;
    const size_t width = std::min(room, kMostBarColumns);
    std::string line;
    if (width > 0 && total > 0) {
        const size_t filled = width * done / total;
        line = "[" + std::string(filled, '#') + std::string(width - filled, '-') + "]";
    }
    line = (line + tail).substr(0, columns);
    fprintf(stderr, "\r%s\x1b[K", line.c_str());
    fflush(stderr);
    bar.drawn = true;
}

void clear_progress(progress &bar) {
    if (!bar.drawn) return;
    fputs("\r\x1b[K", stderr);
    fflush(stderr);
    bar.drawn = false;
}
