// The raw blocks of one AAC track and how they are handed out, shared by the ADTS/ADIF reader and
// the MP4 demuxer.
//
// In: where each raw block lies in the file, the configuration. Out: bundles (bundle.h) of one
// frame for aac_decoder.cpp, every one of which decodes to frame_samples sample frames or to
// nothing.
//
// A decoder's noise generator carries history, so the same block decoded after a seek would differ
// from a linear read. Therefore the track is cut into groups of equally many frames, and each
// starts a fresh decoder some frames before itself. A seek starts the same way and goes on to its
// place; what comes before that is decoded for the decoder's state and gives no output. The output
// is then a function of the place in the file alone.
#ifndef WEXAAUDIO_AAC_STREAM_H
#define WEXAAUDIO_AAC_STREAM_H

#include <cstdint>

#include "desktop/wexaaudio/aac/aac_config.h"
#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

constexpr int32_t kAacFrameBuffer = 24576;  // bytes: what the sources read a frame into

struct aac_stream {
    io_file *file;      // not owned
    frame_index index;  // owned; the raw blocks, without ADTS headers
    aac_config config;
    int32_t sample_rate;    // Hz, of the output
    int32_t channels;       // of the output
    int32_t frame_samples;  // sample frames that each block decodes to
    int32_t group;          // frames; 0: the stream is not cut into groups
    int32_t preroll;        // frames decoded before a group
    int64_t next;           // frame whose output comes next
    int32_t skip;           // sample frames cut from its front
    int64_t feed;           // frame handed out next; those before next are for the state alone
    bool fresh;             // it starts a decoder
};

// With file, index and config set: decodes the first frames to learn what the headers do not say
// (or say wrongly), makes the configuration explicit, fills in the index and chooses the groups.
// False when nothing there decodes or out of memory.
bool aac_stream_learn(aac_stream *s);

// The next frame's output has been handed out.
void aac_stream_advance(aac_stream *s);

// The next bundle: 0, 1 at the end, -1 when the file cannot be read. A block longer than any can be
// is handed out as silence. first and second: start and length, 100-ns units.
int32_t aac_stream_read(aac_stream *s, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                        int64_t *second);

// Moves to the first sample at or after position (100-ns units), at most to the end.
int32_t aac_stream_seek(aac_stream *s, int64_t position, int64_t *reached);

// Length of the track, 100-ns units.
int64_t aac_stream_duration(const aac_stream *s);

void aac_stream_free(aac_stream *s);

#endif
