// Vorbis: bundles of packets to 16-bit PCM, one channel (or as configured): the mean of the
// stream's.
//
// A packet that does not decode comes out as silence of its own length, and so does the next one,
// which has nothing to overlap with: decoding fails only when the decoder was never set up, and for
// want of memory.
#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/ogg/vorbis_setup.h"
#include "desktop/wexaaudio/shared/av_decoder.h"
#include "desktop/wexaaudio/shared/bundle.h"
#include "media_source/wexaaudio.h"

namespace {

constexpr int32_t kMaxPcm = 16384;  // bytes the source makes room for
constexpr int32_t kSampleBytes = 2;
constexpr int32_t kMaxChannels = 255;

struct vorbis_decoder {
    av_decoder av;            // open once the set-up data has come
    int32_t output_channels;  // 0: the stream's own
};

int32_t set_up(vorbis_decoder *d, const wexa_frame *frame) {
    const uint8_t *data = static_cast<const uint8_t *>(frame->data);
    if (data == nullptr || frame->bytes < 1 || data[0] != kVorbisSetupMark) {
        return -1;
    }
    av_setup setup = {};
    setup.extra = data;
    setup.extra_bytes = frame->bytes;
    return av_decoder_open(&d->av, "vorbis", &setup) ? 0 : -1;
}

// Returns the sample frames that the last packet gave; kAvNoMemory.
int32_t decode_packets(vorbis_decoder *d, bundle_view *view) {
    if ((view->head.flags & kBundleFresh) != 0) {
        av_decoder_flush(&d->av);
    }
    int32_t samples = 0;
    int32_t bytes = 0;
    for (const uint8_t *packet = bundle_next(view, &bytes); packet != nullptr;
         packet = bundle_next(view, &bytes)) {
        samples = av_decoder_decode(&d->av, packet, bytes);
        if (samples == kAvNoMemory) {
            return samples;
        }
        if (samples < 0) {
            // What the decoder still holds is older than a seek to the next packet would find.
            av_decoder_flush(&d->av);
        }
    }
    return samples;
}

}  // namespace

int32_t xvorbis_init(void) {
    av_prepare();
    return 0;
}

void xvorbis_deinit(void) {}

void *xvorbisd_create(const wexa_config *config, void * /*reserved*/) {
    if (config == nullptr || config->bytes_per_sample != kSampleBytes) {
        return nullptr;
    }
    vorbis_decoder *d = static_cast<vorbis_decoder *>(calloc(1, sizeof(vorbis_decoder)));
    if (d != nullptr) {
        d->output_channels = config->output_channels;
    }
    return d;
}

int32_t xvorbisd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                        wexa_status *status) {
    vorbis_decoder *d = static_cast<vorbis_decoder *>(decoder);
    if (d == nullptr || frame == nullptr || output == nullptr || status == nullptr) {
        return -1;
    }
    output->bytes = 0;
    status->produced = 0;
    bundle_view view;
    if (!bundle_open(&view, frame->data, frame->bytes)) {
        return set_up(d, frame);
    }
    const int32_t channels = std::clamp(
        d->output_channels > 0 ? d->output_channels : view.head.channels, 1, kMaxChannels);
    const int32_t samples = view.head.samples;
    if (d->av.ctx == nullptr || output->data == nullptr || samples < 0 ||
        samples > kMaxPcm / (channels * kSampleBytes)) {
        return -1;
    }
    const int32_t wanted = samples * channels * kSampleBytes;
    const int32_t held = decode_packets(d, &view);
    if (held == kAvNoMemory) {
        return -1;
    }
    int32_t got = 0;
    if (held > 0) {
        const av_channels policy = d->output_channels == 1   ? kAvMean
                                   : d->output_channels == 2 ? kAvFront
                                                             : kAvOwn;
        got =
            av_decoder_pcm(&d->av, policy, channels, view.head.skip, samples, output->data, wanted);
        got = std::max(got, 0);
    }
    memset(static_cast<uint8_t *>(output->data) + got, 0, static_cast<size_t>(wanted - got));
    output->bytes = wanted;
    status->produced = wanted > 0 ? 1 : 0;
    return 0;
}

void xvorbisd_reset(void *decoder) {
    vorbis_decoder *d = static_cast<vorbis_decoder *>(decoder);
    if (d != nullptr) {
        av_decoder_flush(&d->av);
    }
}

void xvorbisd_delete(void *decoder) {
    vorbis_decoder *d = static_cast<vorbis_decoder *>(decoder);
    if (d != nullptr) {
        av_decoder_close(&d->av);
        free(d);
    }
}
