// The command: reads the options and analyses the files that they name.
#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <exception>

#include "cli/options.h"
#include "cli/run/analyse_inputs.h"
#include "cli/run/stop.h"

namespace {

// Opens /dev/null in place of each closed standard stream, so that no other file gets its
// descriptor number. Opens it read-only, so that writes still fail.
void open_standard_streams() {
    for (int fd = STDIN_FILENO; fd <= STDERR_FILENO; ++fd) {
        if (fcntl(fd, F_GETFD) < 0) open("/dev/null", O_RDONLY);
    }
}

}  // namespace

int main(int argc, char **argv) {
    try {
        open_standard_streams();
        options opts;
        if (const std::optional<int> status = parse_options(argc, argv, opts)) return *status;
        if (watch_for_stop()) return analyse_inputs(opts);
        perror("tavo");
    } catch (const std::exception &error) {  // out of memory
        fprintf(stderr, "tavo: %s\n", error.what());
    }
    return kExitFailed;
}
