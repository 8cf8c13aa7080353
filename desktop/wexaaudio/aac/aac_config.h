// The AudioSpecificConfig of an AAC stream, which a decoder needs before raw blocks.
//
// In: fields of an ADTS header, or the configuration that an MP4 track carries. Out: bytes
// for the decoder's set-up data.
#ifndef WEXAAUDIO_AAC_CONFIG_H
#define WEXAAUDIO_AAC_CONFIG_H

#include <cstdint>

constexpr int32_t kAacMaxConfig = 512;  // bytes; longer ones are refused

constexpr int32_t kAacLowComplexity = 2;  // audio object types
constexpr int32_t kAacSbr = 5;
constexpr int32_t kAacPs = 29;

struct aac_config {
    uint8_t bytes[kAacMaxConfig];
    int32_t size;
    int32_t object_type;  // as stated: kAacSbr and kAacPs where they are explicit
    int32_t rate_index;   // of the core, 0 to 12; 15: not in the table
    int32_t channels;     // the channel configuration, 0: given by a program configuration
    bool short_frames;    // 960 samples a frame instead of 1024
};

// Sampling rate of a table index, Hz; 0 for an index without one.
int32_t aac_rate_of_index(int32_t index);

// For a stream whose headers state everything. channels: 1 to 15.
void aac_config_make(aac_config *config, int32_t object_type, int32_t rate_index, int32_t channels);

// For a stream whose channels are stated by the program configuration element at the start of data,
// a raw block. False when the element does not end within bytes.
bool aac_config_from_program(aac_config *config, const uint8_t *data, int32_t bytes,
                             int32_t object_type, int32_t rate_index);

// Copies a configuration and reads its first fields. False when it is too long or too short.
bool aac_config_read(aac_config *config, const void *data, int32_t bytes);

// States explicitly that the stream carries spectral band replication (and, parametric, stereo from
// one channel). Without that, a decoder that starts at a frame without such data never applies it.
// A configuration that is not a plain low-complexity one is left unchanged.
void aac_config_make_sbr(aac_config *config, bool parametric);

#endif
