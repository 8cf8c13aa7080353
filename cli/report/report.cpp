#include "cli/report/report.h"

#include <sys/stat.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cinttypes>
#include <cmath>
#include <filesystem>
#include <fstream>

#include "cli/input/recognise.h"
#include "cli/report/report_pages.h"
#include "cli/report/song_json.h"
#include "cli/write/file_names.h"
#include "cli/write/json.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"

namespace {

constexpr int kMiniatureWidth = 140;
constexpr int kMiniatureHeight = 28;

// The song's file as a page refers to it.
struct report_sound {
    std::string link;      // relative URL; empty when the sound is inside the page
    std::string embedded;  // the file's bytes as base64
    std::string note;      // a sentence for the reader, or empty
};

// The template with each @KEY@ replaced once.
std::string filled(std::string page, const std::string &key, const std::string &value) {
    const size_t at = page.find(key);
    if (at != std::string::npos) page.replace(at, key.size(), value);
    return page;
}

std::string html_text(const std::string &bytes) {
    std::string out;
    for (const char c : as_utf8(bytes)) {
        switch (c) {
            case '&':
                out += "&amp;";
                break;
            case '<':
                out += "&lt;";
                break;
            case '>':
                out += "&gt;";
                break;
            case '"':
                out += "&quot;";
                break;
            default:
                out += c;
        }
    }
    return out;
}

std::string base64(const std::string &bytes) {
    constexpr const char *kDigits =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string out;
    out.reserve((bytes.size() + 2) / 3 * 4);
    for (size_t i = 0; i < bytes.size(); i += 3) {
        uint32_t group = 0;
        for (size_t k = 0; k < 3; ++k) {
            group = group << 8 | (i + k < bytes.size() ? static_cast<uint8_t>(bytes[i + k]) : 0U);
        }
        for (size_t k = 0; k < 4; ++k) {
            out += i + k <= bytes.size() ? kDigits[group >> (18 - 6 * k) & 63] : '=';
        }
    }
    return out;
}

// JSON that may stand inside a script element.
std::string script_json(const result_json &value) {
    std::string text = value.dump();
    for (size_t at = text.find('<'); at != std::string::npos; at = text.find('<', at)) {
        text.replace(at, 1, "\\u003c");
    }
    return text;
}

std::string number_cell(const std::string &text, double value) {
    return "<td class=\"number\" data-value=\"" + std::to_string(std::llround(value)) + "\">" +
           text + "</td>\n";
}

std::string miniature(const song_view &view) {
    if (view.loudness.size() < 2) return "";
    const auto top =
        static_cast<double>(*std::max_element(view.loudness.begin(), view.loudness.end()));
    const double scale = top > 0.0 ? (kMiniatureHeight - 2) / top : 0.0;
    const double step =
        static_cast<double>(kMiniatureWidth) / static_cast<double>(view.loudness.size() - 1);
    std::string path;
    std::array<char, 64> point{};
    for (size_t k = 0; k < view.loudness.size(); ++k) {
        snprintf(point.data(), point.size(), "%c%.1f %.1f", k == 0 ? 'M' : 'L',
                 static_cast<double>(k) * step,
                 kMiniatureHeight - 1 - static_cast<double>(view.loudness[k]) * scale);
        path += point.data();
    }
    return "<svg viewBox=\"0 0 140 28\" role=\"img\" aria-label=\"Loudness\"><path class=\"loud\" "
           "d=\"" +
           path + "\"/></svg>";
}

// Where the sound of song_path is for the page at page_path. Returns an empty string or a sentence.
std::string find_sound(const std::string &song_path, const std::string &page_path, bool embed,
                       report_sound &sound) {
    if (embed) {
        std::ifstream file(song_path, std::ios::binary);
        const std::string bytes((std::istreambuf_iterator<char>(file)),
                                std::istreambuf_iterator<char>());
        if (!file) return "The song could not be read for its page.";
        sound.embedded = base64(bytes);
        return "";
    }
    namespace fs = std::filesystem;
    std::error_code failed;
    const fs::path folder = fs::weakly_canonical(fs::absolute(page_path), failed).parent_path();
    const fs::path song = fs::weakly_canonical(fs::absolute(song_path), failed);
    const fs::path relative = song.lexically_relative(folder);
    sound.link = percent_encoded((relative.empty() ? song : relative).string());
    file_kind kind = file_kind::unknown;
    if (recognise(song_path, kind) == 0 && kind == file_kind::aac) {
        sound.note =
            "Browsers misjudge the length of bare AAC files, so that times may be off. A page made "
            "with --embed is exact.";
    }
    return "";
}

// The whole page, UTF-8.
std::string report_page(const record &result, const song_view &view, const report_sound &sound) {
    result_json song = song_json(result, view);
    if (!sound.note.empty()) song["note"] = sound.note;
    song[sound.link.empty() ? "embedded" : "audio"] =
        sound.link.empty() ? sound.embedded : sound.link;
    // In this order no text of a song is mistaken for a key: the title comes before the data.
    const std::string title = html_text(base_name(result.file));
    return filled(filled(kSongPage, "@DATA@", script_json(song)), "@TITLE@", title);
}

// The folder of the songs' pages beside the index.
std::string pages_folder(const options &opts) {
    const std::string name = base_name(opts.report);
    return opts.report.substr(0, opts.report.size() - name.size()) +
           name.substr(0, std::min(name.rfind('.'), name.size())) + "_songs";
}

// The index page before or after its rows.
std::string index_part(bool before) {
    const std::string page = kIndexPage;
    const std::string key = "@ROWS@";
    const size_t at = page.find(key);
    return before ? page.substr(0, at) : page.substr(at + key.size());
}

std::string make_page(record &result, const options &opts, const std::string &target, int stop_fd,
                      song_view &view) {
    std::string error;
    const outcome read = read_song_view(result, kReportColumns, stop_fd, view, error);
    report_sound sound;
    if (error.empty()) error = find_sound(result.file, target, opts.embed, sound);
    if (error.empty()) error = write_file(target, report_page(result, view, sound), opts.force);
    if (error.empty()) return "";
    result = failed_record(result.file, result.mode, error);
    if (read == outcome::stopped) result.status = outcome::stopped;
    return error;
}

}  // namespace

std::string report_page_path(const options &opts, uint64_t index, const std::string &song) {
    if (takes_one_file(opts)) return opts.report;
    std::array<char, 24> number{};
    snprintf(number.data(), number.size(), "%06" PRIu64 " ", index + 1);
    return pages_folder(opts) + "/" + fitting_name(number.data() + base_name(song), ".html");
}

std::string check_report(const std::string &target, bool force) {
    file_kind kind = file_kind::unknown;
    if (recognise(target, kind) == 0 && kind != file_kind::unknown) {
        return "The page " + shown(target) + " would replace a song.";
    }
    struct stat info {};
    if (lstat(target.c_str(), &info) == 0 && !S_ISREG(info.st_mode) && !S_ISDIR(info.st_mode)) {
        return "The page " + shown(target) + " cannot be written: it is not a regular file.";
    }
    return check_target(target, force);
}

void write_report_page(record &result, const options &opts, const std::string &target, int stop_fd,
                       std::string &row) {
    song_view view;
    if (!make_page(result, opts, target, stop_fd, view).empty()) return;
    row = report_index_row(result, view, base_name(pages_folder(opts)) + "/" + base_name(target));
}

std::string begin_report_index(report_index &index, const options &opts) {
    if (opts.report.empty() || takes_one_file(opts)) return "";
    std::string error = check_report(opts.report, opts.force);
    if (!error.empty()) return error;
    const std::string folder = pages_folder(opts);
    const int code = mkdir(folder.c_str(), 0777) == 0 ? 0 : errno;
    struct stat info {};
    const bool is_folder = lstat(folder.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
    if (code == EEXIST && !is_folder) {
        return "The folder " + shown(folder) +
               " cannot be made: a symbolic link or a file has its name.";
    }
    if (code != 0 && code != EEXIST) {
        return system_sentence("The folder " + shown(folder) + " cannot be made", code);
    }
    error = begin_output(index.file, opts.report);
    index.open = error.empty();
    return error.empty() ? add_report_row(index, index_part(true)) : error;
}

std::string add_report_row(report_index &index, const std::string &row) {
    if (!index.open || row.empty()) return "";
    const std::string error = write_output(index.file, row);
    if (error.empty()) return "";
    abandon_output(index.file);
    index.open = false;
    return error;
}

std::string finish_report_index(report_index &index, const options &opts) {
    if (!index.open) return "";
    std::string error = add_report_row(index, index_part(false));
    if (error.empty()) error = commit_output(index.file, opts.force);
    abandon_output(index.file);
    index.open = false;
    return error;
}

std::string report_index_row(const record &result, const song_view &view, const std::string &page) {
    const std::string name = html_text(base_name(result.file));
    if (page.empty()) {
        return "<tr><td class=\"name\">" + name + "</td><td colspan=\"5\">" +
               html_text(result.error) + "</td></tr>\n";
    }
    const auto duration = static_cast<double>(result.duration_ms);
    const double start = player_ms(result, result.hl_pos_ms);
    return "<tr><td class=\"name\"><a href=\"" + percent_encoded(page) + "\">" + name +
           "</a></td>\n" + number_cell(clock_text(duration), duration) +
           (result.has_beats ? number_cell(std::to_string(result.bpm), result.bpm)
                             : "<td></td>\n") +
           (result.has_highlight ? number_cell(clock_text(start), start) : "<td></td>\n") +
           (result.has_beats ? number_cell(std::to_string(result.beats_ms.size()),
                                           static_cast<double>(result.beats_ms.size()))
                             : "<td></td>\n") +
           "<td>" + miniature(view) + "</td></tr>\n";
}
