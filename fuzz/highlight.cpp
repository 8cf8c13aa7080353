// Stage 7: loudness curve, valleys, search, region and refinement.
//
// Input: counts and positions, then values of any kind, infinities and what is no number among
// them. Guaranteed by the callers: lists that ascend and lie in the curve, with zeros behind their
// counts; a length that is not negative; PCM that reaches to tune_end.
#include <algorithm>
#include <vector>

#include "fuzz/fuzz.h"
#include "highlight/position.h"
#include "highlight/power_envelope.h"
#include "highlight/region.h"
#include "highlight/search.h"
#include "highlight/tune.h"

namespace {

constexpr int32_t kValleys = 15;
constexpr int32_t kSegments = 30;
constexpr size_t kMostPoints = 400;

std::vector<float> take_curve(fuzz::input *in) {
    std::vector<float> curve(std::min(in->left / 2, kMostPoints));
    in->take_values(curve.data(), curve.size());
    return curve;
}

void find_valleys(fuzz::input *in) {
    const auto mean = in->take<float>();
    const auto deviation = in->take<float>();
    const auto hop = (in->take<uint8_t>() & 1) != 0 ? 2.0f : in->take<float>();
    const std::vector<float> curve = take_curve(in);
    const auto n = static_cast<int32_t>(curve.size());
    std::vector<int32_t> out(kValleys, -7);
    const int32_t count = tavo_find_valley(curve.data(), n, out.data(), mean, deviation, hop);
    fuzz::must(count >= 0 && count <= kValleys, "valleys fit their room");
    for (int32_t k = 0; k < kValleys; ++k) {
        const int32_t at = out[static_cast<size_t>(k)];
        fuzz::must(k < count ? at >= 0 && at < n : at == -7, "valleys lie in the curve");
        fuzz::must(k < 1 || k >= count || out[static_cast<size_t>(k - 1)] < at, "valleys ascend");
    }
}

// count positions below n, ascending, of a list of room zeros.
std::vector<int32_t> take_positions(fuzz::input *in, int32_t count, size_t room, int32_t n) {
    std::vector<int32_t> list(static_cast<size_t>(count));
    for (int32_t &at : list) at = in->take_from(0, n - 1);
    std::sort(list.begin(), list.end());
    list.resize(std::max(room, list.size()));
    return list;
}

void select_region(fuzz::input *in) {
    const int32_t nv = in->take_from(0, kValleys);
    const int32_t nseg = in->take_from(0, kSegments);
    const int32_t length =
        (in->take<uint8_t>() & 7) != 0 ? in->take<uint8_t>() : in->take_from(0, INT32_MAX / 2);
    const int32_t n = in->take_from(1, kMostPoints);
    const int32_t chosen = in->take_from(-1, n);
    const auto valleys = take_positions(in, nv, kValleys, n);
    const auto pairs = take_positions(in, 2 * nseg, 0, n);
    const auto mean = in->take<float>();
    const auto deviation = in->take<float>();
    std::vector<float> curve(static_cast<size_t>(n));
    in->take_values(curve.data(), curve.size());
    const uint32_t start = tavo_select_highlight_region(
        curve.data(), n, length, chosen, nv, valleys.data(), pairs.data(), nseg, mean, deviation);
    fuzz::must(start < static_cast<uint32_t>(n), "a region starts in the song");
    fuzz::must(start == 0 || static_cast<int64_t>(start) + length <= n, "a region fits the song");
}

void search_curve(fuzz::input *in) {
    TAVO_HL_CTX hl = {};
    hl.hl_param = (in->take<uint8_t>() & 7) != 0 ? in->take<int8_t>() : in->take<int32_t>();
    std::vector<float> curve = take_curve(in);
    // Half of a song's points are as loud as the song is long; others belong to no song.
    const auto n = static_cast<int32_t>(curve.size());
    const int32_t duration = (in->take<uint8_t>() & 7) != 0 ? 2 * n + 4 : in->take<int32_t>();
    hl.power = curve.data();
    hl.power_count = n;
    const uint32_t start = _get_HL_simple(&hl, duration);
    fuzz::must(start % 2000 == 0, "a coarse start is one of the curve's points");
    fuzz::must(start < 2000u * static_cast<uint32_t>(std::max(n, 1)), "a start lies in the song");
}

// A short input becomes a song: each byte is the loudness of a part of it.
void whole_stage(fuzz::input *in) {
    TAVO_CTX ctx = {};
    ctx.fmt.sample_rate = in->take_from(1, 40);
    const int32_t wanted = in->take<int8_t>();
    const int32_t lied = in->take<int8_t>() / 64;  // seconds by which the duration is wrong
    const int64_t part = in->take_from(1, 90);
    const auto samples = static_cast<int64_t>(std::min<size_t>(in->left, 200)) * part;
    std::vector<int16_t> pcm(static_cast<size_t>(samples));
    for (int64_t i = 0; i < samples; i += part) {
        const auto level = static_cast<int16_t>(in->take<int8_t>() * 256);
        std::fill_n(pcm.begin() + i, part, level);
    }
    ctx.pcm = pcm.data();
    ctx.pcm_bytes = 2 * samples;
    ctx.duration = (samples / ctx.fmt.sample_rate + lied) * kUnitsPerSecond;
    ctx.hl = static_cast<TAVO_HL_CTX *>(calloc(1, sizeof(TAVO_HL_CTX)));
    ctx.hl->hl_param = wanted;
    const uint32_t start = getHLPosition(&ctx);
    fuzz::must(start == ctx.hl->hl_pos, "the start is stored");
    // The refinement counts frames of whole samples as 0.4 s each: at rates this low that they are
    // shorter, it may count on beyond the end.
    const bool whole_frames = ctx.fmt.sample_rate % 5 == 0;
    fuzz::must(
        !whole_frames || start * static_cast<int64_t>(ctx.fmt.sample_rate) <= samples * 1000 + 1000,
        "a highlight starts in the song");
    clearHighlgihtCtx(ctx.hl);
}

}  // namespace

int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    constexpr void (*kFunctions[])(fuzz::input *) = {find_valleys, select_region, search_curve,
                                                     whole_stage};
    fuzz::input in = {data, size};
    kFunctions[in.take<uint8_t>() % std::size(kFunctions)](&in);
    return 0;
}
