#include "desktop/wexaaudio/shared/av_decoder.h"

#include <pthread.h>

#include <algorithm>
#include <climits>
#include <cstring>

#include "desktop/wexaaudio/shared/pcm16.h"

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavutil/mem.h>
}

namespace {

constexpr int32_t kMaxExtraBytes = 1 << 24;
constexpr int32_t kMaxPacketBytes = 1 << 24;
constexpr int32_t kMixBlock = 1024;  // sample frames converted at a time for the mean

// libavutil's largest block. A table of all frames of a day of song is smaller, and a damaged count
// asks for gigabytes.
constexpr size_t kMaxBlockBytes = size_t{128} << 20;

pthread_once_t prepare_once = PTHREAD_ONCE_INIT;

void prepare(void) {
    av_log_set_level(AV_LOG_QUIET);
    av_max_alloc(kMaxBlockBytes);
}

bool set_extra(AVCodecContext *ctx, const av_setup *setup) {
    if (setup->extra == nullptr || setup->extra_bytes <= 0) {
        return true;
    }
    if (setup->extra_bytes > kMaxExtraBytes) {
        return false;
    }
    const size_t bytes = static_cast<size_t>(setup->extra_bytes);
    ctx->extradata = static_cast<uint8_t *>(av_mallocz(bytes + AV_INPUT_BUFFER_PADDING_SIZE));
    if (ctx->extradata == nullptr) {
        return false;
    }
    memcpy(ctx->extradata, setup->extra, bytes);
    ctx->extradata_size = setup->extra_bytes;
    return true;
}

// Where the samples of one channel lie: in a plane of its own, or interleaved.
struct channel_source {
    const uint8_t *first;
    ptrdiff_t step;  // samples
};

channel_source source_of(const AVFrame *frame, int32_t channel, int32_t skip) {
    const AVSampleFormat format = static_cast<AVSampleFormat>(frame->format);
    const ptrdiff_t width = av_get_bytes_per_sample(format);
    const int32_t channels = frame->ch_layout.nb_channels;
    if (av_sample_fmt_is_planar(format) != 0) {
        return {frame->extended_data[channel] + skip * width, 1};
    }
    return {frame->extended_data[0] + (static_cast<ptrdiff_t>(skip) * channels + channel) * width,
            channels};
}

// One channel of the frame into every out_step-th sample of out. False for other sample formats.
bool convert(const AVFrame *frame, int32_t channel, int32_t skip, int32_t count, int16_t *out,
             ptrdiff_t out_step) {
    const channel_source in = source_of(frame, channel, skip);
    switch (frame->format) {
        case AV_SAMPLE_FMT_FLT:
        case AV_SAMPLE_FMT_FLTP:
            pcm16_from_float(reinterpret_cast<const float *>(in.first), in.step, out, out_step,
                             count);
            return true;
        case AV_SAMPLE_FMT_S32:
        case AV_SAMPLE_FMT_S32P:
            pcm16_from_s32(reinterpret_cast<const int32_t *>(in.first), in.step, out, out_step,
                           count);
            return true;
        case AV_SAMPLE_FMT_S16:
        case AV_SAMPLE_FMT_S16P:
            pcm16_from_s16(reinterpret_cast<const int16_t *>(in.first), in.step, out, out_step,
                           count);
            return true;
        default:
            return false;
    }
}

bool convert_channels(const AVFrame *frame, int32_t skip, int32_t count, int32_t channels,
                      int16_t *out) {
    const int32_t last = frame->ch_layout.nb_channels - 1;
    if (frame->format == AV_SAMPLE_FMT_FLTP && channels == 2 && last >= 1) {
        pcm16_pair_from_float(reinterpret_cast<const float *>(frame->extended_data[0]) + skip,
                              reinterpret_cast<const float *>(frame->extended_data[1]) + skip, out,
                              count);
        return true;
    }
    for (int32_t c = 0; c < channels; ++c) {
        if (!convert(frame, std::min(c, last), skip, count, out + c, channels)) {
            return false;
        }
    }
    return true;
}

bool convert_mean(const AVFrame *frame, int32_t skip, int32_t count, int16_t *out) {
    const int32_t channels = frame->ch_layout.nb_channels;
    if (frame->format == AV_SAMPLE_FMT_FLTP && channels == 2) {
        pcm16_mean_from_float(reinterpret_cast<const float *>(frame->extended_data[0]) + skip,
                              reinterpret_cast<const float *>(frame->extended_data[1]) + skip, out,
                              count);
        return true;
    }
    int16_t one[kMixBlock];
    int32_t sum[kMixBlock];
    for (int32_t done = 0; done < count; done += kMixBlock) {
        const int32_t n = std::min(kMixBlock, count - done);
        memset(sum, 0, sizeof sum);
        for (int32_t c = 0; c < channels; ++c) {
            if (!convert(frame, c, skip + done, n, one, 1)) {
                return false;
            }
            for (int32_t i = 0; i < n; ++i) {
                sum[i] += one[i];
            }
        }
        for (int32_t i = 0; i < n; ++i) {
            out[done + i] = static_cast<int16_t>(sum[i] / channels);
        }
    }
    return true;
}

}  // namespace

void av_prepare(void) {
    pthread_once(&prepare_once, prepare);
}

bool av_decoder_open(av_decoder *d, const char *name, const av_setup *setup) {
    av_prepare();
    av_decoder_close(d);
    const AVCodec *codec = avcodec_find_decoder_by_name(name);
    d->ctx = codec != nullptr ? avcodec_alloc_context3(codec) : nullptr;
    d->packet = av_packet_alloc();
    d->frame = av_frame_alloc();
    d->spare = av_frame_alloc();
    bool ok =
        d->ctx != nullptr && d->packet != nullptr && d->frame != nullptr && d->spare != nullptr;
    if (ok) {
        d->ctx->thread_count = 1;  // sources already run on threads of their own
        d->ctx->flags |= AV_CODEC_FLAG_BITEXACT;
        if (setup != nullptr) {
            d->ctx->sample_rate = setup->sample_rate;
            d->ctx->err_recognition |= setup->check_sums ? AV_EF_CRCCHECK | AV_EF_EXPLODE : 0;
            if (setup->channels > 0) {
                av_channel_layout_default(&d->ctx->ch_layout, setup->channels);
            }
            ok = set_extra(d->ctx, setup);
        }
        ok = ok && avcodec_open2(d->ctx, codec, nullptr) == 0;
    }
    if (!ok) {
        av_decoder_close(d);
    }
    return ok;
}

void av_decoder_close(av_decoder *d) {
    avcodec_free_context(&d->ctx);
    av_packet_free(&d->packet);
    av_frame_free(&d->frame);
    av_frame_free(&d->spare);
}

void av_decoder_flush(av_decoder *d) {
    if (d->ctx != nullptr) {
        avcodec_flush_buffers(d->ctx);
        av_frame_unref(d->frame);
    }
}

int32_t av_decoder_decode(av_decoder *d, const void *data, int32_t bytes) {
    if (d->ctx == nullptr || bytes <= 0 || bytes > kMaxPacketBytes) {
        return -1;
    }
    av_frame_unref(d->frame);
    if (av_new_packet(d->packet, bytes) != 0) {
        return kAvNoMemory;
    }
    memcpy(d->packet->data, data, static_cast<size_t>(bytes));
    const int sent = avcodec_send_packet(d->ctx, d->packet);
    av_packet_unref(d->packet);
    if (sent < 0) {
        return sent == AVERROR(ENOMEM) ? kAvNoMemory : -1;
    }
    const int received = avcodec_receive_frame(d->ctx, d->frame);
    if (received == AVERROR(EAGAIN)) {
        return 0;
    }
    // A damaged packet may hold more than its frame: what is left must not come out with the next.
    while (received == 0 && avcodec_receive_frame(d->ctx, d->spare) == 0) {
        av_frame_unref(d->spare);
    }
    if (received < 0 || d->frame->nb_samples < 0 || d->frame->ch_layout.nb_channels < 1) {
        av_frame_unref(d->frame);
        return received == AVERROR(ENOMEM) ? kAvNoMemory : -1;
    }
    return d->frame->nb_samples;
}

int32_t av_decoder_rate(const av_decoder *d) {
    return d->frame != nullptr && d->frame->nb_samples > 0 ? d->frame->sample_rate : 0;
}

int32_t av_decoder_channels(const av_decoder *d) {
    return d->frame != nullptr && d->frame->nb_samples > 0 ? d->frame->ch_layout.nb_channels : 0;
}

int32_t av_decoder_pcm(const av_decoder *d, av_channels policy, int32_t own, int32_t skip,
                       int32_t count, void *pcm, int32_t capacity) {
    const AVFrame *frame = d->frame;
    if (frame == nullptr || skip < 0 || skip >= frame->nb_samples) {
        return 0;
    }
    const int32_t channels = policy == kAvMean ? 1 : policy == kAvFront ? 2 : std::max(own, 1);
    const int32_t frame_bytes = channels * static_cast<int32_t>(sizeof(int16_t));
    int32_t n = std::min(frame->nb_samples - skip, capacity / frame_bytes);
    n = count >= 0 ? std::min(n, count) : n;
    int16_t *out = static_cast<int16_t *>(pcm);
    const bool ok = policy == kAvMean ? convert_mean(frame, skip, n, out)
                                      : convert_channels(frame, skip, n, channels, out);
    return ok ? n * frame_bytes : -1;
}
