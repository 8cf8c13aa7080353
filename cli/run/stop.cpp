#include "cli/run/stop.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "cli/options.h"
#include "cli/system.h"

namespace {

constexpr int kSignals[] = {SIGINT, SIGTERM, SIGHUP};

volatile sig_atomic_t received = 0;
int wake_fd = -1;  // eventfd

void on_signal(int number) {
    const int saved = errno;
    if (received != 0) _exit(kExitSignal + number);
    received = number;
    eventfd_write(wake_fd, 1);
    errno = saved;
}

}  // namespace

bool watch_for_stop() {
    wake_fd = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (wake_fd < 0) return false;
    for (const int number : kSignals) {
        // A command started by nohup continues after a SIGHUP.
        const bool was_ignored = set_signal_handler(number, on_signal) == SIG_IGN;
        if (was_ignored && number == SIGHUP) set_signal_handler(SIGHUP, SIG_IGN);
    }
    set_signal_handler(SIGPIPE, SIG_IGN);
    set_signal_handler(SIGXFSZ, SIG_IGN);  // writing beyond the size limit returns an error
    return true;
}

void ignore_stop_signals() {
    for (const int number : kSignals) set_signal_handler(number, SIG_IGN);
    close(wake_fd);
}

int stop_signal() {
    return received;
}

int stop_fd() {
    return wake_fd;
}
