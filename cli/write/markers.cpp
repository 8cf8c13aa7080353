#include "cli/write/markers.h"

#include "cli/write/file_names.h"

namespace {

constexpr int32_t kUsualLengthSeconds = 30;  // of a usual preview, if --length is not given

}  // namespace

const std::vector<marker_format> &marker_formats() {
    static const std::vector<marker_format> formats = {
        {"labels", ".labels.txt", false, false, audacity_labels},
        {"kdenlive", ".guides.txt", false, false, kdenlive_guides},
        {"llc", "-proj.llc", true, false, losslesscut_project},  // found by the song's stem
        {"ffmetadata", ".ffmetadata.txt", false, false, ffmetadata_chapters},
        {"edl", ".edl", false, true, edl_markers},
        {"fcpxml", ".fcpxml", false, true, fcpxml_markers},
        {"otio", ".otio", false, true, otio_timeline},
        {"reaper", ".reaper.csv", false, false, reaper_markers},
    };
    return formats;
}

const marker_format *find_marker_format(const std::string &word) {
    for (const marker_format &format : marker_formats()) {
        if (format.word == word) return &format;
    }
    return nullptr;
}

std::string marker_path(const std::string &input, const options &opts) {
    const std::string name = base_name(input);
    const std::string folder = opts.output_dir.empty()
                                   ? input.substr(0, input.size() - name.size())
                                   : opts.output_dir + (opts.output_dir.back() == '/' ? "" : "/");
    return folder +
           fitting_name(opts.markers->drops_ending ? stem(name) : name, opts.markers->suffix);
}

std::string marker_content(const record &result, const options &opts) {
    return opts.markers->content(result, *find_frame_rate(opts.fps));
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
