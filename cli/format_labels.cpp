#include <algorithm>
#include <array>
#include <cstdio>

#include "cli/format.h"
#include "cli/names.h"

namespace {

constexpr const char *kSuffix = ".labels.txt";
constexpr double kUsualLengthMs = 30'000.0;  // marked when no length was asked for: a preview's

// One label: start and end in seconds, tab-separated, equal for a point.
std::string label(double start_ms, double end_ms, const std::string &name) {
    std::array<char, 80> times{};
    snprintf(times.data(), times.size(), "%.6f\t%.6f\t", start_ms / 1000.0, end_ms / 1000.0);
    return times.data() + name + "\n";
}

}  // namespace

std::string label_track(const record &result) {
    std::string track;
    if (result.has_highlight) {
        const double start = result.hl_pos_ms;
        const double length = result.length_s > 0 ? 1000.0 * result.length_s : kUsualLengthMs;
        const double end = std::min(start + length, static_cast<double>(result.duration_ms));
        track += label(start, std::max(start, end), "highlight");
    }
    size_t count = 0;
    for (const float beat : result.beats_ms) {
        const auto at = static_cast<double>(beat);
        track += label(at, at, "beat " + std::to_string(++count));
    }
    return track;
}

std::string label_path(const std::string &input, const std::string &output_dir) {
    if (output_dir.empty()) return input + kSuffix;
    return output_dir + (output_dir.back() == '/' ? "" : "/") + base_name(input) + kSuffix;
}

std::string labels_record(const record &result) {
    return result.written.empty() ? "" : shown(result.written) + "\n";
}
