#include "cli/write/output_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <filesystem>

#include "cli/system.h"
#include "cli/write/value_text.h"

namespace {

std::string folder_of(const std::string &path) {
    const std::string folder = std::filesystem::path(path).parent_path();
    return folder.empty() ? "." : folder;
}

failure write_failure(const std::string &target, int code) {
    return {system_sentence("The file " + shown(target) + " cannot be written", code)};
}

failure exists_already(const std::string &target) {
    return {"The file " + shown(target) + " exists already; --force overwrites it."};
}

// Moves a file, but may leave its old name in place. Without force, an existing target is an error.
// Returns 0 or an errno value.
int move_file(const std::string &from, const std::string &to, bool force) {
    if (force) return rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
    if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
    if (errno != EINVAL && errno != ENOSYS) return errno;
    // The file system lacks RENAME_NOREPLACE. A link also fails if the target exists.
    return link(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

}  // namespace

bool same_file(const std::string &a, const std::string &b) {
    std::error_code failed;
    return std::filesystem::equivalent(a, b, failed);
}

failure check_target(const std::string &target, bool force) {
    struct stat info {};
    if (lstat(target.c_str(), &info) == 0) {
        if (!S_ISREG(info.st_mode)) {
            return {"The file " + shown(target) + " cannot be written: it is not a regular file."};
        }
        if (!force) return exists_already(target);
    } else if (errno != ENOENT) {
        return write_failure(target, errno);
    }
    if (access(folder_of(target).c_str(), W_OK | X_OK) != 0) return write_failure(target, errno);
    return {};
}

failure begin_output(output_file &file, const std::string &target, const std::string &ending) {
    file.target = target;
    file.temporary = folder_of(target) + "/.tavo-XXXXXX" + ending;
    file.fd = mkostemps(file.temporary.data(), static_cast<int>(ending.size()), O_CLOEXEC);
    if (file.fd < 0) {
        file.temporary.clear();
        return write_failure(target, errno);
    }
    note_temporary_file(file.temporary);
    const mode_t mask = umask(0);
    umask(mask);
    fchmod(file.fd, 0666 & ~mask);  // mkostemps grants access only to the owner
    return {};
}

failure write_output(output_file &file, const std::string &content) {
    const int code = write_all(file.fd, content);
    return code == 0 ? failure() : write_failure(file.target, code);
}

failure commit_output(output_file &file, bool force) {
    int code = file.fd >= 0 && close(file.fd) != 0 ? errno : 0;
    file.fd = -1;
    if (code == 0) code = move_file(file.temporary, file.target, force);
    abandon_output(file);
    if (code == EEXIST) return exists_already(file.target);
    return code == 0 ? failure() : write_failure(file.target, code);
}

void abandon_output(output_file &file) {
    close_fd(file.fd);
    if (!file.temporary.empty()) {
        unlink(file.temporary.c_str());
        note_temporary_file("");
    }
    file.temporary.clear();
}

failure write_file(const std::string &target, const std::string &content, bool force) {
    output_file file;
    failure failed = begin_output(file, target);
    if (!failed) failed = write_output(file, content);
    if (!failed) failed = commit_output(file, force);
    abandon_output(file);
    return failed;
}
