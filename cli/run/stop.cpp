#include "cli/run/stop.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "cli/options.h"

namespace {

constexpr int kSignals[] = {SIGINT, SIGTERM, SIGHUP};

volatile sig_atomic_t received = 0;
int wake_pipe[2] = {-1, -1};

void on_signal(int number) {
    const int saved = errno;
    if (received != 0) _exit(kExitSignal + number);
    received = number;
    const char byte = 1;
    const ssize_t written = write(wake_pipe[1], &byte, 1);
    static_cast<void>(written);  // the pipe is empty: one byte always fits
    errno = saved;
}

void set_handler(int number, void (*handler)(int)) {
    struct sigaction action {};
    action.sa_handler = handler;
    sigemptyset(&action.sa_mask);
    sigaction(number, &action, nullptr);  // no SA_RESTART: a blocked read must return
}

bool is_ignored(int number) {
    struct sigaction action {};
    return sigaction(number, nullptr, &action) == 0 && action.sa_handler == SIG_IGN;
}

}  // namespace

bool watch_for_stop() {
    if (pipe2(wake_pipe, O_CLOEXEC | O_NONBLOCK) != 0) return false;
    set_handler(SIGINT, on_signal);
    set_handler(SIGTERM, on_signal);
    if (!is_ignored(SIGHUP)) set_handler(SIGHUP, on_signal);  // nohup
    set_handler(SIGPIPE, SIG_IGN);
    set_handler(SIGXFSZ, SIG_IGN);  // writing beyond the size limit returns an error
    return true;
}

void ignore_stop_signals() {
    for (const int number : kSignals) set_handler(number, SIG_IGN);
    close(wake_pipe[0]);
    close(wake_pipe[1]);
}

bool stop_requested() {
    return received != 0;
}

int stop_signal() {
    return received;
}

int stop_fd() {
    return wake_pipe[0];
}
