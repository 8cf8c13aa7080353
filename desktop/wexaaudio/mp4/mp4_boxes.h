// What an MP4 file says about its tracks: the kinds of all, and of the first audio track its codec
// and the place of every frame, from the tables of the movie box and of its fragments. Edit lists
// are not looked at.
//
// In: the file. Out: the frames (without their lengths in samples) and the codec.
// After: mp4_demux.cpp.
#ifndef WEXAAUDIO_MP4_BOXES_H
#define WEXAAUDIO_MP4_BOXES_H

#include "desktop/wexaaudio/aac/aac_config.h"
#include "desktop/wexaaudio/shared/stream.h"

struct mp4_codec {
    bool is_mpeg;       // Layer III
    bool is_aac;        // with a configuration
    aac_config config;  // of AAC
};

// Frames that the file is too short for, and all after them, are left out. False when the file has
// no movie box, cannot be read, or memory runs out.
bool mp4_read_boxes(io_file *file, stream_info *info, mp4_codec *codec);

#endif
