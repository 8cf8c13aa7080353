#include "common/tavo_ctx.h"
#include "media_source/codec_source.h"
#include "media_source/pcm_queue.h"

namespace {

constexpr int32_t kChunkBytes = 16'384;

int32_t fill_step(mtsrc_ctx *src, uint8_t *chunk, void * /*work*/) {
    int32_t bytes = 0;
    int64_t first = 0;
    int64_t second = 0;
    const int32_t result =
        xwavd_get_frm(src->demux, chunk, src->frm_buf_size, &bytes, &first, &second);
    if (result != 0) {
        return result == 1 ? 1 : -6;
    }
    if (bytes < 0 || bytes > src->frm_buf_size) {
        return -6;
    }
    pcm_queue_push(src, pcm_first_channel(src->q_wr, chunk, bytes, src->format.channels));
    return 0;
}

}  // namespace

int32_t mtsource_wav_open(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    if (!src->probe_file) {
        return -7;
    }
    src->decoder = nullptr;
    src->demux = nullptr;
    xwav_info info = {};
    int32_t word = 0;
    void *reader = xwavd_create(&src->io, &info, &word);
    // Before the reader is looked at: none and an empty record is a matter of format, not of
    // access.
    if (info.codec != kWexaPcm || info.bits != kBitsPerSample) {
        if (reader) {
            xwavd_delete(reader);
        }
        return -3;
    }
    if (!reader) {
        return -7;
    }
    src->demux = reader;
    src->frm_buf_size = kChunkBytes;
    src->codec = kMtsrcTypeWav;
    src->format = {info.sample_rate, info.channels, kBitsPerSample, info.duration};
    if (info.sample_rate > kMaxRate || info.channels <= 0) {
        xwavd_delete(reader);
        src->demux = nullptr;
        return -3;
    }
    return 0;
}

void mtsource_wav_close(mtsrc_ctx *src) {
    if (src && src->demux) {
        xwavd_delete(src->demux);
        src->demux = nullptr;
    }
}

int32_t mtsource_wav_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    if (!src) {
        return -4;
    }
    return pcm_queue_get(src, want, frame, {fill_step, nullptr});
}

int32_t mtsource_wav_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    if (!src) {
        return -4;
    }
    pcm_queue_clear(src);
    int64_t seconds = position / kUnitsPerSecond;
    return xwavd_seek(src->demux, &seconds, reached, 0) == 0 ? 0 : -4;
}

int32_t mtsource_wav_reset(mtsrc_ctx *src) {
    if (!src) {
        return -4;
    }
    pcm_queue_clear(src);
    return 0;
}
