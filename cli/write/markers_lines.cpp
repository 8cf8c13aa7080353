// Formats with a line or an object for each mark.
#include <array>
#include <cmath>
#include <cstdio>
#include <nlohmann/json.hpp>

#include "cli/write/file_names.h"
#include "cli/write/markers.h"

namespace {

std::string seconds(double ms, int digits) {
    std::array<char, 48> text{};
    snprintf(text.data(), text.size(), "%.*f", digits, ms / 1000.0);
    return text.data();
}

// hh:mm:ss.mmm
std::string clock(double ms) {
    const long long whole = std::llround(ms);
    std::array<char, 48> text{};
    snprintf(text.data(), text.size(), "%02lld:%02lld:%02lld.%03lld", whole / 3'600'000,
             whole / 60'000 % 60, whole / 1000 % 60, whole % 1000);
    return text.data();
}

}  // namespace

// A label track: start, end and name, separated by tabs; equal times make a point.
std::string audacity_labels(const record &result, const options & /*opts*/) {
    std::string out;
    for (const mark &entry : marks_of(result)) {
        out += seconds(entry.start_ms, 6) + "\t" + seconds(entry.end_ms, 6) + "\t" + entry.name;
        out += "\n";
    }
    return out;
}

// A time, a space and the guide's comment. Guides have no length.
std::string kdenlive_guides(const record &result, const options & /*opts*/) {
    std::string out;
    for (const mark &entry : marks_of(result)) {
        out += clock(entry.start_ms) + " " + entry.name + "\n";
    }
    return out;
}

// Segments: the highlight, then one from each beat to the next or to the end of the song.
std::string losslesscut_project(const record &result, const options & /*opts*/) {
    const std::vector<mark> marks = marks_of(result);
    nlohmann::ordered_json segments = nlohmann::ordered_json::array();
    for (size_t i = 0; i < marks.size(); ++i) {
        double end_ms = marks[i].end_ms;
        if (end_ms <= marks[i].start_ms) {
            end_ms = i + 1 < marks.size()
                         ? marks[i + 1].start_ms
                         : player_ms(result, static_cast<double>(result.duration_ms));
        }
        if (end_ms <= marks[i].start_ms) continue;  // two beats at one time
        segments.push_back({{"start", std::round(marks[i].start_ms) / 1000.0},
                            {"end", std::round(end_ms) / 1000.0},
                            {"name", marks[i].name}});
    }
    const nlohmann::ordered_json project = {{"version", 1},
                                            {"mediaFileName", as_utf8(base_name(result.file))},
                                            {"cutSegments", segments}};
    return project.dump(2) + "\n";
}

// The table of the region and marker manager.
std::string reaper_markers(const record &result, const options & /*opts*/) {
    std::string out = "#,Name,Start,End,Length\n";
    size_t regions = 0;
    size_t points = 0;
    for (const mark &entry : marks_of(result)) {
        const bool region = entry.end_ms > entry.start_ms;
        out += (region ? "R" + std::to_string(++regions) : "M" + std::to_string(++points)) + "," +
               entry.name + "," + clock(entry.start_ms) + ",";
        if (region) out += clock(entry.end_ms) + "," + clock(entry.end_ms - entry.start_ms) + "\n";
        if (!region) out += ",\n";
    }
    return out;
}
