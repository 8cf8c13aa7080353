#include "highlight/search.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>

#include "common/alloc.h"
#include "dsp/peaks.h"
#include "dsp/stats.h"
#include "highlight/power_envelope.h"
#include "highlight/region.h"
#include "highlight/valleys.h"

namespace {

constexpr int32_t kMinPoints = 4;     // more points than this must follow the skipped ones
constexpr int32_t kMinSegment = 3;    // minimum number of points in a loud segment
constexpr int32_t kMinLoudAfter = 4;  // points that a segment must last after an edge
constexpr int32_t kNearValley = 3;    // an edge within this many points before a valley is ignored
constexpr int32_t kMaxSegments = 30;
constexpr int32_t kMaxEdges = 10;
constexpr uint32_t kEdgeDistance = 1;
constexpr int32_t kPercentile = 60;
constexpr double kMinSecondScore = 0.1;

// The loudness curve and what the search finds in it. Unused entries of the lists are 0.
struct search_state {
    const float *norm;  // [n] loudness divided by its largest value
    const float *diff;  // [n - 1] differences of neighbouring points
    int32_t n;
    int32_t skip;
    int32_t tail;
    float mean;  // mean of norm
    float std;
    float percentile;  // 60th percentile of norm
    int32_t nseg;
    int32_t start[kMaxSegments];  // last point before the rise
    int32_t end[kMaxSegments];    // last point above the mean
    int32_t nv;
    int32_t valley[kMaxValleys];
    int32_t edges;
    uint32_t edge[kMaxEdges];  // relative to skip, largest step first
};

uint32_t point_ms(int64_t k) {
    return static_cast<uint32_t>(static_cast<int64_t>(static_cast<float>(k + k) * 1000.0f));
}

// Orders values ascending, with NaNs last. This is a strict weak ordering of all values.
bool is_less(float a, float b) {
    if (std::isnan(a) || std::isnan(b)) return !std::isnan(a);
    return a < b;
}

// Finds the largest value and the 60th percentile. Returns false if memory runs out. Uses
// std::sort, which does not allocate; qsort may.
bool rank_curve(const float *power, int32_t n, float *largest, float *percentile) {
    const auto count = static_cast<size_t>(n);
    auto *sorted = static_cast<float *>(note_shortage(malloc(count * sizeof(float))));
    if (sorted == nullptr) return false;
    memcpy(sorted, power, count * sizeof(float));
    std::sort(sorted, sorted + count, is_less);
    *largest = sorted[n - 1];
    *percentile = sorted[static_cast<int64_t>(n) * kPercentile / 100];
    free(sorted);
    return true;
}

void find_segments(search_state *s) {
    // Point 0 counts as quiet, so a song that is loud from the start has a segment at point 0.
    bool above = false;
    for (int32_t k = 0; k < s->n - 1 && s->nseg < kMaxSegments; ++k) {
        const bool next_above = s->norm[k + 1] > s->mean;
        if (!above && next_above) s->start[s->nseg] = k;
        if (above && !next_above) {
            if (k - s->start[s->nseg] + 1 >= kMinSegment) {
                s->end[s->nseg] = k;
                ++s->nseg;
            } else {
                s->start[s->nseg] = 0;
            }
        }
        above = next_above;
    }
}

// Returns the number of points from `pos` to the next valley, or 0 if no valley follows.
int32_t valley_distance(const search_state *s, int32_t pos) {
    for (int32_t k = 0; k < s->nv; ++k) {
        if (s->valley[k] > pos) return s->valley[k] - pos;
    }
    return 0;
}

// True if `pos` is outside the tail, in a loud segment and at least kMinLoudAfter from its end.
bool is_in_segment(const search_state *s, int32_t pos) {
    if (pos > s->n - s->tail) return false;
    for (int32_t k = 0; k < s->nseg; ++k) {
        if (s->start[k] <= pos && pos + kMinLoudAfter <= s->end[k]) return true;
    }
    return false;
}

// Returns the edge with the best score, or 0 if no edge qualifies.
int32_t score_edges(const search_state *s) {
    float best = 0.0f;
    float second = 0.0f;
    int32_t best_pos = 0;
    int32_t second_pos = 0;
    for (int32_t k = 0; k < s->edges; ++k) {
        const auto pos = static_cast<int32_t>(s->edge[k]) + s->skip;
        if (!is_in_segment(s, pos)) continue;
        const int32_t distance = valley_distance(s, pos);
        if (distance >= 1 && distance <= kNearValley) continue;
        const float *norm = s->norm + pos;
        const float after = (norm[1] + norm[2]) * 0.5f;
        const float before = (norm[0] + norm[-1]) * 0.5f;
        if (after < before) continue;
        const float score = after - before + s->diff[pos];
        if (score > best) {
            best = score;
            best_pos = pos;
        } else if (score > second && static_cast<double>(score) > kMinSecondScore) {
            second = score;
            second_pos = pos;
        }
    }
    return best_pos != 0 ? best_pos : second_pos;
}

// Returns the point after the first edge that leads to a loud point. If no edge does, returns the
// point after the last edge.
int32_t first_loud_edge(const search_state *s) {
    int32_t pos = 0;
    for (int32_t k = 0; k < s->edges; ++k) {
        pos = static_cast<int32_t>(s->edge[k]) + s->skip + 1;
        const int32_t distance = valley_distance(s, pos);
        const bool clear = distance == 0 || distance > kNearValley;
        if (pos < s->n - s->tail && clear && s->norm[pos] > s->percentile) break;
    }
    return pos;
}

int32_t choose_edge(const search_state *s) {
    const int32_t scored = score_edges(s);
    return scored != 0 ? scored : first_loud_edge(s);
}

// Returns the start of the first loud segment or the first valley, whichever comes first. Used if a
// region of the requested length that starts at this point reaches the end of the song.
int32_t fallback_point(const search_state *s) {
    const int32_t start = s->nseg > 0 ? s->start[0] : 0;
    const int32_t valley = s->nv > 0 ? s->valley[0] : 0;
    if (s->nseg > 0 && s->nv > 0) return start < valley ? start : valley;
    return start > valley ? start : valley;
}

int64_t select_start(const search_state *s, int32_t chosen, int32_t hl_param) {
    const auto len_pts = static_cast<int32_t>(0.5f * static_cast<float>(hl_param));
    const int32_t fallback = fallback_point(s);
    if (static_cast<int64_t>(fallback) + len_pts >= s->n) return fallback;
    int32_t pairs[2 * kMaxSegments];
    for (int32_t k = 0; k < s->nseg; ++k) {
        pairs[2 * k] = s->start[k];
        pairs[2 * k + 1] = s->end[k];
    }
    return tavo_select_highlight_region(s->norm, s->n, len_pts, chosen, s->nv, s->valley, pairs,
                                        s->nseg, s->mean, s->std);
}

// Searches the curve. `norm` and `diff` are scratch memory for one value per point. Returns the
// coarse start in milliseconds.
uint32_t search_curve(const TAVO_HL_CTX *hl, int32_t duration_s, float *norm, float *diff) {
    search_state s = {};
    s.norm = norm;
    s.diff = diff;
    s.n = hl->power_count;
    s.skip = duration_s < TAVO_SHORT_SONG_S ? 0 : TAVO_SEARCH_SKIP;
    s.tail = duration_s < TAVO_SHORT_SONG_S ? TAVO_SHORT_SEARCH_TAIL : TAVO_SEARCH_TAIL;
    if (s.n - s.skip <= kMinPoints) return 0;

    float largest = 0.0f;
    if (!rank_curve(hl->power, s.n, &largest, &s.percentile)) return 0;
    if (largest == 0.0f) return 0;
    s.percentile /= largest;
    for (int32_t k = 0; k < s.n; ++k) norm[k] = hl->power[k] / largest;
    for (int32_t k = 0; k + 1 < s.n; ++k) diff[k] = norm[k + 1] - norm[k];
    getfloatMeanStd(norm, s.n, &s.mean, &s.std);

    find_segments(&s);
    s.edges = findsortedNPeaks(diff + s.skip, s.n - s.skip - 1, kEdgeDistance, kMaxEdges, s.edge);
    s.nv = tavo_find_valley(norm, s.n, s.valley, s.mean, s.std, kPowerHopSeconds);

    const int32_t chosen = s.edges > 0 ? choose_edge(&s) : 0;
    return point_ms(hl->hl_param > 0 ? select_start(&s, chosen, hl->hl_param) : chosen);
}

}  // namespace

uint32_t _get_HL_simple(TAVO_HL_CTX *hl, int32_t duration_s) {
    if (hl->power == nullptr || hl->power_count < 1) return 0;
    const auto count = static_cast<size_t>(hl->power_count);
    auto *norm = static_cast<float *>(note_shortage(malloc(2 * count * sizeof(float))));
    if (norm == nullptr) return 0;
    const uint32_t start = search_curve(hl, duration_s, norm, norm + count);
    free(norm);
    return start;
}
