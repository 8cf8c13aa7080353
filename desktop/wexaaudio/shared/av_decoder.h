// A thin layer over libavcodec: one packet in, 16-bit interleaved PCM out. No output is written by
// decoding itself, so that packets decoded for their effect on the state cost no conversion.
//
// Samples become 16-bit by rounding to nearest and clipping, without dither.
#ifndef WEXAAUDIO_AV_DECODER_H
#define WEXAAUDIO_AV_DECODER_H

#include <cstddef>
#include <cstdint>

struct AVCodecContext;
struct AVFrame;
struct AVPacket;

struct av_decoder {
    AVCodecContext *ctx;  // owned; null while closed
    AVPacket *packet;     // owned
    AVFrame *frame;       // owned; what the last packet decoded to
    AVFrame *spare;       // owned; takes what a packet gives beyond its first frame
};

struct av_setup {
    const void *extra;    // codec set-up data, copied; may be null
    int32_t extra_bytes;  //
    int32_t sample_rate;  // Hz, 0 unknown
    int32_t channels;     // 0 unknown
    bool check_sums;      // a frame whose check sum is wrong fails, where the codec has one
};

// How the stream's channels become the output's.
enum av_channels {
    kAvOwn,    // as many as the caller says: extra ones dropped, missing ones repeat the last
    kAvFront,  // two: front left and right; mono is duplicated
    kAvMean,   // one: the mean of all channels after conversion to 16 bits, rounded toward zero
};

// Opens the decoder of that libavcodec name ("mp3float", "flac", "aac", "vorbis"). setup may be
// null. False on failure, with *d closed. *d must be zeroed, closed or open (it is closed first).
bool av_decoder_open(av_decoder *d, const char *name, const av_setup *setup);

void av_decoder_close(av_decoder *d);

// Drops the decoder's state; a fresh decoder's output follows.
void av_decoder_flush(av_decoder *d);

constexpr int32_t kAvNoMemory = -2;

// Decodes one packet. Returns the sample frames now held (0: nothing came), -1 when it cannot be
// decoded, kAvNoMemory.
int32_t av_decoder_decode(av_decoder *d, const void *data, int32_t bytes);

int32_t av_decoder_rate(const av_decoder *d);      // Hz of what is held, 0 when nothing is
int32_t av_decoder_channels(const av_decoder *d);  // likewise

// Writes what is held from sample frame skip on, at most count sample frames (negative: all), into
// pcm, never more than capacity bytes. own is the channel count for kAvOwn. Returns the bytes
// written, whole sample frames; 0 when nothing is held, -1 for a sample format not handled.
int32_t av_decoder_pcm(const av_decoder *d, av_channels policy, int32_t own, int32_t skip,
                       int32_t count, void *pcm, int32_t capacity);

// libavcodec and libavformat say nothing on standard error and ask for no huge blocks, in the whole
// process; called by every xxx_init and create.
void av_prepare(void);

#endif
