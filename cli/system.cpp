#include "cli/system.h"

#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

void close_fd(int &fd) {
    if (fd >= 0) close(fd);
    fd = -1;
}

bool is_readable(int fd) {
    pollfd watched = {fd, POLLIN, 0};
    return poll(&watched, 1, 0) > 0;
}

int write_all(int fd, std::string_view bytes) {
    while (!bytes.empty()) {
        const ssize_t written = write(fd, bytes.data(), bytes.size());
        if (written < 0 && errno != EINTR) return errno;
        if (written > 0) bytes.remove_prefix(static_cast<size_t>(written));
    }
    return 0;
}

sighandler_t set_signal_handler(int number, sighandler_t handler) {
    struct sigaction action {};
    struct sigaction before {};
    action.sa_handler = handler;
    sigemptyset(&action.sa_mask);
    sigaction(number, &action, &before);
    return before.sa_handler;
}

std::string ending_text(int status) {
    if (WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        return "by signal " + std::to_string(number) + " (" + strsignal(number) + ")";
    }
    return "with status " + std::to_string(WEXITSTATUS(status));
}
