// FLAC frames in bundles to 16-bit PCM, check sums verified.
//
// A frame that cannot be decoded becomes silence of its length, so that positions stay true.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/flac/flac_header.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kSampleBytes = 2;
constexpr int32_t kMaxChannels = 2;
constexpr int32_t kMaxPcm = kFlacMaxBlock * kMaxChannels * kSampleBytes;  // bytes the source has

struct flac_decoder {
    av_decoder av;
    uint8_t info[kFlacInfoBytes];  // the stream information that av was opened with
    int32_t channels;              // of the output, 1 or 2
};

bool open_with(flac_decoder *d, const void *info) {
    if (d->av.ctx != nullptr && (info == nullptr || memcmp(d->info, info, sizeof d->info) == 0)) {
        return true;
    }
    const av_setup setup = {info, info != nullptr ? kFlacInfoBytes : 0, 0, 0, true};
    if (info != nullptr) {
        memcpy(d->info, info, sizeof d->info);
    }
    return av_decoder_open(&d->av, "flac", &setup);
}

int32_t take_pcm(const flac_decoder *d, int32_t skip, void *pcm, int32_t capacity) {
    const av_channels policy = d->channels == 1 ? kAvMean : kAvFront;
    return av_decoder_pcm(&d->av, policy, 0, skip, -1, pcm, capacity);
}

// PCM that the reader made: pairs, kept or averaged.
int32_t copy_pcm(const flac_decoder *d, const uint8_t *pairs, int32_t samples, void *pcm) {
    if (d->channels == kMaxChannels) {
        memcpy(pcm, pairs, static_cast<size_t>(samples) * kMaxChannels * kSampleBytes);
        return samples * kMaxChannels * kSampleBytes;
    }
    int16_t *out = static_cast<int16_t *>(pcm);
    for (int32_t i = 0; i < samples; ++i) {
        int16_t pair[2];
        memcpy(pair, pairs + static_cast<ptrdiff_t>(i) * 4, sizeof pair);
        out[i] = static_cast<int16_t>((pair[0] + pair[1]) / 2);
    }
    return samples * kSampleBytes;
}

// Writes exactly the length that the bundle asks for. Returns the bytes, -1 when out of memory.
int32_t decode_bundle(flac_decoder *d, bundle_view *v, void *pcm) {
    const int32_t frame = d->channels * kSampleBytes;
    const int32_t wanted = std::clamp(v->head.samples, 0, kMaxPcm / frame) * frame;
    int32_t bytes = 0;
    const uint8_t *data = bundle_next(v, &bytes);
    int32_t written = 0;
    if ((v->head.flags & kBundlePcm) != 0) {
        const int32_t samples = bytes / (kMaxChannels * kSampleBytes);
        written = data != nullptr ? copy_pcm(d, data, std::min(samples, wanted / frame), pcm) : 0;
    } else if (data != nullptr && (v->head.flags & kBundleLost) == 0) {
        const uint8_t *info = v->head.setup == kFlacInfoBytes ? v->setup : nullptr;
        if (!open_with(d, info)) {
            return -1;
        }
        const int32_t held = av_decoder_decode(&d->av, data, bytes);
        if (held == kAvNoMemory) {
            return -1;
        }
        written = held > 0 ? std::max(take_pcm(d, v->head.skip, pcm, wanted), 0) : 0;
    }
    memset(static_cast<uint8_t *>(pcm) + written, 0, static_cast<size_t>(wanted - written));
    return wanted;
}

int32_t decode_bare(flac_decoder *d, const wexa_frame *frame, void *pcm) {
    if (!open_with(d, nullptr) || av_decoder_decode(&d->av, frame->data, frame->bytes) < 0) {
        return -1;
    }
    return take_pcm(d, 0, pcm, kMaxPcm);
}

}  // namespace

void *xflacd_create(const wexa_config *config, void * /*reserved*/) {
    if (config == nullptr || config->bytes_per_sample != kSampleBytes ||
        config->output_channels < 0 || config->output_channels > kMaxChannels) {
        return nullptr;
    }
    flac_decoder *d = static_cast<flac_decoder *>(calloc(1, sizeof(flac_decoder)));
    if (d == nullptr || !open_with(d, nullptr)) {
        free(d);
        return nullptr;
    }
    d->channels = config->output_channels == 1 ? 1 : kMaxChannels;
    return d;
}

int32_t xflacd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status) {
    flac_decoder *d = static_cast<flac_decoder *>(decoder);
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

void xflacd_reset(void *decoder) {
    if (decoder != nullptr) {
        av_decoder_flush(&static_cast<flac_decoder *>(decoder)->av);
    }
}

void xflacd_delete(void *decoder) {
    flac_decoder *d = static_cast<flac_decoder *>(decoder);
    if (d != nullptr) {
        av_decoder_close(&d->av);
        free(d);
    }
}
