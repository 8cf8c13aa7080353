#include "cli/run/record.h"

#include <algorithm>

#include "include/tavo.h"

double player_ms(const record &result, double ms) {
    return std::max(ms - result.offset_ms, 0.0);
}

double highlight_end_ms(const record &result, int32_t length_s) {
    const double start = result.hl_pos_ms;
    const double end = std::min(start + 1000.0 * length_s, static_cast<double>(result.duration_ms));
    return std::max(start, end);
}

bool has_refinement(const record &result) {
    return result.has_highlight && result.mode == TAVO_MODE_HIGHLIGHT;
}

bool is_refined(const record &result) {
    return result.hl_pos_ms % TAVO_LOUDNESS_HOP_MS != 0;
}
