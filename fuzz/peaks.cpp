// Peak picking. Each result is compared with one that is written from the definition.
//
// Input: distances and counts, then samples of any value. Guaranteed by the callers: lengths of the
// arrays given, a distance that is not negative, room for the output as promised.
#include "dsp/peaks.h"

#include <algorithm>
#include <vector>

#include "fuzz/fuzz.h"

namespace {

constexpr size_t kMostSamples = 512;

template <typename Sample>
struct record {
    Sample value;
    int64_t index;
};

template <typename Sample>
std::vector<record<Sample>> all_peaks(const std::vector<Sample> &x) {
    std::vector<record<Sample>> peaks;
    for (size_t i = 1; i + 1 < x.size(); ++i) {
        if (x[i] > x[i - 1] && x[i] > x[i + 1]) peaks.push_back({x[i], static_cast<int64_t>(i)});
    }
    return peaks;
}

// Whether out holds peaks in the order that the definition asks for, none suppressed by another and
// each absent one suppressed by a larger or equal one that is there. The order of equal ones is
// open. reach: the farthest that suppresses; pinned: entries at the front that nothing suppresses.
template <typename Sample, typename Index>
void check_survivors(const std::vector<record<Sample>> &peaks, const std::vector<Sample> &x,
                     const Index *out, int64_t pinned, int64_t count, int64_t reach, bool all) {
    const auto value = [&](int64_t k) { return x[static_cast<size_t>(out[k])]; };
    const auto near = [&](int64_t a, int64_t b) { return std::abs(a - b) <= reach; };
    for (int64_t k = pinned; k < count; ++k) {
        fuzz::must(k == pinned || value(k - 1) >= value(k), "survivors descend");
        for (int64_t j = 0; j < k; ++j) {
            fuzz::must(!near(out[j], out[k]) && out[j] != out[k], "no survivor is near a larger");
        }
    }
    for (const auto &peak : peaks) {
        bool explained = !all;
        for (int64_t k = 0; k < count && !explained; ++k) {
            const auto at = static_cast<int64_t>(out[k]);
            explained = at == peak.index ||
                        (near(at, peak.index) && (k < pinned || value(k) >= peak.value));
        }
        fuzz::must(explained, "an absent peak is suppressed");
    }
}

void sorted_peaks(fuzz::input *in) {
    const uint32_t min_dist = in->take<uint8_t>() & 1 ? in->take<uint8_t>() : in->take<uint32_t>();
    const uint32_t max_count = in->take<uint8_t>() & 1 ? in->take<uint8_t>() : 0;
    std::vector<float> x(std::min(in->left / 4, kMostSamples));
    in->take_values(x.data(), x.size());
    const auto peaks = all_peaks(x);
    const size_t room = max_count == 0 ? x.size() / 2 : std::min<size_t>(max_count, x.size() / 2);
    std::vector<uint32_t> out(room);
    const int32_t count =
        findsortedNPeaks(x.data(), static_cast<int64_t>(x.size()), min_dist, max_count, out.data());
    fuzz::must(count >= 0 && static_cast<size_t>(count) <= room, "peaks fit their room");
    const bool all = max_count == 0 || static_cast<uint32_t>(count) < max_count;
    check_survivors(peaks, x, out.data(), 0, count, min_dist, all);
}

void spaced_peaks(fuzz::input *in) {
    const uint32_t min_dist = in->take<uint8_t>() & 1 ? in->take<uint8_t>() : in->take<uint32_t>();
    std::vector<double> x(std::min(in->left / 8, kMostSamples));
    in->take_values(x.data(), x.size());
    const auto peaks = all_peaks(x);
    std::vector<int32_t> out(x.size() / 2);
    const int32_t count = findPeaks(x.data(), static_cast<int64_t>(x.size()), min_dist, out.data());
    if (min_dist != 0) {
        check_survivors(peaks, x, out.data(), 0, count, static_cast<int64_t>(min_dist) - 1, true);
        return;
    }
    fuzz::must(static_cast<size_t>(count) == peaks.size(), "without a distance all are there");
    for (size_t k = 0; k < peaks.size(); ++k) fuzz::must(out[k] == peaks[k].index, "in order");
}

void priority_peaks(fuzz::input *in) {
    const int32_t min_dist =
        in->take<uint8_t>() & 1 ? in->take<uint8_t>() : in->take<int32_t>() & INT32_MAX;
    std::vector<int32_t> priority(in->take<uint8_t>() % 17);
    for (int32_t &position : priority) position = in->take<int16_t>();
    std::vector<double> x(std::min(in->left / 8, kMostSamples));
    in->take_values(x.data(), x.size());
    const auto peaks = all_peaks(x);
    std::vector<int32_t> out(priority.size() + x.size() / 2);
    const auto wanted = static_cast<int32_t>(priority.size());
    const int32_t count = findPeaksPriority(x.data(), static_cast<int64_t>(x.size()), min_dist,
                                            out.data(), wanted ? priority.data() : nullptr, wanted);
    if (min_dist == 0) {
        fuzz::must(count == -1, "a distance of 0 is refused");
        return;
    }
    std::vector<int32_t> list;
    for (const auto &peak : peaks) list.push_back(static_cast<int32_t>(peak.index));
    const auto n = static_cast<int32_t>(list.size());
    const int32_t *found = out.data();
    int32_t taken = 0;
    for (const int32_t position : priority) {
        const int32_t nearest = findNearestIndex(list.data(), position, n);
        if (n < 2 || nearest == n - 1) continue;
        fuzz::must(taken < count && found[taken] == list.data()[nearest], "the nearest come first");
        ++taken;
    }
    check_survivors(peaks, x, out.data(), taken, count, static_cast<int64_t>(min_dist) - 1, true);
}

void nearest_index(fuzz::input *in) {
    const auto target = in->take<int32_t>();
    std::vector<int32_t> list(std::min(in->left / 4, kMostSamples));
    for (int32_t &value : list) value = in->take<int32_t>();
    std::sort(list.begin(), list.end());
    const auto n = static_cast<int32_t>(list.size());
    const int32_t index = findNearestIndex(list.data(), target, n);
    fuzz::must(index >= 0 && index < std::max(n, 1), "an index lies in the list");
}

void equal_index(fuzz::input *in) {
    std::vector<double> x(1 + std::min(in->left / 8, kMostSamples));
    in->take_values(x.data(), x.size());
    const double value = x.back();
    const auto n = static_cast<int32_t>(x.size() - 1);
    const int32_t index = findIndex(x.data(), n, value);
    const auto end = x.begin() + n;
    const auto found = std::find(x.begin(), end, value);
    fuzz::must(index == (found == end ? 0 : found - x.begin()), "the first equal one, or 0");
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr void (*kFunctions[])(fuzz::input *) = {sorted_peaks, spaced_peaks, priority_peaks,
                                                     nearest_index, equal_index};
    fuzz::input in = {data, size};
    kFunctions[in.take<uint8_t>() % std::size(kFunctions)](&in);
    return 0;
}
