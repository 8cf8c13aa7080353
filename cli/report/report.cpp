#include "cli/report/report.h"

#include <sys/stat.h>

#include <algorithm>
#include <cinttypes>
#include <cmath>
#include <cstdint>
#include <filesystem>
#include <nlohmann/json.hpp>

#include "cli/input/recognise.h"
#include "cli/report/song_view.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

// Parts of the pages, generated from this folder by pages.cmake. A page is these parts with text
// inserted between them: the title and the data of a song, or the rows of the index.
extern const char *const kSongPage[3];
extern const char *const kIndexPage[2];

namespace {

namespace fs = std::filesystem;

std::string base64(const std::string &bytes) {
    constexpr const char *kDigits =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string out;
    uint32_t group = 0;  // its last `bits` bits are not written yet
    int bits = 0;
    for (const char byte : bytes) {
        group = group << 8 | static_cast<uint8_t>(byte);
        for (bits += 8; bits >= 6; bits -= 6) out += kDigits[group >> (bits - 6) & 63];
    }
    if (bits > 0) out += kDigits[group << (6 - bits) & 63];
    out.resize((bytes.size() + 2) / 3 * 4, '=');
    return out;
}

// Adds the sound to the view: the bytes of the file, or its URL relative to the page.
failure add_sound(const std::string &song_path, const std::string &page_path, bool embed,
                  result_json &view) {
    if (embed) {
        int code = 0;
        view["embedded"] = base64(read_bytes(song_path, 0, INT64_MAX, code));
        if (code != 0) return {"The song could not be read for its page."};
        return {};
    }
    file_kind kind = file_kind::unknown;
    if (recognise(song_path, kind) == 0 && kind == file_kind::aac) {
        view["note"] =
            "Browsers misjudge the length of bare AAC files, so that times may be off. A page made "
            "with --embed is exact.";
    }
    std::error_code failed;
    const fs::path folder = fs::absolute(page_path, failed).parent_path();
    view["audio"] = percent_encoded(fs::proximate(song_path, folder, failed));
    return {};
}

// Returns a cell of the index. The cell is empty if the song lacks the value.
std::string number_cell(bool has_value, const std::string &text, double value) {
    if (!has_value) return "<td></td>\n";
    return "<td class=\"number\" data-value=\"" + std::to_string(std::llround(value)) + "\">" +
           text + "</td>\n";
}

// Draws the loudness curve as a small picture.
std::string miniature(const std::vector<float> &loudness) {
    constexpr double kWidth = 140;
    constexpr double kHeight = 28;
    if (loudness.size() < 2) return "";
    const auto top = static_cast<double>(*std::max_element(loudness.begin(), loudness.end()));
    const double scale = top > 0.0 ? (kHeight - 2) / top : 0.0;
    const double step = kWidth / static_cast<double>(loudness.size() - 1);
    std::string path;
    for (size_t k = 0; k < loudness.size(); ++k) {
        path += formatted("%c%.1f %.1f", k == 0 ? 'M' : 'L', static_cast<double>(k) * step,
                          kHeight - 1 - static_cast<double>(loudness[k]) * scale);
    }
    return formatted("<svg viewBox=\"0 0 %.0f %.0f\" ", kWidth, kHeight) +
           "role=\"img\" aria-label=\"Loudness\"><path class=\"loud\" d=\"" + path + "\"/></svg>";
}

// Returns the row of a song. `page` is the path of the song's page, relative to the index.
std::string index_row(const record &result, const result_json &view, const std::string &page) {
    const auto duration = static_cast<double>(result.duration_ms);
    const auto beats = static_cast<double>(result.beats_ms.size());
    const double start = player_ms(result, result.hl_pos_ms);
    return "<tr><td class=\"name\"><a href=\"" + percent_encoded(page) + "\">" +
           html_text(base_name(result.file)) + "</a></td>\n" +
           number_cell(true, clock_text(duration), duration) +
           number_cell(result.has_beats, std::to_string(result.bpm), result.bpm) +
           number_cell(result.has_highlight, clock_text(start), start) +
           number_cell(result.has_beats, std::to_string(result.beats_ms.size()), beats) + "<td>" +
           miniature(view["loudness"]) + "</td></tr>\n";
}

// Returns the path of the folder for the songs' pages, next to the index.
std::string pages_folder(const options &opts) {
    return fs::path(opts.report).replace_extension().string() + "_songs";
}

}  // namespace

std::string report_page_path(const options &opts, uint64_t index, const std::string &song) {
    if (takes_one_file(opts)) return opts.report;
    const std::string number = formatted("%06" PRIu64 " ", index + 1);
    return pages_folder(opts) + "/" + fitting_name(number + base_name(song), ".html");
}

failure check_report(const std::string &target, bool force) {
    file_kind kind = file_kind::unknown;
    if (recognise(target, kind) == 0 && kind != file_kind::unknown) {
        return {"The page " + shown(target) + " would replace a song."};
    }
    struct stat info {};
    if (lstat(target.c_str(), &info) == 0 && !S_ISREG(info.st_mode) && !S_ISDIR(info.st_mode)) {
        return {"The page " + shown(target) + " cannot be written: it is not a regular file."};
    }
    return check_target(target, force);
}

failure write_report_page(const record &result, const options &opts, const std::string &target,
                          int stop_fd, std::string &row) {
    result_json view;
    if (failure failed = read_song_view(result, stop_fd, view)) return failed;
    const std::string page = base_name(pages_folder(opts)) + "/" + base_name(target);
    row = index_row(result, view, page);
    if (failure failed = add_sound(result.file, target, opts.embed, view)) return failed;
    const std::string title = html_text(base_name(result.file));
    const std::string data = replaced(view.dump(), {{'<', "\\u003c"}});  // safe in a script element
    const std::string content = kSongPage[0] + title + kSongPage[1] + data + kSongPage[2];
    return write_file(target, content, opts.force);
}

std::string failed_report_row(const record &result) {
    return "<tr><td class=\"name\">" + html_text(base_name(result.file)) +
           "</td><td colspan=\"5\">" + html_text(result.error) + "</td></tr>\n";
}

failure begin_report_index(output_file &index, const options &opts) {
    if (opts.report.empty() || takes_one_file(opts)) return {};
    if (failure failed = check_report(opts.report, opts.force)) return failed;
    const std::string folder = pages_folder(opts);
    std::error_code failed;
    const fs::file_status there = fs::symlink_status(folder, failed);
    if (fs::exists(there) && !fs::is_directory(there)) {
        return {"The folder " + shown(folder) +
                " cannot be made: a symbolic link or a file has its name."};
    }
    fs::create_directory(folder, failed);
    if (failed) {
        return {system_sentence("The folder " + shown(folder) + " cannot be made", failed.value())};
    }
    if (failure refused = begin_output(index, opts.report)) return refused;
    return add_report_row(index, kIndexPage[0]);
}

failure add_report_row(output_file &index, const std::string &row) {
    if (index.fd < 0 || row.empty()) return {};
    failure failed = write_output(index, row);
    if (failed) abandon_output(index);
    return failed;
}

failure finish_report_index(output_file &index, const options &opts) {
    if (index.fd < 0) return {};
    if (failure failed = add_report_row(index, kIndexPage[1])) return failed;
    return commit_output(index, opts.force);
}
