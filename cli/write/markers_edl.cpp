// An edit list with markers as comments, as DaVinci Resolve exports and imports them.
#include <algorithm>
#include <array>
#include <cstdio>

#include "cli/write/file_names.h"
#include "cli/write/frame_rate.h"
#include "cli/write/markers.h"

std::string edl_markers(const record &result, const options &opts) {
    const frame_rate &rate = *find_frame_rate(opts.fps);
    std::string out = "TITLE: " + shown(base_name(result.file)) +
                      "\nFCM: " + (rate.drop ? "DROP FRAME" : "NON-DROP FRAME") + "\n";
    size_t event = 0;
    for (const mark &entry : marks_of(result)) {
        const int64_t start = frame_at(entry.start_ms, rate);
        const int64_t length = std::max<int64_t>(1, frame_at(entry.end_ms, rate) - start);
        const std::string times = timecode(start, rate) + " " + timecode(start + 1, rate);
        std::array<char, 40> number{};
        snprintf(number.data(), number.size(), "%03zu  001      V     C        ", ++event);
        out += "\n";
        out += number.data();
        out += times + " " + times + "\n |C:ResolveColor";
        out += entry.end_ms > entry.start_ms ? "Red" : "Blue";
        out += " |M:" + entry.name + " |D:" + std::to_string(length) + "\n";
    }
    return out;
}
