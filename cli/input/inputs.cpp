#include "cli/input/inputs.h"

#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>

#include "cli/input/ffmpeg.h"
#include "cli/input/recognise.h"
#include "cli/input/short_path.h"
#include "cli/write/clip.h"
#include "cli/write/file_names.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr size_t kStepsAtOnce = 64;  // files and folders looked at between two looks at the stop

std::string joined(const std::string &folder, const std::string &name) {
    return folder.back() == '/' ? folder + name : folder + "/" + name;
}

void add_note(input_supply &supply, const std::string &sentence) {
    supply.notes += "tavo: " + sentence + "\n";
}

file_id id_of(const struct stat &info) {
    return {info.st_dev, info.st_ino};
}

// Claims the marker file or clip of an input, so that no other input writes the same one. False
// leaves the input out.
bool claim_target(input_supply &supply, input &entry, const std::string &target) {
    const std::string name = base_name(target);
    struct stat info {};
    if (supply.opts.skip_existing && lstat(target.c_str(), &info) == 0) {
        ++supply.existing;
        return false;
    }
    if (stat((target.substr(0, target.size() - name.size()) + ".").c_str(), &info) != 0) {
        return true;  // writing will tell
    }
    const std::string key =
        std::to_string(info.st_dev) + "/" + std::to_string(info.st_ino) + "/" + name;
    if (stat(entry.path.c_str(), &info) != 0) return true;
    const auto [claim, is_first] = supply.targets.emplace(key, id_of(info));
    if (is_first) return true;
    if (claim->second == id_of(info)) {
        add_note(supply, shown(entry.path) + ": named more than once, done once.");
        return false;
    }
    entry.refusal = {"Its file " + shown(target) +
                     " would replace that of another input, whose name is the same."};
    return true;
}

bool claim_targets(input_supply &supply, input &entry) {
    const options &opts = supply.opts;
    return (!writes_files(opts.format) ||
            claim_target(supply, entry, marker_path(entry.path, opts))) &&
           (opts.clip.empty() || claim_target(supply, entry, clip_path(entry.path, opts)));
}

// The entries' names in the order of their bytes. Returns 0 or errno.
int list_folder(open_folder &folder) {
    DIR *stream = opendir(folder.path.c_str());
    if (stream == nullptr) return errno;
    errno = 0;
    while (const dirent *entry = readdir(stream)) {
        const std::string name = entry->d_name;
        if (name != "." && name != "..") folder.names.push_back(name);
    }
    const int code = errno;
    closedir(stream);
    std::sort(folder.names.begin(), folder.names.end());
    return code;
}

// Begins to search a folder, unless this search has entered it before, through another link.
// True when there is an input to hand out instead.
bool enter_folder(input_supply &supply, const std::string &path, const struct stat &info,
                  input &out) {
    if (supply.folders.empty()) {
        supply.found = supply.skipped = 0;
        supply.searched.clear();
    }
    if (!supply.searched.insert(id_of(info)).second) return false;
    open_folder folder;
    folder.path = path;
    const int code = list_folder(folder);
    if (code != 0) {
        out = {path, {system_sentence("The folder cannot be read", code)}};
        ++supply.found;
        return true;
    }
    supply.folders.push_back(std::move(folder));
    return false;
}

// The innermost folder holds no more. True for an input that says that there was no audio.
bool leave_folder(input_supply &supply, input &out) {
    const std::string path = supply.folders.back().path;
    supply.folders.pop_back();
    if (!supply.folders.empty()) return false;
    if (supply.found == 0) {
        const char *hint =
            supply.opts.recursive ? "." : " itself; --recursive searches the folders in it.";
        out = {path, {std::string("The folder holds no audio files") + hint}};
        return true;
    }
    if (supply.skipped > 0) {
        add_note(supply, shown(path) + ": " + count_text(supply.skipped, "file") +
                             " left out, not recognised as audio.");
    }
    return false;
}

// True if the file is to be analysed or reported; code receives errno when it cannot be read.
bool is_audio(const std::string &path, const options &opts, int &code) {
    file_kind kind = file_kind::unknown;
    code = recognise(path, kind);
    if (code != 0) return code == EACCES || code == EPERM || code == EIO;
    if (kind != file_kind::unknown) return true;
    if (!opts.ffmpeg.empty() && has_media_suffix(path)) return true;
    // The library finds MPEG audio also after other bytes.
    short_path opened = open_short_path(path);
    const int32_t probed = tavo_probe(opened.path.c_str(), nullptr);
    close_short_path(opened);
    return probed != TAVO_ERR_FORMAT && probed != TAVO_ERR_READ;
}

bool take_entry(input_supply &supply, input &out) {
    open_folder &folder = supply.folders.back();
    if (folder.next == folder.names.size()) return leave_folder(supply, out);
    const std::string path = joined(folder.path, folder.names[folder.next++]);
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return false;
    if (S_ISDIR(info.st_mode)) {
        return supply.opts.recursive && enter_folder(supply, path, info, out);
    }
    if (!S_ISREG(info.st_mode)) return false;
    int code = 0;
    if (!is_audio(path, supply.opts, code)) {
        ++supply.skipped;
        return false;
    }
    ++supply.found;
    out = {path, {code != 0 ? system_sentence("The file cannot be read", code) : ""}};
    return true;
}

bool take_path(input_supply &supply, const std::string &path, input &out) {
    struct stat info {};
    if (stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode)) {
        return enter_folder(supply, path, info, out);
    }
    out = {path, {}};
    return true;
}

// True for an input; waiting is set when the list has no more for now.
bool take_from_list(input_supply &supply, input &out, bool &waiting) {
    std::string name;
    failure failed;
    const list_state state = next_name(supply.list, supply.opts.list_separator, name, failed);
    if (state == list_state::name) return take_path(supply, name, out);
    waiting = state == list_state::waiting;
    if (waiting) return false;
    close_list(supply.list);
    if (state == list_state::ended && supply.list.names == 0) {
        add_note(supply, list_text(supply.list) + " names no files.");
    }
    out = {supply.list.name, failed};
    return state == list_state::failed;
}

bool take_argument(input_supply &supply, input &out) {
    const options &opts = supply.opts;
    const size_t index = supply.argument++;
    const bool listed = index >= opts.inputs.size();
    const std::string &word = listed ? opts.lists[index - opts.inputs.size()] : opts.inputs[index];
    if (!listed && word != "-") return take_path(supply, word, out);
    out = {word, open_list(supply.list, word)};
    return static_cast<bool>(out.refusal);
}

// True for an input.
bool take_next(input_supply &supply, input &out, bool &waiting) {
    if (!supply.folders.empty()) return take_entry(supply, out);
    if (supply.list.fd >= 0) return take_from_list(supply, out, waiting);
    return take_argument(supply, out);
}

bool is_done(const input_supply &supply) {
    return supply.folders.empty() && supply.list.fd < 0 &&
           supply.argument == supply.opts.inputs.size() + supply.opts.lists.size();
}

}  // namespace

supply_state next_input(input_supply &supply, input &out) {
    bool waiting = false;
    for (size_t steps = 0; !is_done(supply) && !waiting; ++steps) {
        if (steps == kStepsAtOnce) return supply_state::searching;
        if (!take_next(supply, out, waiting)) continue;
        if (out.refusal || claim_targets(supply, out)) return supply_state::ready;
    }
    if (waiting) return supply_state::waiting;
    if (supply.existing > 0) {
        add_note(supply, count_text(supply.existing, "input") + " left out: the file is there.");
        supply.existing = 0;
    }
    return supply_state::ended;
}

int supply_fd(const input_supply &supply) {
    return supply.list.fd;
}
