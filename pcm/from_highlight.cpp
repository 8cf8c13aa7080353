#include "pcm/from_highlight.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "common/alloc.h"
#include "pcm/block_search.h"
#include "pcm/read_pcm.h"
#include "pcm/resample.h"

namespace {

constexpr int64_t kFirstSeekMs = 1001;  // any earlier highlight counts as the start of the file
constexpr float kMsPerSecond = 1000.0f;

// The probe is PCM decoded from the seek position. The block to search for starts far enough into
// the probe for the decoder to have settled after the seek.
constexpr int64_t kProbeBytes = 8192;
constexpr int64_t kProbeBlockOffset = 4608;

// Seconds of PCM that are searched before and after the expected offset.
constexpr int64_t kSecondsBefore = 1;
constexpr int64_t kSecondsAfter = 3;

constexpr int64_t kUnknownBytes = INT64_MAX;  // the size of the PCM buffer is not known

// Returns the range of offsets at which to look for the probe's block in pcm_bytes bytes of PCM.
// `expected` is the expected byte offset of the seek position.
offset_range search_range(int64_t expected, int32_t rate, int64_t pcm_bytes) {
    const int64_t second = std::max<int64_t>(second_bytes(rate), 0);
    const int64_t before = second * kSecondsBefore;
    const int64_t after = second * kSecondsAfter;
    // An offset below kProbeBlockOffset would put the seek position before the start of the buffer.
    // None of these sums can overflow.
    const int64_t first =
        expected < before + kProbeBlockOffset ? kProbeBlockOffset : expected - before;
    const int64_t end = expected > pcm_bytes - after ? pcm_bytes : expected + after;
    return {first, std::min(end, pcm_bytes - kBlockBytes + 1)};
}

// Looks in `pcm` for the audio that the source delivers next. On entry, *off is the byte offset
// where that audio is expected. If it is found, sets *off to its offset and returns 0; otherwise
// returns -1.
int32_t find_next_audio(mtsrc_ctx *src, int32_t rate, const int16_t *pcm, int64_t pcm_bytes,
                        int64_t *off) {
    auto *probe = static_cast<uint8_t *>(malloc(kProbeBytes));
    if (probe == nullptr) {
        mark_incomplete();  // a second decoding may lead to different beats
        return -1;
    }

    int64_t found = kNotFound;
    int64_t bytes = 0;
    read_pcm(src, probe, kProbeBytes, &bytes);
    if (bytes >= kProbeBlockOffset + kBlockBytes) {
        found = find_lowest(reinterpret_cast<const uint8_t *>(pcm),
                            search_range(*off, rate, pcm_bytes), probe + kProbeBlockOffset);
    }
    free(probe);
    if (found == kNotFound) return -1;
    *off = found - kProbeBlockOffset;
    return 0;
}

// Returns the size in bytes of a PCM buffer that spans the time from the segment's start to the end
// of the stream.
int64_t planned_bytes(const TAVO_DECSEG *seg) {
    if (seg->duration == 0) return kUnknownBytes;
    int64_t units = 0;
    int64_t bytes = 0;
    if (__builtin_sub_overflow(seg->duration, seg->start, &units)) return 0;
    return span_bytes(units, seg->fmt.sample_rate, &bytes) ? bytes : 0;
}

// Discards the decoded PCM and decodes the stream again from `start` (100-ns units).
int32_t decode_again(TAVO_CTX *ctx, int64_t start, segment_pages pages) {
    for (int32_t i = 0; i < ctx->seg_count; ++i) {
        free(ctx->seg[i].buf);
        ctx->seg[i].buf = nullptr;
    }
    free(ctx->pcm);
    ctx->pcm = nullptr;

    const int32_t err = construct_decbuf(ctx, start);
    if (err != 0) return err;
    ctx->pcm_bytes = decode_segments(ctx, ctx->pcm, ctx->pcm_bytes, pages);
    return 0;
}

// Seeks to `pos` (milliseconds) and sets hl_pos to the position that was reached. If that position
// cannot be found in the decoded PCM, decodes the stream again from there. *off receives the number
// of bytes of `pcm` before the position.
int32_t seek_highlight(TAVO_CTX *ctx, int64_t pos, segment_pages pages, int64_t *off) {
    mtsrc_ctx *src = ctx->seg[0].src;
    const int32_t rate = ctx->fmt.sample_rate;
    int64_t reached = 0;
    if (__builtin_mul_overflow(pos, kUnitsPerMs, &reached)) reached = INT64_MAX;
    // A seek that fails without reporting a position counts as having reached its target.
    mtsrc_seekstream(src, reached, &reached);
    ctx->hl->hl_pos = static_cast<uint32_t>(reached / kUnitsPerMs);

    // Computed in single precision and in this order on purpose: the rounding is part of the
    // result.
    const float seconds = static_cast<float>(ctx->hl->hl_pos) / kMsPerSecond;
    *off = static_cast<int64_t>(seconds * 2.0f * static_cast<float>(rate));
    if (find_next_audio(src, rate, ctx->pcm, ctx->pcm_bytes, off) == 0) return 0;

    *off = 0;
    return decode_again(ctx, reached, pages);
}

// Skips `off` bytes of the PCM, converts the rest to the analysis signal and frees the PCM.
int32_t convert_rest(TAVO_CTX *ctx, int64_t off) {
    int16_t *pcm = ctx->pcm;
    const int64_t bytes = pcm == nullptr ? 0 : std::max<int64_t>(ctx->pcm_bytes - off, 0);
    ctx->pcm = nullptr;
    // Move the samples to the start of the buffer, because `off` may be odd.
    if (off > 0 && bytes > 0) {
        memmove(pcm, reinterpret_cast<const uint8_t *>(pcm) + off, static_cast<size_t>(bytes));
    }
    return convert_and_free(pcm, bytes, ctx->fmt.sample_rate, ctx->ana_rate, &ctx->ana_len,
                            &ctx->ana);
}

}  // namespace

int32_t _compare_decoded(TAVO_DECSEG *seg, const int16_t *pcm, int64_t *off) {
    return find_next_audio(seg->src, seg->fmt.sample_rate, pcm, planned_bytes(seg), off);
}

int32_t continue_from_highlight(TAVO_CTX *ctx, int64_t pos, segment_pages pages) {
    int64_t off = 0;
    int32_t err = 0;
    if (pos < kFirstSeekMs) {
        ctx->hl->hl_pos = 0;
    } else {
        err = seek_highlight(ctx, pos, pages, &off);
    }
    return err == 0 ? convert_rest(ctx, off) : err;
}

int32_t tavo_get_from_here(TAVO_CTX *ctx, int64_t pos) {
    return continue_from_highlight(ctx, pos, segment_pages::kept);
}
