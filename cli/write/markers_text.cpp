// Marker formats with one or a few lines per mark.
#include <algorithm>
#include <cmath>

#include "cli/write/file_names.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"

namespace {

// hh:mm:ss.mmm
std::string clock(double ms) {
    const long long whole = std::llround(ms);
    return formatted("%02lld:%02lld:%02lld.%03lld", whole / 3'600'000, whole / 60'000 % 60,
                     whole / 1000 % 60, whole % 1000);
}

struct chapter {
    long long start_ms;
    std::string title;
};

// Chapters are contiguous and begin at the start of the song.
std::vector<chapter> chapters_of(const record &result) {
    std::vector<chapter> chapters;
    for (const mark &entry : marks_of(result)) {
        chapters.push_back({std::llround(entry.start_ms), entry.name});
        if (!result.has_beats) chapters.push_back({std::llround(entry.end_ms), "after"});
    }
    if (chapters.empty() || chapters[0].start_ms > 0) {
        chapters.insert(chapters.begin(), {0, "start"});
    }
    return chapters;
}

}  // namespace

// A label track: start, end and name, separated by tabs; equal times make a point.
std::string audacity_labels(const record &result, const frame_rate & /*rate*/) {
    std::string out;
    for (const mark &entry : marks_of(result)) {
        out += formatted("%.6f\t%.6f\t", entry.start_ms / 1000.0, entry.end_ms / 1000.0) +
               entry.name + "\n";
    }
    return out;
}

// Each line has a time, a space and the comment of the guide. A guide is a point.
std::string kdenlive_guides(const record &result, const frame_rate & /*rate*/) {
    std::string out;
    for (const mark &entry : marks_of(result)) {
        out += clock(entry.start_ms) + " " + entry.name + "\n";
    }
    return out;
}

// The table of Reaper's region and marker manager.
std::string reaper_markers(const record &result, const frame_rate & /*rate*/) {
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

// FFmpeg's metadata file with chapters; docs/EDITORS.md shows its use.
std::string ffmetadata_chapters(const record &result, const frame_rate & /*rate*/) {
    const std::vector<chapter> chapters = chapters_of(result);
    std::string out = ";FFMETADATA1\n";
    for (size_t i = 0; i < chapters.size(); ++i) {
        const double song_end_ms = player_ms(result, static_cast<double>(result.duration_ms));
        const long long end_ms =
            i + 1 < chapters.size() ? chapters[i + 1].start_ms : std::llround(song_end_ms);
        if (end_ms <= chapters[i].start_ms) continue;
        out += "[CHAPTER]\nTIMEBASE=1/1000\nSTART=" + std::to_string(chapters[i].start_ms) +
               "\nEND=" + std::to_string(end_ms) + "\ntitle=" + chapters[i].title + "\n";
    }
    return out;
}

// An edit list with markers as comments, as DaVinci Resolve exports and imports them.
std::string edl_markers(const record &result, const frame_rate &rate) {
    std::string out = "TITLE: " + shown(base_name(result.file)) +
                      "\nFCM: " + (rate.drop ? "DROP FRAME" : "NON-DROP FRAME") + "\n";
    size_t event = 0;
    for (const mark &entry : marks_of(result)) {
        const int64_t start = frame_at(entry.start_ms, rate);
        const int64_t length = std::max<int64_t>(1, frame_at(entry.end_ms, rate) - start);
        const std::string times = timecode(start, rate) + " " + timecode(start + 1, rate);
        out += formatted("\n%03zu  001      V     C        ", ++event) + times + " " + times +
               "\n |C:ResolveColor" + (entry.end_ms > entry.start_ms ? "Red" : "Blue") +
               " |M:" + entry.name + " |D:" + std::to_string(length) + "\n";
    }
    return out;
}
