// The interface of the codec library, libwexaaudio.so: the readers, demuxers and frame decoders
// that the format sources of stage 1 use. The library is a separate binary, so the layout of every
// record is asserted.
//
// Readers open the file through the callbacks of mtsrc_io. Numeric results are 0 on success,
// kWexaEndOfStream at the end of the stream, and any other value on failure. Times are in 100-ns
// units unless stated otherwise. Different sources use their objects concurrently on different
// threads.
//
// A "frame" is whatever the library's reader passes to its own decoder: compressed bytes, or PCM
// that the reader has already decoded and the decoder only copies. A source looks only at the byte
// count.
#pragma once

#include <cstddef>
#include <cstdint>

#include "media_source/mtsrc_io.h"

constexpr int32_t kWexaPcm = 300;      // codec code of linear PCM
constexpr int32_t kWexaKindAudio = 1;  // kind of an audio track or stream
constexpr int32_t kWexaTagAac = 0xFF;  // WAVE format tags of MP4 tracks
constexpr int32_t kWexaTagMpegLayer3 = 0x55;
constexpr int32_t kWexaEndOfStream = 1;  // result of a read past the last frame
// Sample pairs that the MPEG source drops at the start of a 44.1-kHz stereo stream. A reader's
// durations and positions do not include them.
constexpr int32_t kWexaMpegDelay = 529;

// The tags of a file. A library that reads no tags stores a null pointer instead. The library owns
// the record; its buffers come from malloc, and the source frees them without reading them.
struct wexa_tag_text {
    uint64_t reserved_0;
    void *data;
    uint64_t reserved_16;
};
struct wexa_tag_entry {
    void *first;
    void *second;
    uint8_t reserved_16[80];
};
struct wexa_tags {
    wexa_tag_text text[9];  // the pointers are at offsets 8, 32, ... 200
    uint8_t reserved_216[24];
    wexa_tag_entry entry[16];  // the pointers are at offsets 240 + 96 i and 248 + 96 i
    uint64_t reserved_1776;
    void *last;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(wexa_tags, text[8].data) == 200 && offsetof(wexa_tags, entry) == 240));
static_assert(sizeof(void *) != 8 ||
              (sizeof(wexa_tag_entry) == 96 && offsetof(wexa_tags, last) == 1784));

struct xwav_info {
    int32_t codec;  // kWexaPcm, or the file's own format tag
    int32_t reserved_4[4];
    int32_t sample_rate;
    int32_t bits;
    int32_t channels;
    int64_t duration;
    int64_t reserved_40;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xwav_info, sample_rate) == 20 && offsetof(xwav_info, duration) == 32));
static_assert(sizeof(void *) != 8 || sizeof(xwav_info) == 48);

struct xaac_info {
    int32_t reserved_0[3];
    int32_t sample_rate;
    int32_t reserved_16;
    int32_t channels;
    int64_t reserved_24[2];
    int64_t duration;
    wexa_tags *tags;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xaac_info, sample_rate) == 12 && offsetof(xaac_info, channels) == 20));
static_assert(sizeof(void *) != 8 ||
              (offsetof(xaac_info, duration) == 40 && sizeof(xaac_info) == 56));

struct xflac_info {
    int32_t reserved_0[2];
    int32_t sample_rate;
    int32_t reserved_12;
    int64_t reserved_16[5];
    int64_t duration;
    wexa_tags *tags;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xflac_info, sample_rate) == 8 && offsetof(xflac_info, duration) == 56));
static_assert(sizeof(void *) != 8 ||
              (offsetof(xflac_info, tags) == 64 && sizeof(xflac_info) == 72));

struct xmp123_info {
    int32_t reserved_0[2];
    int32_t sample_rate;
    int32_t reserved_12;
    int32_t channels;
    int32_t reserved_20;
    int64_t reserved_24[2];
    int64_t duration;
    wexa_tags *tags;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xmp123_info, sample_rate) == 8 && offsetof(xmp123_info, channels) == 16));
static_assert(sizeof(void *) != 8 ||
              (offsetof(xmp123_info, duration) == 40 && sizeof(xmp123_info) == 56));

constexpr int32_t kMp4Tracks = 64;  // entries of kind
struct xmp4_info {
    int32_t track_count;
    int32_t reserved_4[3];
    int32_t kind[kMp4Tracks];
    int64_t duration;
    uint8_t reserved_280[416];
    wexa_tags *tags;
    int64_t reserved_704;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xmp4_info, kind) == 16 && offsetof(xmp4_info, duration) == 272));
static_assert(sizeof(void *) != 8 ||
              (offsetof(xmp4_info, tags) == 696 && sizeof(xmp4_info) == 712));

struct xmp4_track {
    int32_t reserved_0;
    int32_t format_tag;  // kWexaTag*
    int32_t reserved_8;
    int32_t sample_rate;
    int32_t reserved_16;
    int32_t channels;
    int64_t reserved_24[6];
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xmp4_track, format_tag) == 4 && offsetof(xmp4_track, sample_rate) == 12));
static_assert(sizeof(void *) != 8 ||
              (offsetof(xmp4_track, channels) == 20 && sizeof(xmp4_track) == 72));

constexpr int32_t kOggStreams = 16;  // entries of kind
struct xogg_info {
    int32_t kind[kOggStreams];
    int32_t stream_count;
    int32_t reserved_68[3];
    wexa_tags *tags;
    int64_t duration;
    int64_t reserved_96;
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xogg_info, stream_count) == 64 && offsetof(xogg_info, tags) == 80));
static_assert(sizeof(void *) != 8 ||
              (offsetof(xogg_info, duration) == 88 && sizeof(xogg_info) == 104));

struct xogg_stream {
    int32_t reserved_0;
    int32_t codec;  // 323 for Vorbis
    int32_t reserved_8;
    int32_t sample_rate;
    int64_t reserved_16[2];
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(xogg_stream, codec) == 4 && offsetof(xogg_stream, sample_rate) == 12));
static_assert(sizeof(void *) != 8 || sizeof(xogg_stream) == 32);

// Decoder configuration.
struct wexa_config {
    int32_t word_0;            // 1
    int32_t output_channels;   // 0 for as many as the stream has
    int32_t bytes_per_sample;  // 2
    int32_t word_3;            // 0
};
struct xaac_config {
    wexa_config base;
    int32_t word_4;  // 3
    int32_t sample_rate;
    int32_t channels;
    int32_t word_7;  // 0
};
static_assert(sizeof(void *) != 8 || (sizeof(wexa_config) == 16 && sizeof(xaac_config) == 32));

// One frame, compressed or PCM, passed from a reader to its decoder.
struct wexa_frame {
    void *data;
    uint64_t reserved_8;
    int32_t bytes;
    int32_t word_20;  // 0
    int32_t codec;
    int32_t reserved_28;
    uint64_t reserved_32[8];
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(wexa_frame, bytes) == 16 && offsetof(wexa_frame, codec) == 24));
static_assert(sizeof(void *) != 8 || sizeof(wexa_frame) == 96);

// Output of a decoder: interleaved 16-bit PCM in a buffer that the caller owns.
struct wexa_output {
    uint8_t reserved_0[32];
    int32_t bytes;
    uint8_t reserved_36[28];
    void *data;
    uint8_t reserved_72[200];
};
static_assert(sizeof(void *) != 8 ||
              (offsetof(wexa_output, bytes) == 32 && offsetof(wexa_output, data) == 64));
static_assert(sizeof(void *) != 8 || sizeof(wexa_output) == 272);

struct wexa_status {
    int32_t produced;  // nonzero if the decoder wrote PCM
    int32_t reserved_4[7];
};
static_assert(sizeof(void *) != 8 || sizeof(wexa_status) == 32);

struct xaac_stream_info {
    int32_t word_0;
    int32_t sample_rate;
    int32_t reserved_8[14];
};
static_assert(sizeof(void *) != 8 || offsetof(xaac_stream_info, sample_rate) == 4);

// The FLAC source sets the byte at this offset of the reader's state to 1 before every read.
constexpr size_t kFlacReaderFlag = 2096;

extern "C" {

// WAV. Frames are chunks of interleaved PCM. A seek takes whole seconds but stores 100-ns units in
// *reached.
void *xwavd_create(const mtsrc_io *io, xwav_info *info, int32_t *word);
int32_t xwavd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                      int64_t *second);
int32_t xwavd_seek(void *reader, const int64_t *seconds, int64_t *reached, int32_t flags);
void xwavd_delete(void *reader);

// AAC in ADTS or ADIF form; a library may support only one of the two. `reserved` is always null.
int32_t xaac_init(void);
void xaac_deinit(void);
void *xaacfd_create(const mtsrc_io *io, int64_t *word, xaac_info *info, void *reserved);
int32_t xaacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second);
int32_t xaacfd_seek(void *reader, const int64_t *position, int64_t *reached);
void xaacfd_delete(void *reader);
void *xaacd_create(const xaac_config *config, void *reserved);
int32_t xaacd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                     wexa_status *status);
void xaacd_reset(void *decoder);
void xaacd_delete(void *decoder);
int32_t xaacd_info(void *decoder, const wexa_frame *frame, xaac_stream_info *info);

// FLAC.
int32_t xflac_init(void);
void xflac_deinit(void);
void *xflacfd_create(const mtsrc_io *io, int64_t *word, xflac_info *info, void *reserved);
int32_t xflacfd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second);
int32_t xflacfd_seek(void *reader, const int64_t *position, int64_t *reached);
void xflacfd_delete(void *reader);
void *xflacd_create(const wexa_config *config, void *reserved);
int32_t xflacd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                      wexa_status *status);
void xflacd_reset(void *decoder);
void xflacd_delete(void *decoder);

// MPEG audio, Layers I to III. get_frm sets *first to 0 for the first frame of the stream.
int32_t xmp123_init(void);
void xmp123_deinit(void);
void *xmp123fd_create(const mtsrc_io *io, int64_t *word, xmp123_info *info, void *reserved);
int32_t xmp123fd_get_frm(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                         int64_t *second);
int32_t xmp123fd_seek(void *reader, const int64_t *position, int64_t *reached);
void xmp123fd_delete(void *reader);
void *xmp123d_create(const wexa_config *config, void *reserved);
int32_t xmp123d_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                       wexa_status *status);
void xmp123d_reset(void *decoder);
void xmp123d_delete(void *decoder);

// MP4: a demuxer, and a stream for one of its tracks.
void *xmp4fd_create(const mtsrc_io *io, int32_t *word, xmp4_info *info, void *reserved);
void xmp4fd_delete(void *demux);
void *xmp4fds_open(void *demux, int32_t track, void *reserved);
void xmp4fds_close(void *stream);
int32_t xmp4fds_get_info_aud(void *stream, xmp4_track *track);
int32_t xmp4fds_get_frm(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second);
int32_t xmp4fds_seek(void *stream, const int64_t *position, int64_t *reached, int32_t flags);

// Ogg and Vorbis. xoggds_get_format stores the length of the set-up data in *length. If `buf` is
// not null, it also copies the data there.
void *xoggd_create(const mtsrc_io *io, int64_t *word, xogg_info *info, void *reserved);
void xoggd_delete(void *demux);
void *xoggds_open(void *demux, int32_t index, void *reserved);
void xoggds_close(void *stream);
int32_t xoggds_get_info_aud(void *stream, xogg_stream *info);
int32_t xoggds_get_format(void *stream, void *buf, int32_t *length);
int32_t xoggds_get_frm(void *stream, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                       int64_t *second);
int32_t xoggds_seek(void *stream, const int64_t *position, int64_t *reached, int32_t flags);
int32_t xvorbis_init(void);
void xvorbis_deinit(void);
void *xvorbisd_create(const wexa_config *config, void *reserved);
int32_t xvorbisd_decode(void *decoder, const wexa_frame *frame, wexa_output *output,
                        wexa_status *status);
void xvorbisd_reset(void *decoder);
void xvorbisd_delete(void *decoder);
}
