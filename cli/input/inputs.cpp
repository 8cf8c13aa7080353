#include "cli/input/inputs.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <functional>
#include <iterator>
#include <optional>
#include <utility>

#include "cli/input/ffmpeg.h"
#include "cli/input/recognise.h"
#include "cli/input/song_file.h"
#include "cli/write/clip.h"
#include "cli/write/file_names.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

void add_note(input_supply &supply, const std::string &sentence) {
    supply.notes += "tavo: " + sentence + "\n";
}

file_id id_of(const struct stat &info) {
    return {info.st_dev, info.st_ino};
}

// Claims the marker file or clip of an input, so that no other input writes the same file. Returns
// false if the input is to be skipped.
bool claim_target(input_supply &supply, input &entry, const std::string &target) {
    const std::string name = base_name(target);
    struct stat info {};
    if (supply.opts.skip_existing && lstat(target.c_str(), &info) == 0) {
        ++supply.existing;
        return false;
    }
    if (stat((target.substr(0, target.size() - name.size()) + ".").c_str(), &info) != 0) {
        return true;  // a failure is reported when the file is written
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
    return (opts.markers == nullptr ||
            claim_target(supply, entry, marker_path(entry.path, opts))) &&
           (opts.clip.empty() || claim_target(supply, entry, clip_path(entry.path, opts)));
}

// Adds the entries of a folder, unless this search has already entered it through another link.
failure enter_folder(input_supply &supply, const std::string &path, const struct stat &info) {
    if (!supply.searched.insert(id_of(info)).second) return {};
    std::vector<std::string> entries;
    std::error_code code;
    std::filesystem::directory_iterator entry(path, code);
    for (; !code && entry != std::filesystem::directory_iterator(); entry.increment(code)) {
        entries.push_back(entry->path());
    }
    if (code) return {system_sentence("The folder cannot be read", code.value())};
    std::sort(entries.begin(), entries.end(), std::greater<>());  // in byte order
    std::move(entries.begin(), entries.end(), std::back_inserter(supply.entries));
    return {};
}

// True if the folder becomes an input because it contains no audio.
bool leave_folder(input_supply &supply, input &out) {
    const std::string path = std::exchange(supply.folder, "");
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

// True if the file must be analysed or reported. `refusal` is set if it cannot be read.
bool is_audio(const std::string &path, const options &opts, failure &refusal) {
    file_kind kind = file_kind::unknown;
    if (const int code = recognise(path, kind)) {
        refusal = {system_sentence("The file cannot be read", code)};
        return code == EACCES || code == EPERM || code == EIO;
    }
    if (kind != file_kind::unknown) return true;
    if (!opts.ffmpeg.empty() && has_media_suffix(path)) return true;
    // The library also finds MPEG audio after other bytes.
    song_file song;
    if (open_song(path, -1, song)) return false;
    const int32_t probed = tavo_probe(song.path.c_str(), nullptr);
    close_song(song);
    return probed != TAVO_ERR_FORMAT && probed != TAVO_ERR_READ;
}

// Each function below examines one name and returns true if it found an input.

bool look_at_entry(input_supply &supply, input &out) {
    if (supply.entries.empty()) return leave_folder(supply, out);
    out = {std::move(supply.entries.back()), {}};
    supply.entries.pop_back();
    struct stat info {};
    if (stat(out.path.c_str(), &info) != 0) return false;
    bool is_found = false;
    if (S_ISDIR(info.st_mode) && supply.opts.recursive) {
        out.refusal = enter_folder(supply, out.path, info);
        is_found = static_cast<bool>(out.refusal);
    } else if (S_ISREG(info.st_mode)) {
        is_found = is_audio(out.path, supply.opts, out.refusal);
        if (!is_found) ++supply.skipped;
    }
    if (is_found) ++supply.found;
    return is_found;
}

bool look_at_path(input_supply &supply, const std::string &path, input &out) {
    out = {path, {}};
    struct stat info {};
    if (stat(path.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) return true;
    supply.found = supply.skipped = 0;
    supply.searched.clear();
    out.refusal = enter_folder(supply, path, info);
    if (!out.refusal) supply.folder = path;
    return static_cast<bool>(out.refusal);
}

bool look_at_list(input_supply &supply, input &out) {
    list_reader &list = supply.list;
    std::optional<std::string> name;
    out = {list.name, read_name(list, name)};
    if (name) return look_at_path(supply, *name, out);
    if (!out.refusal && !list.ended) return false;
    if (!out.refusal && list.names == 0) {
        add_note(supply, (list.name == "-" ? "the list on standard input"
                                           : "the list " + shown(list.name)) +
                             " names no files.");
    }
    close_list(list);
    return static_cast<bool>(out.refusal);
}

bool look_at_argument(input_supply &supply, input &out) {
    const options &opts = supply.opts;
    const size_t index = supply.argument++;
    const bool is_file = index < opts.inputs.size();
    const std::string &word = is_file ? opts.inputs[index] : opts.lists[index - opts.inputs.size()];
    if (is_file && word != "-") return look_at_path(supply, word, out);
    out = {word, open_list(supply.list, word, opts.list_separator)};
    return static_cast<bool>(out.refusal);
}

}  // namespace

supply_state next_input(input_supply &supply, input &out) {
    const options &opts = supply.opts;
    const bool is_search = !supply.folder.empty();
    const bool is_list = !is_search && supply.list.fd >= 0;
    if (!is_search && !is_list && supply.argument == opts.inputs.size() + opts.lists.size()) {
        if (supply.existing > 0) {
            add_note(supply,
                     count_text(supply.existing, "input") + " left out: the file is there.");
            supply.existing = 0;
        }
        return supply_state::ended;
    }
    const bool is_found = is_search ? look_at_entry(supply, out)
                          : is_list ? look_at_list(supply, out)
                                    : look_at_argument(supply, out);
    if (is_found && (out.refusal || claim_targets(supply, out))) return supply_state::ready;
    const bool is_waiting = is_list && !is_found && supply.folder.empty() && supply.list.fd >= 0;
    return is_waiting ? supply_state::waiting : supply_state::searching;
}
