// MPEG audio frames, Layers I to III, bare or in bundles, to 16-bit PCM.
//
// A frame that cannot be decoded inside a bundle becomes silence of its length, so that positions
// stay true; a bare one is reported.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kMaxPcm = 19200;  // bytes the source makes room for
constexpr int32_t kMaxChannels = 2;
constexpr int32_t kSampleBytes = 2;

struct mpeg_decoder {
    av_decoder av;
    int32_t channels;  // of the output; 0: the stream's own
};

// A new context instead of a flushed one: behind damaged frames or missing bits the decoder falls
// back on what a flush leaves in it.
bool renew(mpeg_decoder *d) {
    return av_decoder_open(&d->av, "mp3float", nullptr);
}

// Decodes the bundle and writes exactly the length that it asks for. Returns the bytes, -1 when out
// of memory.
int32_t decode_bundle(mpeg_decoder *d, bundle_view *v, void *pcm) {
    if (((v->head.flags & kBundleFresh) != 0 || d->av.ctx == nullptr) && !renew(d)) {
        return -1;
    }
    int32_t held = 0;
    while (v->left > 0) {
        int32_t bytes = 0;
        const uint8_t *frame = bundle_next(v, &bytes);
        held = av_decoder_decode(&d->av, frame, bytes);
        if (held == kAvNoMemory) {
            return -1;
        }
    }
    const int32_t wanted_channels = d->channels != 0 ? d->channels : v->head.channels;
    const int32_t channels = std::clamp(wanted_channels, 1, kMaxChannels);
    const int32_t wanted = std::clamp(v->head.samples, 0, kMaxPcm / (channels * kSampleBytes)) *
                           channels * kSampleBytes;
    int32_t written = 0;
    if (held > 0 && (v->head.flags & kBundleLost) == 0) {
        written = av_decoder_pcm(&d->av, kAvOwn, channels, v->head.skip, -1, pcm, wanted);
    }
    written = std::max(written, 0);
    memset(static_cast<uint8_t *>(pcm) + written, 0, static_cast<size_t>(wanted - written));
    return wanted;
}

int32_t decode_bare(mpeg_decoder *d, const wexa_frame *frame, void *pcm) {
    if (d->av.ctx == nullptr && !renew(d)) {
        return -1;
    }
    if (av_decoder_decode(&d->av, frame->data, frame->bytes) < 0) {
        return -1;
    }
    const int32_t own = d->channels != 0 ? d->channels : av_decoder_channels(&d->av);
    return av_decoder_pcm(&d->av, kAvOwn, std::min(own, kMaxChannels), 0, -1, pcm, kMaxPcm);
}

}  // namespace

void *xmp123d_create(const wexa_config *config, void * /*reserved*/) {
    if (config == nullptr || config->bytes_per_sample != kSampleBytes ||
        config->output_channels < 0 || config->output_channels > kMaxChannels) {
        return nullptr;
    }
    mpeg_decoder *d = static_cast<mpeg_decoder *>(calloc(1, sizeof(mpeg_decoder)));
    if (d == nullptr || !renew(d)) {
        free(d);
        return nullptr;
    }
    d->channels = config->output_channels;
    return d;
}

int32_t xmp123d_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                       wexa_status *status) {
    mpeg_decoder *d = static_cast<mpeg_decoder *>(decoder);
    if (d == nullptr || frame == nullptr || frame->data == nullptr || output == nullptr ||
        output->data == nullptr || status == nullptr) {
        return -1;
    }
    output->bytes = 0;
    status->produced = 0;
    bundle_view view = {};
    const int32_t written = bundle_open(&view, frame->data, frame->bytes)
                                ? decode_bundle(d, &view, output->data)
                                : decode_bare(d, frame, output->data);
    if (written < 0) {
        return -1;
    }
    output->bytes = written;
    status->produced = written > 0 ? 1 : 0;
    return 0;
}

void xmp123d_reset(void *decoder) {
    if (decoder != nullptr) {
        av_decoder_flush(&static_cast<mpeg_decoder *>(decoder)->av);
    }
}

void xmp123d_delete(void *decoder) {
    mpeg_decoder *d = static_cast<mpeg_decoder *>(decoder);
    if (d != nullptr) {
        av_decoder_close(&d->av);
        free(d);
    }
}
