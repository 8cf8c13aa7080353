#include "cli/write/markers.h"

#include <array>
#include <climits>
#include <cstdio>

#include "cli/write/file_names.h"

namespace {

struct marker_format {
    result_format format;
    const char *suffix;  // of the file's name, after the song's
    std::string (*content)(const record &result, const options &opts);
};
constexpr marker_format kMarkerFormats[] = {
    {result_format::labels, ".labels.txt", audacity_labels},
    {result_format::kdenlive, ".guides.txt", kdenlive_guides},
    {result_format::llc, "-proj.llc", losslesscut_project},
    {result_format::ffmetadata, ".ffmetadata.txt", ffmetadata_chapters},
    {result_format::edl, ".edl", edl_markers},
    {result_format::fcpxml, ".fcpxml", fcpxml_markers},
    {result_format::otio, ".otio", otio_timeline},
    {result_format::reaper, ".reaper.csv", reaper_markers},
};
constexpr int32_t kUsualLengthSeconds = 30;  // marked without --length: a preview's

const marker_format *find_format(result_format format) {
    for (const marker_format &entry : kMarkerFormats) {
        if (entry.format == format) return &entry;
    }
    return nullptr;
}

}  // namespace

bool writes_files(result_format format) {
    return find_format(format) != nullptr;
}

std::string marker_path(const std::string &input, const options &opts) {
    const std::string name = base_name(input);
    const std::string folder = opts.output_dir.empty()
                                   ? input.substr(0, input.size() - name.size())
                                   : opts.output_dir + (opts.output_dir.back() == '/' ? "" : "/");
    // LosslessCut finds a project by the song's name without its ending.
    const std::string song = opts.format == result_format::llc ? stem(name) : name;
    return folder + fitting_name(song, find_format(opts.format)->suffix);
}

std::string marker_content(const record &result, const options &opts) {
    return find_format(opts.format)->content(result, opts);
}

double region_end_ms(const record &result) {
    return highlight_end_ms(result, result.length_s > 0 ? result.length_s : kUsualLengthSeconds);
}

std::vector<mark> marks_of(const record &result) {
    std::vector<mark> marks;
    if (result.has_highlight) {
        marks.push_back({player_ms(result, result.hl_pos_ms),
                         player_ms(result, region_end_ms(result)), "highlight"});
    }
    for (size_t i = 0; i < result.beats_ms.size(); ++i) {
        const double at = player_ms(result, static_cast<double>(result.beats_ms[i]));
        marks.push_back({at, at, "beat " + std::to_string(i + 1)});
    }
    return marks;
}
