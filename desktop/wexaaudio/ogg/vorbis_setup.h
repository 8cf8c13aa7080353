// The three header packets of a Vorbis stream, packed for the decoder.
//
// In: the packets as the Ogg demuxer finds them. Out: the set-up data that xoggds_get_format gives
// out and xvorbisd_decode takes before any audio, and the stream's rate and channels.
#ifndef WEXAAUDIO_VORBIS_SETUP_H
#define WEXAAUDIO_VORBIS_SETUP_H

#include <cstdint>

constexpr int32_t kVorbisHeaders = 3;  // identification, comments, set-up
constexpr int32_t kVorbisIdBytes = 30;

// Set-up data starts with this byte (the number of headers less one); no bundle does.
constexpr uint8_t kVorbisSetupMark = kVorbisHeaders - 1;

struct vorbis_setup {
    uint8_t *data;  // owned
    int32_t bytes;
    int32_t sample_rate;  // Hz
    int32_t channels;
};

// Whether a packet is the header of that number, 0 to 2.
bool vorbis_is_header(const uint8_t *packet, int64_t bytes, int32_t number);

// Packs the identification and set-up packets; the comments, which no decoder needs and which may
// hold a picture, are replaced by none. False when a packet is none of Vorbis or too long, or out
// of memory, with nothing held.
bool vorbis_setup_pack(vorbis_setup *setup, const uint8_t *id, int64_t id_bytes,
                       const uint8_t *codebooks, int64_t codebooks_bytes);

void vorbis_setup_free(vorbis_setup *setup);

#endif
