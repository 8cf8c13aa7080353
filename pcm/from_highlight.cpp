#include "pcm/from_highlight.h"

#include <algorithm>
#include <cstdlib>

#include "common/alloc.h"
#include "pcm/read_pcm.h"
#include "pcm/resample.h"
#include "pcm/stitch.h"

namespace {

constexpr int64_t kFirstSeekMs = 1001;  // an earlier highlight is the beginning of the file
constexpr float kMsPerSecond = 1000.0F;

// The probe: PCM decoded afresh from the landing point. Its block lies far enough in for a decoder
// that has just been positioned to have settled.
constexpr int64_t kProbeBytes = 8192;
constexpr int64_t kProbeBlockAt = 4608;

// Seconds of the decoded PCM that are searched, before and after the expected place.
constexpr int64_t kSecondsBefore = 1;
constexpr int64_t kSecondsAfter = 3;

// Bytes of PCM that surely are in the buffer which was decoded by the plan of these records: what
// they brought, less what is dropped before stitching, and never more than the buffer has: it was
// planned from the first segment's start to the end of the stream.
int64_t decoded_bytes(const TAVO_DECSEG *seg) {
    const int32_t rate = seg->fmt.sample_rate;
    int64_t sum = 0;
    for (int32_t k = 0; k < seg->count; ++k) {
        const int64_t drop = k == 0 ? 0 : segment_skip(rate);
        const int64_t brought = std::max<int64_t>(seg[k].got - drop, 0);
        if (__builtin_add_overflow(sum, brought, &sum)) return 0;
    }
    int64_t allocated = 0;
    int64_t planned = 0;
    if (seg->count > 1 && seg->duration > 0) {
        if (__builtin_sub_overflow(seg->duration, seg->start, &planned) ||
            !span_bytes(planned, rate, &allocated)) {
            return 0;
        }
        sum = std::min(sum, allocated);
    }
    return sum;
}

// Where the block lies in pcm, in [first, last] and the first such place; -1 without one.
int64_t find_block(const match_block &block, const uint8_t *pcm, int64_t first, int64_t last) {
    for (int64_t place = first; place <= last; ++place) {
        if (block_is_at(block, pcm + place)) return place;
    }
    return -1;
}

// Throws the decoding away and decodes the stream again from start (100-ns units).
int32_t decode_again(TAVO_CTX *ctx, int64_t start) {
    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        free(ctx->seg[i].buf);
        ctx->seg[i].buf = nullptr;
    }
    free(ctx->pcm);
    ctx->pcm = nullptr;

    const int32_t err = construct_decbuf(ctx, start);
    if (err == 0) ctx->pcm_bytes = DecodePcmMT(ctx, ctx->pcm, ctx->pcm_bytes);
    return err;
}

// Makes pcm begin at byte off of itself, on an address that holds whole samples. *bytes: the rest.
const int16_t *pcm_from(int16_t *pcm, int64_t pcm_bytes, int64_t off, int64_t *bytes) {
    *bytes = std::max<int64_t>(pcm_bytes - off, 0);
    if (off % kBytesPerSample == 0) return pcm + std::min(off, pcm_bytes) / kBytesPerSample;
    auto *first = reinterpret_cast<uint8_t *>(pcm);
    if (*bytes > 0) memmove(first, first + off, static_cast<size_t>(*bytes));
    return pcm;
}

// Seeks to pos (milliseconds), notes where that lands and finds the place in the decoded PCM, or
// decodes from there. *off: bytes of pcm that lie before the landing point.
int32_t settle_start(TAVO_CTX *ctx, int64_t pos, int64_t *off) {
    int64_t reached = 0;
    if (__builtin_mul_overflow(pos, kUnitsPerMs, &reached)) reached = INT64_MAX;
    // A seek that fails without reporting a position counts as having reached the one asked for.
    mtsrc_seekstream(ctx->seg[0].src, reached, &reached);
    ctx->hl->hl_pos = static_cast<uint32_t>(reached / kUnitsPerMs);

    // float on purpose, in this order: the expected place is single precision
    const auto seconds = static_cast<float>(ctx->hl->hl_pos) / kMsPerSecond;
    const float expected = seconds * 2.0F * static_cast<float>(ctx->fmt.sample_rate);
    *off = static_cast<int64_t>(expected);
    // The records tell what the segments brought, and seams take some of that back: a block beyond
    // the PCM is none, and as the lowest match is the one reported, there is none inside either.
    if (_compare_decoded(&ctx->seg[0], ctx->pcm, off) == 0 &&
        *off <= ctx->pcm_bytes - kProbeBlockAt - kMatchBytes) {
        return 0;
    }

    *off = 0;
    return decode_again(ctx, reached);
}

}  // namespace

int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off) {
    auto *probe = static_cast<uint8_t *>(malloc(kProbeBytes));
    if (probe == nullptr) return -1;

    int64_t place = -1;
    if (read_pcm(seg->src, probe, kProbeBytes) >= kProbeBlockAt + kMatchBytes) {
        const int64_t second = segment_skip(seg->fmt.sample_rate);
        const int64_t before = second * kSecondsBefore;
        const int64_t after = second * kSecondsAfter;
        const int64_t decoded = decoded_bytes(seg);
        // The audio found must not begin before the buffer; neither sum can overflow.
        const int64_t first = *off < before + kProbeBlockAt ? kProbeBlockAt : *off - before;
        const int64_t end = *off > decoded - after ? decoded : *off + after;
        const match_block block = {probe + kProbeBlockAt, load_head(probe + kProbeBlockAt)};
        place = find_block(block, reinterpret_cast<const uint8_t *>(pcm), first,
                           std::min(end - 1, decoded - kMatchBytes));
    }
    free(probe);
    if (place < 0) return -1;
    *off = place - kProbeBlockAt;
    return 0;
}

int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos) {
    int64_t off = 0;
    int32_t err = 0;
    if (pos < kFirstSeekMs) {
        ctx->hl->hl_pos = 0;
    } else {
        err = settle_start(ctx, pos, &off);
    }
    if (err == 0) {
        int64_t bytes = 0;
        const int16_t *from = pcm_from(ctx->pcm, ctx->pcm_bytes, off, &bytes);
        err = dorn_resampler_run(from, bytes, ctx->fmt.sample_rate, ctx->ana_rate, &ctx->ana_len,
                                 &ctx->ana);
    }
    free(ctx->pcm);
    ctx->pcm = nullptr;
    return err;
}
