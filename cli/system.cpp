#include "cli/system.h"

#include <poll.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <cstring>

#include "cli/options.h"

namespace {

constexpr int kStopSignals[] = {SIGINT, SIGTERM, SIGHUP};

volatile sig_atomic_t first_stop = 0;
temporary_file *own_file = nullptr;

void on_stop(int number) {
    if (first_stop != 0) _exit(kExitSignal + number);
    first_stop = number;
}

void on_end(int /*number*/) {
    remove_file(*own_file);
    _exit(EXIT_FAILURE);
}

// Installs a signal handler without SA_RESTART, so that the signal interrupts a blocked call.
// Returns the previous handler.
auto set_handler(int number, void (*handler)(int)) {
    struct sigaction action {};
    struct sigaction before {};
    action.sa_handler = handler;
    sigemptyset(&action.sa_mask);
    sigaction(number, &action, &before);
    return before.sa_handler;
}

}  // namespace

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

int wait_for_end(pid_t pid) {
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    return status;
}

std::string ending_text(int status) {
    if (WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        return "by signal " + std::to_string(number) + " (" + strsignal(number) + ")";
    }
    return "with status " + std::to_string(WEXITSTATUS(status));
}

void watch_for_stop() {
    for (const int number : kStopSignals) {
        // A command started by nohup continues after a SIGHUP.
        const bool was_ignored = set_handler(number, on_stop) == SIG_IGN;
        if (was_ignored && number == SIGHUP) set_handler(number, SIG_IGN);
    }
    set_handler(SIGPIPE, SIG_IGN);
    set_handler(SIGXFSZ, SIG_IGN);  // writing beyond the size limit returns an error
}

int stop_signal() {
    return first_stop;
}

std::shared_ptr<temporary_file> share_temporary_file() {
    void *memory = mmap(nullptr, sizeof(temporary_file), PROT_READ | PROT_WRITE,
                        MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) return nullptr;
    return {static_cast<temporary_file *>(memory),
            [](temporary_file *file) { munmap(file, sizeof *file); }};
}

void set_worker_signals(temporary_file &file) {
    own_file = &file;
    set_handler(SIGALRM, on_end);
    for (const int number : kStopSignals) set_handler(number, SIG_IGN);
}

void note_temporary_file(const std::string &path) {
    if (own_file == nullptr || path.size() >= PATH_MAX) return;
    // The first character is written last, so that the path counts as empty until it is complete.
    own_file->path[0] = '\0';
    if (!path.empty()) memcpy(own_file->path + 1, path.c_str() + 1, path.size());
    own_file->path[0] = path.c_str()[0];
}

void remove_file(temporary_file &file) {
    if (file.path[0] != '\0') unlink(file.path);
    file.path[0] = '\0';
}
