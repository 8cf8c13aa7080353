// What an MP4 file says about its tracks, read through libavformat with the format forced: nothing
// but the file itself is ever opened, edit lists are ignored.
//
// In: the file. Out: the kinds of the tracks, and of the first audio track the place of every
// frame. After: mp4_demux.cpp, which reads the frames without libavformat.
#ifndef WEXAAUDIO_MP4_INDEX_H
#define WEXAAUDIO_MP4_INDEX_H

#include <cstdint>

#include "desktop/wexaaudio/aac/aac_config.h"
#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"
#include "media_source/wexaaudio.h"

struct mp4_index {
    int32_t track_count;       // at most kMp4Tracks, more are left out
    int32_t kind[kMp4Tracks];  // kWexaKindAudio for audio
    int32_t track;             // the first audio track, -1 without one
    int32_t format_tag;        // kWexaTag* of it, 0 for any other codec
    int32_t sample_rate;       // as the container states it, Hz
    int32_t channels;          // likewise
    aac_config config;         // AAC only
    // Owned. Frames in order, up to the first that the file is too short for; their samples are 0,
    // for the caller to fill in. Empty when the codec is another one.
    frame_index frames;
};

// Also fills in tags. False when the file is no MP4 or cannot be read, and when out of memory; with
// nothing held.
bool mp4_index_read(mp4_index *index, io_file *file, wexa_tags *tags);

#endif
