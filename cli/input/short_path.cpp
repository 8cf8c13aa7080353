#include "cli/input/short_path.h"

#include <fcntl.h>
#include <unistd.h>

#include "include/tavo.h"

short_path open_short_path(const std::string &path) {
    if (path == "fd") return {"./fd", -1};  // "fd" alone means a descriptor
    if (path.size() < TAVO_PATH_BYTES) return {path, -1};
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (fd < 0) return {path, -1};
    return {"/proc/self/fd/" + std::to_string(fd), fd};
}

void close_short_path(short_path &opened) {
    if (opened.fd >= 0) close(opened.fd);
    opened.fd = -1;
}
