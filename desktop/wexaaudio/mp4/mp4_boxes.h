// What an MP4 file states about its tracks: the kinds of all, and for the first audio track its
// codec and the offset of every frame, from the tables of the movie box and of its fragments. Edit
// lists are ignored.
//
// In: the file. Out: the frames (without their lengths in samples) and the codec.
// After: mp4_demux.cpp.
#ifndef WEXAAUDIO_MP4_BOXES_H
#define WEXAAUDIO_MP4_BOXES_H

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/shared/stream.h"

struct mp4_codec {
    bool is_mpeg;       // Layer III
    bool is_aac;        // with a configuration
    aac_config config;  // of AAC
};

// Frames past the end of the file, and all after them, are left out. False when the file has
// no movie box, cannot be read, or memory runs out.
bool mp4_read_boxes(io_file *file, stream_info *info, mp4_codec *codec);

#endif
