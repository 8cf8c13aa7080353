#include "cli/input/inputs.h"

#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <filesystem>
#include <functional>
#include <iterator>
#include <optional>
#include <utility>

#include "cli/input/recognise.h"
#include "cli/input/song_file.h"
#include "cli/system.h"
#include "cli/write/markers.h"
#include "cli/write/sound_files.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

namespace fs = std::filesystem;

constexpr size_t kMostNameBytes = PATH_MAX;  // longer paths cannot be opened
constexpr const char *kByteOrderMark = "\xEF\xBB\xBF";

// Extensions of formats that ffmpeg reads but the library may be unable to read. In a folder, files
// with these extensions count as audio, whatever they contain.
constexpr const char *kMediaSuffixes[] = {
    ".3gp", ".ac3", ".aif", ".aifc", ".aiff", ".amr",  ".ape", ".au",   ".avi",
    ".caf", ".dsf", ".dts", ".eac3", ".flv",  ".m2ts", ".m4a", ".m4b",  ".m4v",
    ".mka", ".mkv", ".mov", ".mp4",  ".mpc",  ".mpeg", ".mpg", ".opus", ".spx",
    ".tak", ".tta", ".voc", ".w64",  ".wav",  ".webm", ".wma", ".wmv",  ".wv"};

void add_note(input_supply &supply, const std::string &sentence) {
    supply.notes += "tavo: " + sentence + "\n";
}

// Returns a text that is the same for all paths of a file or folder.
std::string id_of(const std::string &path) {
    struct stat info {};
    if (stat(path.c_str(), &info) != 0) return path;
    return std::to_string(info.st_dev) + ":" + std::to_string(info.st_ino) + "/";
}

// Claims the marker file or clip of an input, so that no other input writes the same file. Returns
// false if the input must be skipped.
bool claim_target(input_supply &supply, input &entry, const std::string &target) {
    std::error_code failed;
    if (supply.opts.skip_existing && fs::exists(fs::symlink_status(target, failed))) {
        ++supply.existing;
        return false;
    }
    if (!fs::exists(entry.path, failed)) return true;  // reported when the file is read
    const std::string place = id_of(fs::path(target).parent_path() / ".") + base_name(target);
    const auto [claim, is_first] = supply.targets.emplace(place, id_of(entry.path));
    if (is_first) return true;
    if (claim->second == id_of(entry.path)) {
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
failure enter_folder(input_supply &supply, const std::string &path) {
    if (!supply.searched.insert(id_of(path)).second) return {};
    std::error_code code;
    std::vector<std::string> entries;
    fs::directory_iterator entry(path, code);
    for (; !code && entry != fs::directory_iterator(); entry.increment(code)) {
        entries.push_back(entry->path());
    }
    if (code) return {system_sentence("The folder cannot be read", code.value())};
    std::sort(entries.begin(), entries.end(), std::greater<>());  // in byte order
    std::move(entries.begin(), entries.end(), std::back_inserter(supply.entries));
    return {};
}

// Ends the search of a folder. If it has no audio, stores it as a refused input and returns true.
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

// True if the file must be analysed or reported. Sets `refusal` if the file cannot be read.
bool is_audio(const std::string &path, failure &refusal) {
    file_kind kind = file_kind::unknown;
    if (const int code = recognise(path, kind)) {
        refusal = {system_sentence("The file cannot be read", code)};
        return code == EACCES || code == EPERM || code == EIO;
    }
    if (kind != file_kind::unknown) return true;
    const std::string suffix = fs::path(path).extension();
    for (const char *media : kMediaSuffixes) {
        if (strcasecmp(suffix.c_str(), media) == 0) return true;
    }
    // The library also finds MPEG audio that follows other bytes.
    song_file song;
    if (open_song(path, -1, song)) return false;
    const int32_t probed = tavo_probe(song.path.c_str(), nullptr);
    close_song(song);
    return probed != TAVO_ERR_FORMAT && probed != TAVO_ERR_READ;
}

failure cannot_read_list(int code) {
    return {system_sentence("The list of files cannot be read", code)};
}

// Refuses NUL bytes without -0, and a song passed by mistake, which would yield thousands of names.
failure check_start(const std::string &text, char separator) {
    if (recognise_bytes(text) != file_kind::unknown) {
        return {"This is sound, not a list of names; name it as FILE (/dev/stdin for a pipe)."};
    }
    if (separator != '\0' && text.find('\0') != std::string::npos) {
        return {"The list holds NUL bytes: give -0 when its names end with them."};
    }
    return {};
}

bool is_comment(const std::string &line) {
    std::error_code failed;
    return line[0] == '#' && !fs::exists(fs::symlink_status(line, failed));
}

// Removes the next name from the text and returns it, or returns nothing if none is complete. The
// last name needs no separator. A list with one name per line may be an M3U playlist, so comments
// and carriage returns at line ends are removed.
std::optional<std::string> next_name(name_list &list, char separator) {
    while (true) {
        const size_t end = list.text.find(separator);
        if (end == std::string::npos && (!list.ended || list.text.empty())) return std::nullopt;
        std::string line = list.text.substr(0, end);
        list.text.erase(0, end == std::string::npos ? end : end + 1);
        if (separator == '\n' && !line.empty() && line.back() == '\r') line.pop_back();
        if (!line.empty() && (separator != '\n' || !is_comment(line))) return line;
    }
}

// Reads the next name. Never waits: `name` is empty if the list has ended or the next name has not
// arrived yet.
failure read_name(name_list &list, char separator, std::optional<std::string> &name) {
    while (!(name = next_name(list, separator)) && !list.ended && is_readable(list.fd)) {
        if (list.text.size() > kMostNameBytes) {
            return {"The list holds a name of more than " + std::to_string(kMostNameBytes) +
                    " bytes; is it a list of names?"};
        }
        std::array<char, 65536> part;
        const ssize_t got = read(list.fd, part.data(), part.size());
        if (got < 0 && errno != EINTR && errno != EAGAIN) return cannot_read_list(errno);
        list.ended = got == 0;
        if (got <= 0) continue;
        list.text.append(part.data(), static_cast<size_t>(got));
        if (std::exchange(list.begun, true)) continue;
        if (failure failed = check_start(list.text, separator)) return failed;
        if (list.text.compare(0, 3, kByteOrderMark) == 0) list.text.erase(0, 3);
    }
    if (name) list.is_empty = false;
    return {};
}

supply_state ready_if(bool is_input) {
    return is_input ? supply_state::ready : supply_state::searching;
}

// Each function below examines one name, stores it in `out` and returns ready if it is an input.

supply_state look_at_entry(input_supply &supply, input &out) {
    if (supply.entries.empty()) return ready_if(leave_folder(supply, out));
    out = {std::move(supply.entries.back())};
    supply.entries.pop_back();
    std::error_code failed;
    const fs::file_status status = fs::status(out.path, failed);
    bool is_input = false;
    if (fs::is_directory(status) && supply.opts.recursive) {
        out.refusal = enter_folder(supply, out.path);
        is_input = static_cast<bool>(out.refusal);
    } else if (fs::is_regular_file(status)) {
        is_input = is_audio(out.path, out.refusal);
        if (!is_input) ++supply.skipped;
    }
    if (is_input) ++supply.found;
    return ready_if(is_input);
}

supply_state look_at_path(input_supply &supply, const std::string &path, input &out) {
    out = {path};
    std::error_code failed;
    if (!fs::is_directory(path, failed)) return supply_state::ready;
    supply.found = supply.skipped = 0;
    supply.searched.clear();
    out.refusal = enter_folder(supply, path);
    if (out.refusal) return supply_state::ready;
    supply.folder = path;
    return supply_state::searching;
}

supply_state look_at_list(input_supply &supply, input &out) {
    name_list &list = supply.list;
    std::optional<std::string> name;
    out = {list.name, read_name(list, supply.opts.list_separator, name)};
    if (name) return look_at_path(supply, *name, out);
    if (!out.refusal && !list.ended) return supply_state::waiting;
    if (!out.refusal && list.is_empty) {
        add_note(supply, "the list " + shown(list.name) + " names no files.");
    }
    if (list.fd != STDIN_FILENO) close(list.fd);
    list.fd = -1;
    return ready_if(static_cast<bool>(out.refusal));
}

supply_state look_at_argument(input_supply &supply, input &out) {
    const options &opts = supply.opts;
    const size_t index = supply.argument++;
    const bool is_file = index < opts.inputs.size();
    const std::string &word = is_file ? opts.inputs[index] : opts.lists[index - opts.inputs.size()];
    if (is_file && word != "-") return look_at_path(supply, word, out);
    supply.list = {word, word == "-" ? STDIN_FILENO : open(word.c_str(), O_RDONLY | O_CLOEXEC)};
    out = {word, supply.list.fd >= 0 ? failure() : cannot_read_list(errno)};
    return ready_if(supply.list.fd < 0);
}

supply_state look_at_next(input_supply &supply, input &out) {
    if (!supply.folder.empty()) return look_at_entry(supply, out);
    if (supply.list.fd >= 0) return look_at_list(supply, out);
    const size_t arguments = supply.opts.inputs.size() + supply.opts.lists.size();
    if (supply.argument < arguments) return look_at_argument(supply, out);
    if (supply.existing > 0) {
        add_note(supply, count_text(supply.existing, "input") + " left out: the file is there.");
    }
    return supply_state::ended;
}

}  // namespace

supply_state next_input(input_supply &supply, input &out) {
    const supply_state state = look_at_next(supply, out);
    const bool is_input = state == supply_state::ready;
    const bool is_skipped = is_input && !out.refusal && !claim_targets(supply, out);
    return is_skipped ? supply_state::searching : state;
}
