// The AAC code that the ADTS reader and the MP4 demuxer share. It builds the AudioSpecificConfig
// that a decoder needs before the raw blocks. It also describes the stream, in which all raw blocks
// decode to the same number of samples.
//
// Input: the fields of an ADTS header or the configuration of an MP4 track; the offset of each raw
// block. Output: a stream_info. Precedes shared/stream.h.
#pragma once

#include "desktop/wexaaudio/shared/stream.h"

constexpr int32_t kAacMaxConfig = 512;  // bytes; longer configurations are refused

constexpr int32_t kAacLowComplexity = 2;  // an audio object type, like the next two
constexpr int32_t kAacSbr = 5;
constexpr int32_t kAacPs = 29;

struct aac_config {
    uint8_t bytes[kAacMaxConfig];
    int32_t size;
    int32_t object_type;  // as the file states it; kAacSbr or kAacPs only if explicit
    int32_t rate_index;   // of the core, 0 to 12; 15 if the rate is not in the table
    int32_t channels;     // channel configuration; 0 if a program configuration element defines it
    bool short_frames;    // a frame has 960 samples instead of 1024
};

// Returns the sample rate in Hz for an index of the rate table, or 0 for an invalid index.
int32_t aac_rate_of_index(int32_t index);

// Builds a configuration from the fields of a header. `channels` is from 0 to 15.
void aac_config_make(aac_config *config, int32_t object_type, int32_t rate_index, int32_t channels);

// Completes a configuration with 0 channels from the program configuration element at the start of
// the raw block `data`. Returns false if the element does not end within `bytes`.
bool aac_config_add_program(aac_config *config, const uint8_t *data, int32_t bytes);

// Copies a configuration and parses its first fields. Returns false if it is too long or too short.
bool aac_config_read(aac_config *config, const void *data, int32_t bytes);

// Completes a stream whose frames are in the index. Decodes the first frames to find the true rate
// and channels, adds any band replication to the configuration, sets the length of all frames and
// chooses the groups. A frame of impossible size becomes silence. Returns false if no frame can be
// decoded or memory runs out.
bool aac_stream_complete(io_file *file, aac_config *config, stream_info *info);
