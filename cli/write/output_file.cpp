#include "cli/write/output_file.h"

#include <fcntl.h>
#include <linux/fs.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>

#include "cli/run/temporary_files.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

std::string folder_of(const std::string &path) {
    const size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string write_error(const std::string &target, int code) {
    return system_sentence("The file " + shown(target) + " cannot be written", code);
}

std::string already_there(const std::string &target) {
    return "The file " + shown(target) + " exists already; --force overwrites it.";
}

// Returns 0 or errno; EEXIST when the target is there.
int rename_without_overwriting(const std::string &from, const std::string &to) {
    if (syscall(SYS_renameat2, AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) ==
        0) {
        return 0;
    }
    if (errno != EINVAL && errno != ENOSYS) return errno;
    // A file system without that operation: a link fails too when the target is there.
    if (link(from.c_str(), to.c_str()) != 0) return errno;
    unlink(from.c_str());
    return 0;
}

}  // namespace

bool same_file(const std::string &a, const std::string &b) {
    struct stat left {};
    struct stat right {};
    return stat(a.c_str(), &left) == 0 && stat(b.c_str(), &right) == 0 &&
           left.st_dev == right.st_dev && left.st_ino == right.st_ino;
}

std::string check_target(const std::string &target, bool force) {
    struct stat info {};
    if (lstat(target.c_str(), &info) == 0) {
        if (S_ISDIR(info.st_mode)) return write_error(target, EISDIR);
        if (!force) return already_there(target);
    } else if (errno != ENOENT) {
        return write_error(target, errno);
    }
    if (access(folder_of(target).c_str(), W_OK | X_OK) != 0) return write_error(target, errno);
    return "";
}

std::string begin_output(output_file &file, const std::string &target, const std::string &ending) {
    file.target = target;
    file.temporary = folder_of(target) + "/.tavo-XXXXXX" + ending;
    file.fd = mkostemps(file.temporary.data(), static_cast<int>(ending.size()), O_CLOEXEC);
    if (file.fd < 0) {
        const int code = errno;
        file.temporary.clear();
        return write_error(target, code);
    }
    note_temporary_file(file.temporary);
    const mode_t mask = umask(0);
    umask(mask);
    fchmod(file.fd, 0666 & ~mask);  // mkostemps' own permissions let nobody else read
    return "";
}

std::string write_output(output_file &file, const std::string &content) {
    for (size_t done = 0; done < content.size();) {
        const ssize_t got = write(file.fd, content.data() + done, content.size() - done);
        if (got < 0 && errno != EINTR) return write_error(file.target, errno);
        if (got > 0) done += static_cast<size_t>(got);
    }
    return "";
}

std::string commit_output(output_file &file, bool force) {
    const int closed = file.fd >= 0 ? close(file.fd) : 0;
    file.fd = -1;
    int code = closed == 0 ? 0 : errno;
    if (code == 0 && force) {
        code = rename(file.temporary.c_str(), file.target.c_str()) == 0 ? 0 : errno;
    } else if (code == 0) {
        code = rename_without_overwriting(file.temporary, file.target);
    }
    if (code == 0) {
        forget_temporary_file(file.temporary);
        file.temporary.clear();
    }
    abandon_output(file);
    if (code == EEXIST && !force) return already_there(file.target);
    return code == 0 ? "" : write_error(file.target, code);
}

void abandon_output(output_file &file) {
    if (file.fd >= 0) close(file.fd);
    file.fd = -1;
    if (!file.temporary.empty()) {
        unlink(file.temporary.c_str());
        forget_temporary_file(file.temporary);
    }
    file.temporary.clear();
}

std::string write_file(const std::string &target, const std::string &content, bool force) {
    output_file file;
    std::string error = begin_output(file, target);
    if (error.empty()) error = write_output(file, content);
    if (error.empty()) error = commit_output(file, force);
    abandon_output(file);
    return error;
}
