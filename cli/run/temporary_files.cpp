#include "cli/run/temporary_files.h"

#include <sys/mman.h>
#include <unistd.h>

#include <csignal>
#include <cstring>

#include "cli/options.h"
#include "cli/system.h"

namespace {

temporary_files *own_files = nullptr;

void on_signal(int /*number*/) {
    remove_files(*own_files);
    _exit(kExitFailed);
}

}  // namespace

std::shared_ptr<temporary_files> make_temporary_files() {
    void *memory = mmap(nullptr, sizeof(temporary_files), PROT_READ | PROT_WRITE,
                        MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) return nullptr;
    return {static_cast<temporary_files *>(memory),
            [](temporary_files *files) { munmap(files, sizeof *files); }};
}

int remove_files_at_signal(temporary_files &files) {
    own_files = &files;
    set_signal_handler(SIGALRM, on_signal);
    return SIGALRM;
}

void note_temporary_file(const std::string &path) {
    if (own_files == nullptr || path.size() >= PATH_MAX) return;
    for (auto &slot : own_files->paths) {
        if (slot[0] != '\0') continue;
        // The first character is written last, because the slot counts as free until then.
        memcpy(slot + 1, path.c_str() + 1, path.size());
        slot[0] = path[0];
        return;
    }
}

void forget_temporary_file(const std::string &path) {
    if (own_files == nullptr) return;
    for (auto &slot : own_files->paths) {
        if (path == slot) slot[0] = '\0';
    }
}

void remove_files(temporary_files &files) {
    for (auto &slot : files.paths) {
        if (slot[0] != '\0') unlink(slot);
        slot[0] = '\0';
    }
}
