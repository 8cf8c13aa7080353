#include "cli/system.h"

#include <poll.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace {

temporary_file *own_file = nullptr;

void on_signal(int /*number*/) {
    remove_file(*own_file);
    _exit(EXIT_FAILURE);
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

signal_handler set_signal_handler(int number, signal_handler handler) {
    struct sigaction action {};
    struct sigaction before {};
    action.sa_handler = handler;
    sigemptyset(&action.sa_mask);
    sigaction(number, &action, &before);
    return before.sa_handler;
}

int wait_for_end(pid_t &pid) {
    int status = 0;
    while (waitpid(pid, &status, 0) < 0 && errno == EINTR) {
    }
    pid = -1;
    return status;
}

std::string ending_text(int status) {
    if (WIFSIGNALED(status)) {
        const int number = WTERMSIG(status);
        return "by signal " + std::to_string(number) + " (" + strsignal(number) + ")";
    }
    return "with status " + std::to_string(WEXITSTATUS(status));
}

std::shared_ptr<temporary_file> share_temporary_file() {
    void *memory = mmap(nullptr, sizeof(temporary_file), PROT_READ | PROT_WRITE,
                        MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) return nullptr;
    return {static_cast<temporary_file *>(memory),
            [](temporary_file *file) { munmap(file, sizeof *file); }};
}

int remove_file_at_signal(temporary_file &file) {
    own_file = &file;
    set_signal_handler(SIGALRM, on_signal);
    return SIGALRM;
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
