#include "cli/inputs.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <map>

#include "cli/format.h"
#include "cli/names.h"
#include "cli/recognise.h"
#include "cli/words.h"
#include "media_source/mtsrc.h"

namespace {

constexpr size_t kReadBytes = 65'536;

struct search {
    const options &from;
    bool (*stop_requested)();
    std::vector<input> found;
};

std::string joined(const std::string &folder, const std::string &name) {
    return folder.back() == '/' ? folder + name : folder + "/" + name;
}

// The entries' names in the order of their bytes. Returns 0 or errno.
int list_folder(const std::string &path, std::vector<std::string> &names) {
    DIR *folder = opendir(path.c_str());
    if (folder == nullptr) return errno;
    errno = 0;
    while (const dirent *entry = readdir(folder)) {
        const std::string name = entry->d_name;
        if (name != "." && name != "..") names.push_back(name);
    }
    const int code = errno;
    closedir(folder);
    std::sort(names.begin(), names.end());
    return code;
}

void add_if_audio(search &walk, const std::string &path) {
    int32_t type = 0;
    const int code = recognise(path, type);
    if (code == EACCES || code == EPERM || code == EIO) {
        walk.found.push_back({path, system_sentence("The file cannot be read", code)});
    } else if (code == 0 && type != kMtsrcTypeUnknown) {
        walk.found.push_back({path, ""});
    }
}

void add_folder(search &walk, const std::string &path, bool inner) {
    std::vector<std::string> names;
    const int code = list_folder(path, names);
    if (code != 0) {
        walk.found.push_back({path, system_sentence("The folder cannot be read", code)});
        return;
    }
    const size_t before = walk.found.size();
    for (const std::string &name : names) {
        if (walk.stop_requested()) return;
        const std::string entry = joined(path, name);
        struct stat info {};
        if (lstat(entry.c_str(), &info) != 0) continue;
        if (S_ISDIR(info.st_mode)) {
            if (walk.from.recursive) add_folder(walk, entry, true);
            continue;
        }
        if (S_ISLNK(info.st_mode) && stat(entry.c_str(), &info) != 0) continue;
        if (S_ISREG(info.st_mode)) add_if_audio(walk, entry);
    }
    if (!inner && walk.found.size() == before) {
        walk.found.push_back(
            {path, "The folder holds no audio files" +
                       std::string(walk.from.recursive
                                       ? "."
                                       : " itself; --recursive searches the folders in it.")});
    }
}

void add_path(search &walk, const std::string &path) {
    struct stat info {};
    if (stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode)) {
        add_folder(walk, path, false);
    } else {
        walk.found.push_back({path, ""});
    }
}

void add_names(search &walk, const std::string &text) {
    size_t from = 0;
    while (from < text.size() && !walk.stop_requested()) {
        const size_t end = std::min(text.find(walk.from.list_separator, from), text.size());
        if (end > from) add_path(walk, text.substr(from, end - from));
        from = end + 1;
    }
}

void add_list(search &walk, const std::string &list) {
    const bool standard_input = list == "-";
    const int fd = standard_input ? STDIN_FILENO : open(list.c_str(), O_RDONLY | O_CLOEXEC);
    int code = fd < 0 ? errno : 0;
    std::string text;
    std::vector<char> part(kReadBytes);
    while (code == 0 && !walk.stop_requested()) {
        const ssize_t got = read(fd, part.data(), part.size());
        if (got > 0) text.append(part.data(), static_cast<size_t>(got));
        if (got == 0) break;
        if (got < 0 && errno != EINTR) code = errno;
    }
    if (fd >= 0 && !standard_input) close(fd);
    if (code != 0) {
        walk.found.push_back({list, system_sentence("The list of files cannot be read", code)});
        return;
    }
    if (text.find_first_not_of(walk.from.list_separator) == std::string::npos && !walk.from.quiet) {
        fprintf(stderr, "tavo: the list %s names no files.\n",
                standard_input ? "on standard input" : shown(list).c_str());
    }
    add_names(walk, text);
}

// Songs of the same name in different folders meet in one output folder. Which of them is written
// must not depend on which is analysed first.
void refuse_shared_tracks(search &walk) {
    if (walk.from.format != result_format::labels) return;
    std::map<std::string, std::string> owners;  // track to input
    for (input &entry : walk.found) {
        if (!entry.error.empty()) continue;
        const auto [owner, first] =
            owners.emplace(label_path(entry.path, walk.from.output_dir), entry.path);
        if (!first) {
            entry.error = "Its label track would replace that of " + shown(owner->second) +
                          ": the names are the same.";
        }
    }
}

}  // namespace

std::vector<input> expand_inputs(const options &from, bool (*stop_requested)()) {
    search walk{from, stop_requested, {}};
    for (const std::string &path : from.inputs) {
        if (path == "-") {
            add_list(walk, path);
        } else {
            add_path(walk, path);
        }
    }
    for (const std::string &list : from.lists) add_list(walk, list);
    refuse_shared_tracks(walk);
    return walk.found;
}
