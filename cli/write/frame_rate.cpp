#include "cli/write/frame_rate.h"

#include <cmath>

#include "cli/write/value_text.h"

namespace {

constexpr frame_rate kRates[] = {
    {"23.976", 24000, 1001, 24, false}, {"24", 24, 1, 24, false},
    {"25", 25, 1, 25, false},           {"29.97", 30000, 1001, 30, false},
    {"29.97df", 30000, 1001, 30, true}, {"30", 30, 1, 30, false},
    {"50", 50, 1, 50, false},           {"59.94", 60000, 1001, 60, false},
    {"59.94df", 60000, 1001, 60, true}, {"60", 60, 1, 60, false},
};
constexpr int64_t kStartMinutes = 60;  // the timecode of frame 0

// Frame numbers that drop-frame timecode skips at the start of each minute, except every tenth.
int64_t dropped_a_minute(const frame_rate &rate) {
    return rate.drop ? rate.base / 15 : 0;
}

// Returns the frame number of a frame, including the skipped numbers before it.
int64_t number_of(int64_t frame, const frame_rate &rate) {
    const int64_t dropped = dropped_a_minute(rate);
    const int64_t minute = 60LL * rate.base - dropped;  // frames per minute
    const int64_t ten_minutes = 10 * minute + dropped;
    frame += kStartMinutes / 10 * ten_minutes;
    const int64_t tens = frame / ten_minutes;
    const int64_t rest = frame % ten_minutes;
    const int64_t minutes = rest < dropped ? 0 : (rest - dropped) / minute;
    return frame + dropped * (9 * tens + minutes);
}

}  // namespace

const frame_rate *find_frame_rate(const std::string &name) {
    for (const frame_rate &rate : kRates) {
        if (name == rate.name) return &rate;
    }
    return nullptr;
}

std::vector<std::string> frame_rate_names() {
    std::vector<std::string> names;
    for (const frame_rate &rate : kRates) names.emplace_back(rate.name);
    return names;
}

int64_t frame_at(double ms, const frame_rate &rate) {
    return std::llround(ms / 1000.0 * rate.frames / rate.seconds);
}

std::string timecode(int64_t frame, const frame_rate &rate) {
    const int64_t number = number_of(frame, rate);
    const auto seconds = static_cast<long long>(number / rate.base);
    return formatted("%02lld:%02lld:%02lld%c%02lld", seconds / 3600, seconds / 60 % 60,
                     seconds % 60, rate.drop ? ';' : ':',
                     static_cast<long long>(number % rate.base));
}
