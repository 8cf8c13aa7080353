// Format source for RIFF WAVE files with 16-bit PCM, which need no decoder.
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
    if (result == kWexaEndOfStream) return kMtsrcEndOfStream;
    if (result != 0) return TAVO_ERR_READ;
    if (bytes < 0 || bytes > src->frm_buf_size) return TAVO_ERR_READ;
    pcm_queue_push(src, pcm_first_channel(src->q_wr, chunk, bytes, src->format.channels));
    return TAVO_OK;
}

}  // namespace

int32_t mtsource_wav_open(mtsrc_ctx *src) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    if (src->probe_file == nullptr) return TAVO_ERR_OPEN;
    src->decoder = nullptr;
    src->demux = nullptr;
    xwav_info info = {};
    int32_t word = 0;
    void *reader = xwavd_create(&src->io, &info, &word);
    // Check the record first: a null reader with an empty record means an unsupported format, not
    // an I/O error.
    if (info.codec != kWexaPcm || info.bits != kBitsPerSample) {
        if (reader != nullptr) xwavd_delete(reader);
        return TAVO_ERR_FORMAT;
    }
    if (reader == nullptr) return TAVO_ERR_OPEN;
    src->demux = reader;
    src->frm_buf_size = kChunkBytes;
    src->codec = kMtsrcTypeWav;
    src->format = {info.sample_rate, info.channels, kBitsPerSample, info.duration};
    if (info.sample_rate > kMaxRate || info.channels <= 0) {
        xwavd_delete(reader);
        src->demux = nullptr;
        return TAVO_ERR_FORMAT;
    }
    return TAVO_OK;
}

void mtsource_wav_close(mtsrc_ctx *src) {
    if (src != nullptr && src->demux != nullptr) {
        xwavd_delete(src->demux);
        src->demux = nullptr;
    }
}

int32_t mtsource_wav_get_frm(mtsrc_ctx *src, int32_t want, mtsrc_frame *frame) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    return pcm_queue_get(src, want, frame, {fill_step, nullptr});
}

int32_t mtsource_wav_seek(mtsrc_ctx *src, int64_t position, int64_t *reached) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    pcm_queue_clear(src);
    int64_t seconds = position / kUnitsPerSecond;
    return xwavd_seek(src->demux, &seconds, reached, 0) == 0 ? TAVO_OK : TAVO_ERR_HANDLE;
}

int32_t mtsource_wav_reset(mtsrc_ctx *src) {
    if (src == nullptr) return TAVO_ERR_HANDLE;
    pcm_queue_clear(src);
    return TAVO_OK;
}
