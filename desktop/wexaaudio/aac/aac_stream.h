// One AAC track, shared by the ADTS reader and the MP4 demuxer: its AudioSpecificConfig, which a
// decoder needs before raw blocks, and the stream of its raw blocks, which all have one length.
//
// In: fields of an ADTS header, or the configuration that an MP4 track carries; where each raw
// block is in the file. Out: a stream_info record.
#ifndef WEXAAUDIO_AAC_STREAM_H
#define WEXAAUDIO_AAC_STREAM_H

#include "desktop/wexaaudio/shared/stream.h"

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

// For a stream whose headers state everything. channels: 0 to 15.
void aac_config_make(aac_config *config, int32_t object_type, int32_t rate_index, int32_t channels);

// Completes one of 0 channels from the program configuration element at the start of data, a raw
// block. False when the element does not end within bytes.
bool aac_config_add_program(aac_config *config, const uint8_t *data, int32_t bytes);

// Copies a configuration and reads its first fields. False when it is too long or too short.
bool aac_config_read(aac_config *config, const void *data, int32_t bytes);

// Completes a stream whose frames are in the index: decodes the first ones to find what the headers
// do not state (or state wrongly), makes the configuration explicit, gives all frames their length
// and chooses the groups. A block of impossible length becomes silence. False when nothing there
// decodes or out of memory.
bool aac_stream_complete(io_file *file, aac_config *config, stream_info *info);

#endif
