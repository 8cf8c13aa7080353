// A table of the functions that call libavcodec. libavcodec loads a hundred shared objects, so
// these functions are in a shared object of their own, libwexaaudio_av.so, next to libwexaaudio.so.
// It is loaded when an AAC, MPEG audio, MP4 or Ogg file is first opened.
#pragma once

#include <cstdint>

struct av_decoder;     // one decoder, used by one thread at a time
struct vorbis_parser;  // computes the length of Vorbis packets

constexpr int32_t kCodecNoMemory = -2;
constexpr int32_t kMaxPacket = 1 << 24;  // bytes, also the limit for set-up data
constexpr uint8_t kVorbisSetupMark = 2;  // first byte of Vorbis set-up data: packet count minus one

struct codec_library {
    // Opens the decoder that libavcodec calls `name`. Copies the set-up data, which may be null.
    // Returns null on failure.
    av_decoder *(*open)(const char *name, const uint8_t *setup, int32_t setup_bytes);
    void (*close)(av_decoder *decoder);  // null is allowed

    // Returns a buffer for the next packet of `bytes` bytes (1 to kMaxPacket), or null if memory
    // runs out. The caller fills it before calling decode.
    uint8_t *(*packet)(av_decoder *decoder, int32_t bytes);

    // Decodes the packet. Returns the number of sample frames in the output, which may be 0.
    // Returns -1 if the packet cannot be decoded, or kCodecNoMemory.
    int32_t (*decode)(av_decoder *decoder);

    // Stores the sample rate in Hz and the channel count of the output; both are 0 without output.
    void (*format)(const av_decoder *decoder, int32_t *rate, int32_t *channels);

    // Writes up to `count` sample frames of the output from sample frame `skip` on as interleaved
    // 16-bit PCM, rounded to nearest and clipped, without dither. If `channels` is 2, writes front
    // left and right, or a single channel twice. If it is 1, writes the mean of all, rounded toward
    // zero. Returns the number of sample frames written.
    int32_t (*pcm)(const av_decoder *decoder, int32_t channels, int32_t skip, int32_t count,
                   int16_t *pcm);

    // `setup` holds the three header packets, packed with Xiph lacing. Returns null on failure.
    vorbis_parser *(*parser_open)(const uint8_t *setup, int32_t setup_bytes);
    void (*parser_close)(vorbis_parser *parser);  // null is allowed
    // Returns the number of sample frames of a packet that starts with `first`; <= 0 if not audio.
    int32_t (*parser_samples)(vorbis_parser *parser, uint8_t first);
};

// The table, which libwexaaudio_av.so exports under this name.
extern "C" const codec_library wexaaudio_av;

// Returns the table; the first call loads it. Returns null if it cannot be loaded, and logs the
// reason. May be called on any thread.
const codec_library *codec_library_get(void);
