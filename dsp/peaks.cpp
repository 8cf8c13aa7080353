#include "dsp/peaks.h"

#include <cstdlib>
#include <cstring>

#include "common/alloc.h"
#include "dsp/sort.h"

namespace {

// Flags stored for each input position.
constexpr uint8_t kSuppressed = 1;
constexpr uint8_t kPriority = 2;

constexpr int64_t kMaxIndexed = INT32_MAX;  // positions that fit a 32-bit index
constexpr int64_t kFar = INT64_MAX / 2;     // greater than any radius

template <typename Sample>
bool is_peak(const Sample *x, int64_t i) {
    return x[i] > x[i - 1] && x[i] > x[i + 1];
}

template <typename Sample>
int64_t count_peaks(const Sample *x, int64_t len) {
    int64_t count = 0;
    for (int64_t i = 1; i + 1 < len; ++i) count += is_peak(x, i) ? 1 : 0;
    return count;
}

// Returns the `count` peaks of x[len] in ascending order; the caller frees them. Returns null if
// memory runs out.
template <typename Record, typename Sample>
Record *collect_peaks(const Sample *x, int64_t len, int64_t count) {
    auto *peaks =
        static_cast<Record *>(note_shortage(calloc(static_cast<size_t>(count), sizeof(Record))));
    if (peaks == nullptr) return nullptr;
    int64_t k = 0;
    for (int64_t i = 1; i + 1 < len; ++i) {
        if (!is_peak(x, i)) continue;
        peaks[k].value = x[i];
        peaks[k].index = static_cast<decltype(peaks[k].index)>(i);
        ++k;
    }
    return peaks;
}

// Suppresses the positions within `radius` of `index`. Larger peaks in that range are already
// suppressed: had one survived, it would have suppressed this peak. Survivors are more than
// `radius` apart, so each position is marked at most twice in total.
void suppress_around(uint8_t *marks, int64_t len, int64_t index, int64_t radius) {
    if (radius < 0) return;
    const int64_t begin = index > radius ? index - radius : 0;
    const int64_t end = len - 1 - index > radius ? index + radius : len - 1;
    memset(marks + begin, kSuppressed, static_cast<size_t>(end - begin + 1));
}

// Writes the peaks that survive, at most `limit` and in the given order. Each one suppresses its
// neighbours. Returns the number of peaks written.
template <typename Record, typename Index>
int32_t write_survivors(const Record *peaks, int64_t count, uint8_t *marks, int64_t len,
                        int64_t radius, int64_t limit, Index *out) {
    int32_t written = 0;
    for (int64_t k = 0; k < count && written < limit; ++k) {
        const int64_t index = peaks[k].index;
        if ((marks[index] & kSuppressed) != 0) continue;
        out[written++] = peaks[k].index;
        suppress_around(marks, len, index, radius);
    }
    return written;
}

// Suppresses the positions within `radius` of any priority position, in two sweeps.
void suppress_around_priorities(uint8_t *marks, int64_t len, int64_t radius) {
    int64_t distance = kFar;  // from the nearest priority position already swept
    for (int64_t i = 0; i < len; ++i) {
        distance = (marks[i] & kPriority) != 0 ? 0 : distance + 1;
        if (distance <= radius) marks[i] = static_cast<uint8_t>(marks[i] | kSuppressed);
    }
    distance = kFar;
    for (int64_t i = len - 1; i >= 0; --i) {
        distance = (marks[i] & kPriority) != 0 ? 0 : distance + 1;
        if (distance <= radius) marks[i] = static_cast<uint8_t>(marks[i] | kSuppressed);
    }
}

// Same as findNearestIndex, but uses binary search, because a long song has thousands of targets
// and hundreds of thousands of peaks. `list` must be strictly ascending and `target` at least 0.
int32_t search_nearest(const int32_t *list, int32_t target, int32_t n) {
    int32_t begin = 0;  // entries before begin are below target, entries from end on are not
    int32_t end = n;
    while (begin < end) {
        const int32_t middle = begin + (end - begin) / 2;
        if (list[middle] < target) {
            begin = middle + 1;
        } else {
            end = middle;
        }
    }
    if (begin == 0) return 0;
    if (begin == n) return n - 1;
    return list[begin] - target >= target - list[begin - 1] ? begin - 1 : begin;
}

// Writes the peaks nearest to the priority positions and marks them. Returns the number of peaks
// written, or -1 if memory runs out.
int32_t write_priorities(const PEAK_INFO *peaks, int32_t count, const int32_t *priority,
                         int32_t n_priority, uint8_t *marks, int32_t *out) {
    if (count < 2 || n_priority < 1) return 0;
    auto *list =
        static_cast<int32_t *>(note_shortage(malloc(static_cast<size_t>(count) * sizeof(int32_t))));
    if (list == nullptr) return -1;
    for (int32_t k = 0; k < count; ++k) list[k] = peaks[k].index;
    int32_t priorities = 0;
    for (int32_t k = 0; k < n_priority; ++k) {
        // The distance to a negative target may wrap around, which only the linear search
        // reproduces.
        const int32_t nearest = priority[k] < 0 ? findNearestIndex(list, priority[k], count)
                                                : search_nearest(list, priority[k], count);
        if (nearest == count - 1) continue;
        marks[list[nearest]] = kPriority;
        out[priorities++] = list[nearest];
    }
    free(list);
    return priorities;
}

int32_t wrapping_distance(int32_t a, int32_t b) {
    const auto difference = static_cast<uint32_t>(a) - static_cast<uint32_t>(b);
    const bool negative = static_cast<int32_t>(difference) < 0;
    return static_cast<int32_t>(negative ? 0u - difference : difference);
}

}  // namespace

int32_t findsortedNPeaks(const float *x, int64_t len, uint32_t min_dist, uint32_t max_count,
                         uint32_t *out) {
    if (len > kMaxIndexed) len = kMaxIndexed;
    const int64_t count = count_peaks(x, len);
    if (count == 0) return 0;
    auto *peaks = collect_peaks<PEAK_INFO_F>(x, len, count);
    auto *marks = static_cast<uint8_t *>(note_shortage(calloc(static_cast<size_t>(len), 1)));
    int32_t written = 0;
    if (peaks != nullptr && marks != nullptr) {
        qsort(peaks, static_cast<size_t>(count), sizeof(PEAK_INFO_F), compare_peak_f);
        const int64_t limit = max_count == 0 ? count : static_cast<int64_t>(max_count);
        // A peak exactly min_dist away is suppressed. With a distance of 0, the range is only the
        // peak itself, so nothing else is suppressed.
        written = write_survivors(peaks, count, marks, len, min_dist, limit, out);
    }
    free(marks);
    free(peaks);
    return written;
}

int32_t findPeaks(const double *x, int64_t len, uint32_t min_dist, int32_t *out) {
    if (len > kMaxIndexed) len = kMaxIndexed;
    const int64_t count = count_peaks(x, len);
    if (count == 0) return 0;
    auto *peaks = collect_peaks<PEAK_INFO>(x, len, count);
    auto *marks = static_cast<uint8_t *>(note_shortage(calloc(static_cast<size_t>(len), 1)));
    int32_t written = 0;
    if (peaks != nullptr && marks != nullptr) {
        if (min_dist != 0) {
            qsort(peaks, static_cast<size_t>(count), sizeof(PEAK_INFO), compare_peak);
        }
        // A peak exactly min_dist away survives.
        const auto radius = static_cast<int64_t>(min_dist) - 1;
        written = write_survivors(peaks, count, marks, len, radius, count, out);
    }
    free(marks);
    free(peaks);
    return written;
}

int32_t findPeaksPriority(const double *x, int64_t len, int32_t min_dist, int32_t *out,
                          const int32_t *priority, int32_t n_priority) {
    if (min_dist == 0) return -1;
    if (len > kMaxIndexed) len = kMaxIndexed;
    const int64_t count = count_peaks(x, len);
    if (count == 0) return 0;
    auto *peaks = collect_peaks<PEAK_INFO>(x, len, count);
    auto *marks = static_cast<uint8_t *>(note_shortage(calloc(static_cast<size_t>(len), 1)));
    int32_t priorities = -1;
    if (peaks != nullptr && marks != nullptr) {
        priorities =
            write_priorities(peaks, static_cast<int32_t>(count), priority, n_priority, marks, out);
    }
    int32_t written = 0;
    if (priorities >= 0) {
        const auto radius = static_cast<int64_t>(min_dist) - 1;
        suppress_around_priorities(marks, len, radius);
        qsort(peaks, static_cast<size_t>(count), sizeof(PEAK_INFO), compare_peak);
        written =
            priorities + write_survivors(peaks, count, marks, len, radius, count, out + priorities);
    }
    free(marks);
    free(peaks);
    return written;
}

int32_t findNearestIndex(const int32_t *list, int32_t target, int32_t n) {
    if (n < 2) return 0;
    for (int32_t k = 0; k + 1 < n; ++k) {
        if (wrapping_distance(list[k + 1], target) >= wrapping_distance(list[k], target)) return k;
    }
    return n - 1;
}

int32_t findIndex(const double *x, int32_t n, double value) {
    for (int32_t k = 0; k < n; ++k) {
        if (x[k] == value) return k;
    }
    return 0;
}
