#include "cli/write/click.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdint>

#include "cli/write/file_names.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr size_t kHeaderBytes = 44;  // of the track's WAV header; its last four give the data size

// The library ignores write errors: a full disk shows only in the length.
bool is_whole_track(const std::string &path) {
    const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) return false;
    struct stat info {};
    std::array<uint8_t, kHeaderBytes> head{};
    const bool readable = fstat(fd, &info) == 0 &&
                          read(fd, head.data(), head.size()) == static_cast<ssize_t>(head.size());
    close(fd);
    if (!readable) return false;
    uint32_t data = 0;
    for (size_t i = 0; i < 4; ++i) data |= static_cast<uint32_t>(head[40 + i]) << (8 * i);
    return info.st_size == static_cast<off_t>(kHeaderBytes) + static_cast<off_t>(data);
}

}  // namespace

std::string begin_click(click_file &click, const std::string &target, const std::string &input,
                        bool force) {
    fnamedec = "";
    if (target.empty()) return "";
    if (same_file(target, input)) {
        return "The click track would replace the file that is analysed.";
    }
    click.wanted = true;
    struct stat info {};
    if (stat(target.c_str(), &info) == 0 && !S_ISREG(info.st_mode)) {
        click.direct = target;
        const int fd = open(target.c_str(), O_WRONLY | O_CLOEXEC | O_NONBLOCK);
        if (fd < 0) {
            return system_sentence("The click track " + shown(target) + " cannot be written",
                                   errno);
        }
        close(fd);
        fnamedec = click.direct.c_str();
        return "";
    }
    click.force = force;
    std::string error = check_target(target, force);
    if (error.empty()) error = begin_output(click.file, target);
    if (error.empty()) fnamedec = click.file.temporary.c_str();
    return error;
}

std::string finish_click(click_file &click, bool analysed) {
    fnamedec = "";
    if (!click.wanted || !click.direct.empty()) return "";
    if (!analysed) {
        abandon_output(click.file);
        return "";
    }
    if (is_whole_track(click.file.temporary)) return commit_output(click.file, click.force);
    abandon_output(click.file);
    return "The click track " + shown(click.file.target) +
           " could not be written whole; the disk may be full.";
}
