// Marker formats based on JSON.
#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>

#include "cli/write/file_names.h"
#include "cli/write/markers.h"

namespace {

using json = nlohmann::ordered_json;

json frames(int64_t count, const frame_rate &rate) {
    return {{"OTIO_SCHEMA", "RationalTime.1"},
            {"value", count},
            {"rate", static_cast<double>(rate.frames) / rate.seconds}};
}

json range(int64_t start, int64_t length, const frame_rate &rate) {
    return {{"OTIO_SCHEMA", "TimeRange.1"},
            {"start_time", frames(start, rate)},
            {"duration", frames(length, rate)}};
}

json otio_markers(const record &result, const frame_rate &rate) {
    json list = json::array();
    for (const mark &entry : marks_of(result)) {
        const int64_t start = frame_at(entry.start_ms, rate);
        list.push_back(
            {{"OTIO_SCHEMA", "Marker.2"},
             {"name", entry.name},
             {"color", entry.end_ms > entry.start_ms ? "RED" : "BLUE"},
             {"marked_range", range(start, frame_at(entry.end_ms, rate) - start, rate)}});
    }
    return list;
}

}  // namespace

// Segments for LosslessCut: the highlight, then one from each beat to the next or to the end of the
// song.
std::string losslesscut_project(const record &result, const frame_rate & /*rate*/) {
    const std::vector<mark> marks = marks_of(result);
    json segments = json::array();
    for (size_t i = 0; i < marks.size(); ++i) {
        double end_ms = marks[i].end_ms;
        if (end_ms <= marks[i].start_ms) {
            end_ms = i + 1 < marks.size()
                         ? marks[i + 1].start_ms
                         : player_ms(result, static_cast<double>(result.duration_ms));
        }
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

// OpenTimelineIO: a timeline with the song as its only clip and the markers on it.
std::string otio_timeline(const record &result, const frame_rate &rate) {
    const std::string name = as_utf8(base_name(result.file));
    const double end_ms = player_ms(result, static_cast<double>(result.duration_ms));
    const json whole = range(0, std::max<int64_t>(1, frame_at(end_ms, rate)), rate);
    const json clip = {{"OTIO_SCHEMA", "Clip.1"},
                       {"name", name},
                       {"source_range", whole},
                       {"media_reference",
                        {{"OTIO_SCHEMA", "ExternalReference.1"},
                         {"target_url", file_url(result.file)},
                         {"available_range", whole}}},
                       {"markers", otio_markers(result, rate)}};
    const json track = {{"OTIO_SCHEMA", "Track.1"},
                        {"name", "song"},
                        {"kind", "Audio"},
                        {"children", json::array({clip})}};
    const json stack = {{"OTIO_SCHEMA", "Stack.1"}, {"children", json::array({track})}};
    return json({{"OTIO_SCHEMA", "Timeline.1"}, {"name", name}, {"tracks", stack}}).dump(2) + "\n";
}
