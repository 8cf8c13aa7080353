#include "cli/progress.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <string>

namespace {

constexpr double kFirstDrawSeconds = 1.0;  // shorter work needs no bar
constexpr size_t kMostBarColumns = 40;
constexpr size_t kUsualColumns = 80;

size_t terminal_columns() {
    winsize size{};
    if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kUsualColumns;
    return size.ws_col;
}

std::string time_left(double seconds) {
    const long long whole = std::llround(seconds);
    std::array<char, 48> text{};
    if (whole >= 3600) {
        snprintf(text.data(), text.size(), "%lld:%02lld:%02lld left", whole / 3600, whole / 60 % 60,
                 whole % 60);
    } else {
        snprintf(text.data(), text.size(), "%lld:%02lld left", whole / 60, whole % 60);
    }
    return text.data();
}

std::string numbers(const progress &bar, size_t done, double seconds) {
    std::array<char, 96> text{};
    const double rate = static_cast<double>(done) / seconds;
    snprintf(text.data(), text.size(), " %zu/%zu files, %.1f a minute, ", done, bar.total,
             rate * 60.0);
    const std::string left =
        done == 0 ? "time unknown" : time_left(static_cast<double>(bar.total - done) / rate);
    return text.data() + left;
}

}  // namespace

progress start_progress(size_t total, bool quiet) {
    progress bar;
    bar.shown = !quiet && total > 1 && isatty(STDERR_FILENO) == 1;
    bar.total = total;
    bar.started = std::chrono::steady_clock::now();
    return bar;
}

void draw_progress(progress &bar, size_t done) {
    if (!bar.shown) return;
    const std::chrono::duration<double> run = std::chrono::steady_clock::now() - bar.started;
    if (run.count() < kFirstDrawSeconds) return;

    const std::string tail = numbers(bar, done, run.count());
    const size_t columns = terminal_columns() - 1;  // the last one makes some terminals wrap
    const size_t room = columns > tail.size() + 2 ? columns - tail.size() - 2 : 0;
    const size_t width = std::min(room, kMostBarColumns);
    std::string line;
    if (width > 0) {
        const size_t filled = width * done / bar.total;
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
