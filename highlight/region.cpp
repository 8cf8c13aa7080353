#include "highlight/region.h"

namespace {

constexpr int32_t kMaxToValley = 25;  // points (50 s): more distant valleys do not end the region
constexpr int32_t kScanBegin = 7;     // first point scanned after `chosen` (14 s)
constexpr int32_t kScanEnd = 24;      // last point scanned after `chosen` (48 s)
constexpr int64_t kMinLead = 3;       // points: a shorter lead does not move the start
constexpr int64_t kNearIdeal = 2;     // points: a valley this close to the ideal start wins

struct song_curve {
    const float *norm;
    int32_t n;
    int32_t nv;
    const int32_t *valleys;
    const int32_t *pairs;
    int32_t nseg;
    float mean;
    float std;
};

// The list entry nearest to the ideal start.
struct candidate {
    bool present;
    bool at_end;  // the distance was still falling at the last entry of the list
    int32_t pos;
    int64_t distance;  // distance from the ideal start, points
};

int64_t distance(int64_t a, int64_t b) {
    return a < b ? b - a : a - b;
}

// Walks along `list` from index `first` towards index `last` as long as each entry is strictly
// nearer to `ideal` than the one before. `step` is 1 or -1.
candidate walk_towards(int64_t ideal, const int32_t *list, int32_t first, int32_t last,
                       int32_t step) {
    int32_t k = first;
    int64_t nearest = distance(list[k], ideal);
    while (k != last && distance(list[k + step], ideal) < nearest) {
        k += step;
        nearest = distance(list[k], ideal);
    }
    return {true, k == last, list[k], nearest};
}

// Returns the index of the last valley at or before `chosen`, or -1.
int32_t valley_before(const song_curve *song, int32_t chosen) {
    int32_t k = 0;
    while (k < song->nv && song->valleys[k] <= chosen) ++k;
    return k - 1;
}

// True if the loudness at `idx` is below `last` and the mean loudness at idx + 2 and idx + 3 is
// below the mean of the song. False if idx + 3 is past the end of the song.
bool is_drop(const song_curve *song, int32_t idx, float last) {
    if (!(song->norm[idx] < last) || idx + 3 >= song->n) return false;
    return (song->norm[idx + 2] + song->norm[idx + 3]) * 0.5f < song->mean;
}

// Returns the end of the loud segment that contains `chosen`, or `fallback` if none does.
int32_t segment_end(const song_curve *song, int32_t chosen, int32_t fallback) {
    for (int32_t k = 0; k < song->nseg; ++k) {
        if (song->pairs[2 * k] <= chosen && chosen < song->pairs[2 * k + 1]) {
            return song->pairs[2 * k + 1];
        }
    }
    return fallback;
}

// Returns the end of the region that starts at `chosen`. Used if no valley bounds the region.
int32_t scan_for_end(const song_curve *song, int32_t chosen) {
    const float reference = song->norm[chosen];
    float last = reference;
    float lowest = 1.0f;
    int32_t lowest_pos = 0;
    int32_t drop_pos = 0;
    bool found = false;
    for (int32_t step = kScanBegin; step <= kScanEnd; ++step) {
        if (step >= song->n - chosen) {
            if (lowest_pos == 0 && !found) return song->n - 1;
            break;
        }
        const int32_t idx = chosen + step;
        const float v = song->norm[idx];
        if (v >= song->mean) continue;
        if (is_drop(song, idx, last)) {
            if (reference - v >= song->std) return idx;
            drop_pos = idx;
            found = true;
            last = v;
        } else if (!found && v < lowest) {
            lowest = v;
            lowest_pos = idx;
        }
    }
    return found ? drop_pos : segment_end(song, chosen, lowest_pos);
}

// Returns the start of a region that should begin `lead` points before `chosen`. `before` is the
// index of the last valley at or before `chosen`, or -1.
int64_t choose_start(const song_curve *song, int32_t chosen, int32_t before, int64_t lead) {
    const int64_t ideal = chosen - lead;
    candidate valley = {};
    if (before >= 0 && song->valleys[before] < chosen) {
        valley = walk_towards(ideal, song->valleys, before, 0, -1);
        if (valley.distance <= kNearIdeal) {
            if (valley.pos != 0) return valley.pos;
            valley.present = false;
        }
    }
    candidate segment = {};
    if (song->nseg >= 1) {
        segment = walk_towards(ideal, song->pairs, 0, 2 * song->nseg - 1, 1);
    }
    const bool segment_usable = segment.present && segment.pos >= 1;
    if (valley.present && valley.pos >= 1 && segment_usable) {
        return segment.distance < valley.distance ? segment.pos : valley.pos;
    }
    if (segment_usable && !segment.at_end) return segment.pos;
    return ideal > 0 ? ideal : 0;
}

// Returns `start`, or an earlier point if the region would extend past the end of the song.
int64_t fit_in_song(const song_curve *song, int64_t start, int32_t len_pts) {
    if (start + len_pts <= song->n) return start;
    const int64_t valley = song->nv > 0 ? song->valleys[0] : 0;
    const int64_t segment = song->nseg > 0 ? song->pairs[0] : 0;
    const int64_t first = valley < segment ? valley : segment;
    return first + len_pts <= song->n ? first : 0;
}

}  // namespace

uint32_t tavo_select_highlight_region(const float *norm, int32_t n, int32_t len_pts, int32_t chosen,
                                      int32_t nv, const int32_t *valleys, const int32_t *pairs,
                                      int32_t nseg, float mean, float std) {
    if (chosen < 0 || chosen >= n) return 0;
    const song_curve song = {norm, n, nv, valleys, pairs, nseg, mean, std};
    const int32_t before = valley_before(&song, chosen);
    const bool valley_follows = before + 1 < nv && valleys[before + 1] - chosen <= kMaxToValley;
    const int32_t end = valley_follows ? valleys[before + 1] : scan_for_end(&song, chosen);
    const int32_t length = end > chosen ? end - chosen : 0;
    const auto lead = static_cast<int64_t>(len_pts) - length;  // points wanted before `chosen`
    const int64_t start = lead < kMinLead ? chosen : choose_start(&song, chosen, before, lead);
    return static_cast<uint32_t>(fit_in_song(&song, start, len_pts));
}
