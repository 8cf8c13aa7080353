// OpenTimelineIO's JSON: a time line with the song as its only clip, and markers on it.
#include <algorithm>
#include <nlohmann/json.hpp>

#include "cli/write/file_names.h"
#include "cli/write/frame_rate.h"
#include "cli/write/markers.h"

namespace {

using otio = nlohmann::ordered_json;

otio frames(int64_t count, const frame_rate &rate) {
    return {{"OTIO_SCHEMA", "RationalTime.1"},
            {"value", count},
            {"rate", static_cast<double>(rate.frames) / rate.seconds}};
}

otio range(int64_t start, int64_t length, const frame_rate &rate) {
    return {{"OTIO_SCHEMA", "TimeRange.1"},
            {"start_time", frames(start, rate)},
            {"duration", frames(length, rate)}};
}

otio markers(const record &result, const frame_rate &rate) {
    otio list = otio::array();
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

std::string otio_timeline(const record &result, const options &opts) {
    const frame_rate &rate = *find_frame_rate(opts.fps);
    const std::string name = as_utf8(base_name(result.file));
    const double end_ms = player_ms(result, static_cast<double>(result.duration_ms));
    const otio whole = range(0, std::max<int64_t>(1, frame_at(end_ms, rate)), rate);
    const otio clip = {{"OTIO_SCHEMA", "Clip.1"},
                       {"name", name},
                       {"source_range", whole},
                       {"media_reference",
                        {{"OTIO_SCHEMA", "ExternalReference.1"},
                         {"target_url", file_url(result.file)},
                         {"available_range", whole}}},
                       {"markers", markers(result, rate)}};
    const otio track = {{"OTIO_SCHEMA", "Track.1"},
                        {"name", "song"},
                        {"kind", "Audio"},
                        {"children", otio::array({clip})}};
    const otio stack = {{"OTIO_SCHEMA", "Stack.1"}, {"children", otio::array({track})}};
    return otio({{"OTIO_SCHEMA", "Timeline.1"}, {"name", name}, {"tracks", stack}}).dump(2) + "\n";
}
