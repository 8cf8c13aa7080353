#include "pcm/from_highlight.h"

#include <algorithm>
#include <cstdlib>

#include "common/alloc.h"
#include "pcm/block_search.h"
#include "pcm/read_pcm.h"
#include "pcm/song.h"
#include "pcm/stitch.h"

namespace {

constexpr int64_t kFirstSeekMs = 1001;  // an earlier highlight is the beginning of the file
constexpr float kMsPerSecond = 1000.0f;

// The probe is PCM decoded afresh from the landing point. Its block lies so far in that a decoder
// that has just been positioned has settled.
constexpr int64_t kProbeBytes = 8192;
constexpr int64_t kProbeBlockAt = 4608;

// Seconds of PCM searched before and after the expected place.
constexpr int64_t kSecondsBefore = 1;
constexpr int64_t kSecondsAfter = 3;

constexpr int64_t kUnknownBytes = INT64_MAX;  // size of a PCM buffer that no record tells

// Where the probe's block may lie in PCM of pcm_bytes bytes when the landing point is expected at
// byte expected.
place_range search_range(int64_t expected, int32_t rate, int64_t pcm_bytes) {
    const int64_t second = std::max<int64_t>(second_bytes(rate), 0);
    const int64_t before = second * kSecondsBefore;
    const int64_t after = second * kSecondsAfter;
    // The landing point must not lie before the buffer. No sum here can overflow.
    const int64_t first = expected < before + kProbeBlockAt ? kProbeBlockAt : expected - before;
    const int64_t end = expected > pcm_bytes - after ? pcm_bytes : expected + after;
    return {first, std::min(end, pcm_bytes - kBlockBytes + 1)};
}

// Finds in pcm the audio that the source delivers next. *off: bytes, in the expected offset of that
// audio, out the offset found. Returns 0 found, -1 not, with *off unchanged.
int32_t find_landing(mtsrc_ctx *src, int32_t rate, const int16_t *pcm, int64_t pcm_bytes,
                     int64_t *off) {
    auto *probe = static_cast<uint8_t *>(malloc(kProbeBytes));
    if (probe == nullptr) return -1;

    int64_t place = kNoPlace;
    if (read_pcm(src, probe, kProbeBytes) >= kProbeBlockAt + kBlockBytes) {
        place = find_lowest(reinterpret_cast<const uint8_t *>(pcm),
                            search_range(*off, rate, pcm_bytes), probe + kProbeBlockAt);
    }
    free(probe);
    if (place == kNoPlace) return -1;
    *off = place - kProbeBlockAt;
    return 0;
}

// Bytes of the buffer that the segment's plan allocated: from the segment's start to the end of the
// stream.
int64_t planned_bytes(const TAVO_DECSEG *seg) {
    if (seg->duration == 0) return kUnknownBytes;
    int64_t units = 0;
    int64_t bytes = 0;
    if (__builtin_sub_overflow(seg->duration, seg->start, &units)) return 0;
    return span_bytes(units, seg->fmt.sample_rate, &bytes) ? bytes : 0;
}

// Discards the decoding and decodes the stream again from start (100-ns units). keep: whether the
// segments' buffers stay allocated.
int32_t decode_again(TAVO_CTX *ctx, int64_t start, bool keep) {
    for (int32_t i = 0; i < ctx->seg_count; ++i) free_segment_buffer(&ctx->seg[i]);
    free(ctx->pcm);
    ctx->pcm = nullptr;

    const int32_t err = construct_decbuf(ctx, start);
    if (err != 0) return err;
    if (keep) {
        ctx->pcm_bytes = DecodePcmMT(ctx, ctx->pcm, ctx->pcm_bytes);
    } else {
        decode_song(ctx);
    }
    return 0;
}

// Seeks to pos (milliseconds), stores the landing point as the highlight and finds it in the
// decoded PCM, or decodes from there. *off: bytes of pcm before the landing point.
int32_t settle_start(TAVO_CTX *ctx, int64_t pos, bool keep, int64_t *off) {
    mtsrc_ctx *src = ctx->seg[0].src;
    const int32_t rate = ctx->fmt.sample_rate;
    int64_t reached = 0;
    if (__builtin_mul_overflow(pos, kUnitsPerMs, &reached)) reached = INT64_MAX;
    // A seek that fails without reporting a position counts as having reached the one asked for.
    mtsrc_seekstream(src, reached, &reached);
    ctx->hl->hl_pos = static_cast<uint32_t>(reached / kUnitsPerMs);

    // float on purpose, in this order: the expected place is single precision
    const float seconds = static_cast<float>(ctx->hl->hl_pos) / kMsPerSecond;
    *off = static_cast<int64_t>(seconds * 2.0f * static_cast<float>(rate));
    if (find_landing(src, rate, ctx->pcm, ctx->pcm_bytes, off) == 0) return 0;

    *off = 0;
    return decode_again(ctx, reached, keep);
}

int32_t start_at(TAVO_CTX *ctx, int64_t pos, bool keep) {
    int64_t off = 0;
    int32_t err = 0;
    if (pos < kFirstSeekMs) {
        ctx->hl->hl_pos = 0;
    } else {
        err = settle_start(ctx, pos, keep, &off);
    }
    return err == 0 ? convert_song(ctx, off) : err;
}

}  // namespace

int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off) {
    return find_landing(seg->src, seg->fmt.sample_rate, pcm, planned_bytes(seg), off);
}

int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos) {
    return start_at(ctx, pos, true);
}

int32_t start_song_at(TAVO_CTX *ctx, int64_t pos) {
    return start_at(ctx, pos, false);
}
