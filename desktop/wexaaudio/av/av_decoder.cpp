// The code that calls libavcodec, built as libwexaaudio_av.so. See shared/codec_library.h.
#include <pthread.h>

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>

#include "desktop/wexaaudio/av/pcm16.h"
#include "desktop/wexaaudio/shared/codec_library.h"

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavcodec/vorbis_parser.h>
#include <libavutil/mem.h>
}

struct av_decoder {
    AVCodecContext *ctx;
    AVPacket *packet;
    AVFrame *frame;  // output of the last packet
    AVFrame *spare;  // receives any further frames of a packet
};

namespace {

constexpr size_t kMaxBlock = size_t{128} << 20;  // largest single allocation by libavutil, bytes

pthread_once_t prepare_once = PTHREAD_ONCE_INIT;

// Turns off libavcodec's messages and limits its allocations, for the whole process.
void prepare() {
    av_log_set_level(AV_LOG_QUIET);
    av_max_alloc(kMaxBlock);
}

bool set_extra(AVCodecContext *ctx, const uint8_t *setup, int32_t bytes) {
    if (setup == nullptr) return true;
    if (bytes <= 0 || bytes > kMaxPacket) return false;
    const auto size = static_cast<size_t>(bytes);
    ctx->extradata = static_cast<uint8_t *>(av_mallocz(size + AV_INPUT_BUFFER_PADDING_SIZE));
    if (ctx->extradata == nullptr) return false;
    memcpy(ctx->extradata, setup, size);
    ctx->extradata_size = bytes;
    return true;
}

void close_decoder(av_decoder *d) {
    if (d == nullptr) return;
    avcodec_free_context(&d->ctx);
    av_packet_free(&d->packet);
    av_frame_free(&d->frame);
    av_frame_free(&d->spare);
    free(d);
}

bool set_up(av_decoder *d, const char *name, const uint8_t *setup, int32_t setup_bytes) {
    const AVCodec *codec = avcodec_find_decoder_by_name(name);
    d->ctx = codec != nullptr ? avcodec_alloc_context3(codec) : nullptr;
    d->packet = av_packet_alloc();
    d->frame = av_frame_alloc();
    d->spare = av_frame_alloc();
    if (d->ctx == nullptr || d->packet == nullptr || d->frame == nullptr || d->spare == nullptr) {
        return false;
    }
    d->ctx->thread_count = 1;  // the sources already use several threads
    d->ctx->flags |= AV_CODEC_FLAG_BITEXACT;
    return set_extra(d->ctx, setup, setup_bytes) && avcodec_open2(d->ctx, codec, nullptr) == 0;
}

av_decoder *open_decoder(const char *name, const uint8_t *setup, int32_t setup_bytes) {
    pthread_once(&prepare_once, prepare);
    auto *d = static_cast<av_decoder *>(calloc(1, sizeof(av_decoder)));
    if (d == nullptr || set_up(d, name, setup, setup_bytes)) return d;
    close_decoder(d);
    return nullptr;
}

// Returns the packet's data. Reuses the packet's buffer unless libavcodec still refers to it.
uint8_t *make_packet(av_decoder *d, int32_t bytes) {
    AVPacket *packet = d->packet;
    const size_t needed = static_cast<size_t>(bytes) + AV_INPUT_BUFFER_PADDING_SIZE;
    if (packet->buf == nullptr || packet->buf->size < needed ||
        av_buffer_is_writable(packet->buf) == 0) {
        av_packet_unref(packet);
        return av_new_packet(packet, bytes) == 0 ? packet->data : nullptr;
    }
    packet->size = bytes;
    memset(packet->data + bytes, 0, AV_INPUT_BUFFER_PADDING_SIZE);
    return packet->data;
}

// True if the frame contains planar floats, the output format of all decoders used here.
bool is_audio(const AVFrame *frame) {
    return frame->nb_samples >= 0 && frame->ch_layout.nb_channels >= 1 &&
           frame->format == AV_SAMPLE_FMT_FLTP;
}

int32_t decode(av_decoder *d) {
    av_frame_unref(d->frame);
    int result = avcodec_send_packet(d->ctx, d->packet);
    if (result == 0) result = avcodec_receive_frame(d->ctx, d->frame);
    if (result == AVERROR(EAGAIN)) return 0;
    // A damaged packet may yield several frames. Keep only the first so that the others do not
    // appear in the next packet's output.
    while (result == 0 && avcodec_receive_frame(d->ctx, d->spare) == 0) av_frame_unref(d->spare);
    if (result == 0 && is_audio(d->frame)) return d->frame->nb_samples;
    av_frame_unref(d->frame);
    return result == AVERROR(ENOMEM) ? kCodecNoMemory : -1;
}

void get_format(const av_decoder *d, int32_t *rate, int32_t *channels) {
    *rate = d->frame->sample_rate;
    *channels = d->frame->ch_layout.nb_channels;
}

int32_t write_pcm(const av_decoder *d, int32_t channels, int32_t skip, int32_t count,
                  int16_t *pcm) {
    const AVFrame *frame = d->frame;
    const int32_t n = std::min(frame->nb_samples - skip, count);
    if (skip < 0 || n <= 0) return 0;
    const int32_t plane_count = frame->ch_layout.nb_channels;
    const uint8_t *const *plane = frame->extended_data;
    if (channels == 1) {
        pcm16_mean(plane, plane_count, skip, pcm, n);
    } else {
        pcm16_pair(reinterpret_cast<const float *>(plane[0]) + skip,
                   reinterpret_cast<const float *>(plane[plane_count > 1 ? 1 : 0]) + skip, pcm, n);
    }
    return n;
}

vorbis_parser *open_parser(const uint8_t *setup, int32_t setup_bytes) {
    pthread_once(&prepare_once, prepare);
    return reinterpret_cast<vorbis_parser *>(av_vorbis_parse_init(setup, setup_bytes));
}

void close_parser(vorbis_parser *parser) {
    auto *context = reinterpret_cast<AVVorbisParseContext *>(parser);
    av_vorbis_parse_free(&context);
}

int32_t parse_samples(vorbis_parser *parser, uint8_t first) {
    return av_vorbis_parse_frame(reinterpret_cast<AVVorbisParseContext *>(parser), &first, 1);
}

}  // namespace

const codec_library wexaaudio_av = {
    open_decoder, close_decoder, make_packet,  decode,        get_format,
    write_pcm,    open_parser,   close_parser, parse_samples,
};
