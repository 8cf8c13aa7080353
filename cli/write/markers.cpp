#include "cli/write/markers.h"

#include <algorithm>
#include <cinttypes>
#include <cmath>
#include <filesystem>
#include <nlohmann/json.hpp>

#include "cli/write/value_text.h"

namespace {

using json = nlohmann::ordered_json;

constexpr int32_t kUsualLengthSeconds = 30;  // of a preview, if --length is not given

constexpr int64_t kStartMinutes = 60;  // timecode of frame 0, the usual start in editors

// The highlight from its start to its end, or a beat, whose start and end are equal. Times are
// player times in milliseconds.
struct mark {
    double start_ms;
    double end_ms;
    std::string name;
};

bool is_region(const mark &entry) {
    return entry.end_ms > entry.start_ms;
}

// Returns all marks of a song, the highlight first.
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

double song_end_ms(const record &result) {
    return player_ms(result, static_cast<double>(result.duration_ms));
}

// Returns the nearest video frame.
int64_t frame_at(double ms, const frame_rate &rate) {
    return std::llround(ms / 1000.0 * rate.frames / rate.seconds);
}

// Returns the length of a mark in video frames, at least 1.
int64_t frame_count(const mark &entry, const frame_rate &rate) {
    return std::max<int64_t>(1, frame_at(entry.end_ms, rate) - frame_at(entry.start_ms, rate));
}

// Formats a timecode as hh:mm:ss:ff. Drop-frame timecode has a semicolon before the frames and
// skips the first frame numbers of each minute, except in every tenth minute.
std::string timecode(int64_t frame, const frame_rate &rate) {
    const int64_t dropped = rate.drop ? rate.base / 15 : 0;  // frame numbers per minute
    const int64_t minute = 60LL * rate.base - dropped;       // frames per minute
    const int64_t ten_minutes = 10 * minute + dropped;
    frame += kStartMinutes / 10 * ten_minutes;
    const int64_t rest = frame % ten_minutes;
    const int64_t minutes = rest < dropped ? 0 : (rest - dropped) / minute;
    const int64_t number = frame + dropped * (9 * (frame / ten_minutes) + minutes);
    const long long seconds = number / rate.base;
    const long long frames = number % rate.base;
    return formatted("%02lld:%02lld:%02lld%c%02lld", seconds / 3600, seconds / 60 % 60,
                     seconds % 60, rate.drop ? ';' : ':', frames);
}

// ---- Text formats.

// Formats a time as hh:mm:ss.mmm.
std::string clock(double ms) {
    const long long whole = std::llround(ms);
    return formatted("%02lld:%02lld:%02lld.%03lld", whole / 3'600'000, whole / 60'000 % 60,
                     whole / 1000 % 60, whole % 1000);
}

// Returns a label track. Each line has the start, the end and the name, separated by tabs. Equal
// times mark a point.
std::string audacity_labels(const record &result, const frame_rate & /*rate*/) {
    std::string out;
    for (const mark &entry : marks_of(result)) {
        out += formatted("%.6f\t%.6f\t%s\n", entry.start_ms / 1000.0, entry.end_ms / 1000.0,
                         entry.name.c_str());
    }
    return out;
}

// Returns guides. Each line has a time, a space and a comment. A guide is a point in time.
std::string kdenlive_guides(const record &result, const frame_rate & /*rate*/) {
    std::string out;
    for (const mark &entry : marks_of(result)) {
        out += clock(entry.start_ms) + " " + entry.name + "\n";
    }
    return out;
}

// Returns a table for Reaper's region and marker manager.
std::string reaper_markers(const record &result, const frame_rate & /*rate*/) {
    std::string out = "#,Name,Start,End,Length\n";
    size_t regions = 0;
    size_t points = 0;
    for (const mark &entry : marks_of(result)) {
        const bool region = is_region(entry);
        const std::string number =
            region ? "R" + std::to_string(++regions) : "M" + std::to_string(++points);
        out += number + "," + entry.name + "," + clock(entry.start_ms) + "," +
               (region ? clock(entry.end_ms) + "," + clock(entry.end_ms - entry.start_ms) : ",") +
               "\n";
    }
    return out;
}

// Returns an FFmpeg metadata file. Its chapters are contiguous and begin at the start of the song.
std::string ffmetadata_chapters(const record &result, const frame_rate & /*rate*/) {
    std::vector<std::pair<long long, std::string>> starts = {{0, "start"}};
    for (const mark &entry : marks_of(result)) {
        starts.emplace_back(std::llround(entry.start_ms), entry.name);
        if (!result.has_beats) starts.emplace_back(std::llround(entry.end_ms), "after");
    }
    starts.emplace_back(std::llround(song_end_ms(result)), "end");
    std::string out = ";FFMETADATA1\n";
    for (size_t i = 0; i + 1 < starts.size(); ++i) {
        if (starts[i + 1].first <= starts[i].first) continue;
        out += formatted("[CHAPTER]\nTIMEBASE=1/1000\nSTART=%lld\nEND=%lld\ntitle=%s\n",
                         starts[i].first, starts[i + 1].first, starts[i].second.c_str());
    }
    return out;
}

// Returns an edit list with the markers as comments, in the form that DaVinci Resolve exports.
std::string edl_markers(const record &result, const frame_rate &rate) {
    std::string out = "TITLE: " + shown(base_name(result.file)) +
                      "\nFCM: " + (rate.drop ? "DROP FRAME" : "NON-DROP FRAME") + "\n";
    size_t event = 0;
    for (const mark &entry : marks_of(result)) {
        const int64_t start = frame_at(entry.start_ms, rate);
        const std::string times = timecode(start, rate) + " " + timecode(start + 1, rate);
        out += formatted(
            "\n%03zu  001      V     C        %s %s\n |C:ResolveColor%s |M:%s |D:%" PRId64 "\n",
            ++event, times.c_str(), times.c_str(), is_region(entry) ? "Red" : "Blue",
            entry.name.c_str(), frame_count(entry, rate));
    }
    return out;
}

// Formats a number of video frames as a fraction of seconds.
std::string frames_text(int64_t frames, const frame_rate &rate) {
    return formatted("%" PRId64 "/%ds", frames * rate.seconds, rate.frames);
}

// Returns a Final Cut Pro project with the song as its only clip and the markers on the clip.
std::string fcpxml_markers(const record &result, const frame_rate &rate) {
    const std::string name = xml_text(base_name(result.file));
    const int64_t frames = frame_at(static_cast<double>(result.duration_ms), rate);
    const std::string length = frames_text(std::max<int64_t>(1, frames), rate);
    std::string out = formatted(
        R"(<?xml version="1.0" encoding="UTF-8"?>
<!DOCTYPE fcpxml>
<fcpxml version="1.8">
<resources>
<format id="r1" frameDuration="%s" width="1920" height="1080"/>
<asset id="r2" name="%s" src="%s" start="0s" duration="%s" hasAudio="1" audioSources="1" audioChannels="%d" audioRate="%d"/>
</resources>
<project name="%s">
<sequence format="r1" duration="%s" tcStart="0s" tcFormat="%s">
<spine>
<asset-clip ref="r2" name="%s" offset="0s" duration="%s">
)",
        frames_text(1, rate).c_str(), name.c_str(), file_url(result.file).c_str(), length.c_str(),
        result.channels, result.sample_rate, name.c_str(), length.c_str(), rate.drop ? "DF" : "NDF",
        name.c_str(), length.c_str());
    for (const mark &entry : marks_of(result)) {
        out += formatted("<marker start=\"%s\" duration=\"%s\" value=\"%s\"/>\n",
                         frames_text(frame_at(entry.start_ms, rate), rate).c_str(),
                         frames_text(frame_count(entry, rate), rate).c_str(), entry.name.c_str());
    }
    return out + "</asset-clip>\n</spine>\n</sequence>\n</project>\n</fcpxml>\n";
}

// ---- Formats based on JSON.

// Returns a LosslessCut project. Its segments are the highlight, then the spans from each beat to
// the next one or to the end of the song.
std::string losslesscut_project(const record &result, const frame_rate & /*rate*/) {
    std::vector<mark> marks = marks_of(result);
    marks.push_back({song_end_ms(result), song_end_ms(result), "end"});
    json segments = json::array();
    for (size_t i = 0; i + 1 < marks.size(); ++i) {
        const double end_ms = is_region(marks[i]) ? marks[i].end_ms : marks[i + 1].start_ms;
        if (end_ms <= marks[i].start_ms) continue;  // two beats at the same time
        segments.push_back({{"start", std::round(marks[i].start_ms) / 1000.0},
                            {"end", std::round(end_ms) / 1000.0},
                            {"name", marks[i].name}});
    }
    const json project = {{"version", 1},
                          {"mediaFileName", as_utf8(base_name(result.file))},
                          {"cutSegments", segments}};
    return project.dump(2) + "\n";
}

// Returns a range of video frames as an OpenTimelineIO TimeRange.
json range(int64_t start, int64_t length, const frame_rate &rate) {
    const auto time = [&](int64_t count) {
        return json{{"OTIO_SCHEMA", "RationalTime.1"},
                    {"value", count},
                    {"rate", static_cast<double>(rate.frames) / rate.seconds}};
    };
    return {
        {"OTIO_SCHEMA", "TimeRange.1"}, {"start_time", time(start)}, {"duration", time(length)}};
}

// Returns an OpenTimelineIO timeline with the song as its only clip and the markers on the clip.
std::string otio_timeline(const record &result, const frame_rate &rate) {
    json markers = json::array();
    for (const mark &entry : marks_of(result)) {
        const int64_t start = frame_at(entry.start_ms, rate);
        markers.push_back(
            {{"OTIO_SCHEMA", "Marker.2"},
             {"name", entry.name},
             {"color", is_region(entry) ? "RED" : "BLUE"},
             {"marked_range", range(start, frame_at(entry.end_ms, rate) - start, rate)}});
    }
    const std::string name = as_utf8(base_name(result.file));
    const int64_t length = std::max<int64_t>(1, frame_at(song_end_ms(result), rate));
    const json whole = range(0, length, rate);
    const json clip = {{"OTIO_SCHEMA", "Clip.1"},
                       {"name", name},
                       {"source_range", whole},
                       {"media_reference",
                        {{"OTIO_SCHEMA", "ExternalReference.1"},
                         {"target_url", file_url(result.file)},
                         {"available_range", whole}}},
                       {"markers", markers}};
    const json track = {{"OTIO_SCHEMA", "Track.1"},
                        {"name", "song"},
                        {"kind", "Audio"},
                        {"children", json::array({clip})}};
    const json stack = {{"OTIO_SCHEMA", "Stack.1"}, {"children", json::array({track})}};
    return json({{"OTIO_SCHEMA", "Timeline.1"}, {"name", name}, {"tracks", stack}}).dump(2) + "\n";
}

}  // namespace

const std::map<std::string, frame_rate> kFrameRates = {
    {"23.976", {24000, 1001, 24, false}}, {"24", {24, 1, 24, false}},
    {"25", {25, 1, 25, false}},           {"29.97", {30000, 1001, 30, false}},
    {"29.97df", {30000, 1001, 30, true}}, {"30", {30, 1, 30, false}},
    {"50", {50, 1, 50, false}},           {"59.94", {60000, 1001, 60, false}},
    {"59.94df", {60000, 1001, 60, true}}, {"60", {60, 1, 60, false}},
};

const std::map<std::string, marker_format> kMarkerFormats = {
    {"labels", {".labels.txt", false, false, audacity_labels}},
    {"kdenlive", {".guides.txt", false, false, kdenlive_guides}},
    // LosslessCut looks for the song's stem.
    {"llc", {"-proj.llc", true, false, losslesscut_project}},
    {"ffmetadata", {".ffmetadata.txt", false, false, ffmetadata_chapters}},
    {"edl", {".edl", false, true, edl_markers}},
    {"fcpxml", {".fcpxml", false, true, fcpxml_markers}},
    {"otio", {".otio", false, true, otio_timeline}},
    {"reaper", {".reaper.csv", false, false, reaper_markers}},
};

std::string marker_path(const std::string &input, const options &opts) {
    const std::string name = base_name(input);
    const std::string file =
        fitting_name(opts.markers->drops_ending ? stem(name) : name, opts.markers->suffix);
    if (!opts.output_dir.empty()) return std::filesystem::path(opts.output_dir) / file;
    return std::filesystem::path(input).replace_filename(file);
}

std::string marker_content(const record &result, const options &opts) {
    return opts.markers->content(result, kFrameRates.at(opts.fps));
}

double region_end_ms(const record &result) {
    return highlight_end_ms(result, result.length_s > 0 ? result.length_s : kUsualLengthSeconds);
}
