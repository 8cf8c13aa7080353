// Reads the description of an MP4 file's tracks: the kind of each track and, for the first audio
// track, its codec and the offset of every frame. The offsets come from the tables of the movie box
// and of its fragments. Edit lists are ignored.
//
// Input: the file. Output: the codec and the frames, without sample counts. Precedes mp4_demux.cpp.
#pragma once

#include "desktop/wexaaudio/aac/aac_stream.h"
#include "desktop/wexaaudio/shared/stream.h"

struct mp4_codec {
    bool is_mpeg;       // Layer III
    bool is_aac;        // AAC with a known configuration
    aac_config config;  // valid if is_aac
};

// Stops adding frames at the first one past the end of the file. Returns false if the file has no
// movie box or cannot be read, or if memory runs out.
bool mp4_read_boxes(io_file *file, stream_info *info, mp4_codec *codec);
