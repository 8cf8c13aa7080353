// Audacity's label track: start and end in seconds and a name, separated by tabs; equal times make
// a point.
#include <array>
#include <cstdio>

#include "cli/markers.h"

namespace {

std::string label(double start_ms, double end_ms, const std::string &name) {
    std::array<char, 80> times{};
    snprintf(times.data(), times.size(), "%.6f\t%.6f\t", start_ms / 1000.0, end_ms / 1000.0);
    return times.data() + name + "\n";
}

}  // namespace

std::string label_track(const record &result, const options & /*opts*/) {
    std::string track;
    if (result.has_highlight) track += label(result.hl_pos_ms, region_end_ms(result), "highlight");
    size_t count = 0;
    for (const float beat : result.beats_ms) {
        const auto at = static_cast<double>(beat);
        track += label(at, at, "beat " + std::to_string(++count));
    }
    return track;
}
