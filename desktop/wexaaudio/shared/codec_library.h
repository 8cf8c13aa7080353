// libavcodec as a table of functions. libavcodec loads a hundred shared objects, so the code that
// calls it is a private shared object beside libwexaaudio.so, libwexaaudio_av.so. It is loaded when
// a file first needs it: AAC, MPEG audio, MP4 or Ogg.
#ifndef WEXAAUDIO_CODEC_LIBRARY_H
#define WEXAAUDIO_CODEC_LIBRARY_H

#include <cstdint>

struct av_decoder;     // one decoder, used by one thread at a time
struct vorbis_parser;  // computes the length of Vorbis packets

constexpr int32_t kCodecNoMemory = -2;
constexpr int32_t kMaxPacket = 1 << 24;  // bytes, also the limit for set-up data
constexpr uint8_t kVorbisSetupMark = 2;  // first byte of Vorbis set-up data: its packets minus one

struct codec_library {
    // Opens a decoder by libavcodec's name, with set-up data (copied; may be null). Null on
    // failure.
    av_decoder *(*open)(const char *name, const uint8_t *setup, int32_t setup_bytes);
    void (*close)(av_decoder *decoder);  // null is allowed

    // Returns a buffer for the next packet of `bytes` bytes (1 to kMaxPacket), to be filled before
    // decode. Null if memory runs out.
    uint8_t *(*packet)(av_decoder *decoder, int32_t bytes);

    // Decodes the packet. Returns the sample frames of the output (0: no output); -1 if it cannot
    // be decoded; kCodecNoMemory.
    int32_t (*decode)(av_decoder *decoder);

    // Stores the rate in Hz and the channels of the output; 0 without output.
    void (*format)(const av_decoder *decoder, int32_t *rate, int32_t *channels);

    // Writes up to `count` sample frames of the output, starting at sample frame `skip`, as
    // interleaved 16-bit PCM: rounded to nearest, clipped, without dither. channels 2: front left
    // and right, or a single channel twice. channels 1: the mean of all channels, rounded toward
    // zero. Returns the sample frames written.
    int32_t (*pcm)(const av_decoder *decoder, int32_t channels, int32_t skip, int32_t count,
                   int16_t *pcm);

    // setup: the three header packets in Xiph's packing. Null on failure.
    vorbis_parser *(*parser_open)(const uint8_t *setup, int32_t setup_bytes);
    void (*parser_close)(vorbis_parser *parser);  // null is allowed
    // The next packet's sample frames, found from its first byte; 0 or less if it has no audio.
    int32_t (*parser_samples)(vorbis_parser *parser, uint8_t first);
};

// Name of the table in libwexaaudio_av.so.
extern "C" const codec_library wexaaudio_av;

// Returns the table, which the first call loads. May be called on any thread. Null if it cannot be
// loaded; the log then names what is missing.
const codec_library *codec_library_get(void);

#endif
