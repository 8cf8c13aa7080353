// One pass over an MPEG audio file: its frames, past tags, garbage and damage.
//
// In: the file. Out: an index of the stream's frames. After: mpeg_frames.h.
#ifndef WEXAAUDIO_MPEG_SCAN_H
#define WEXAAUDIO_MPEG_SCAN_H

#include "desktop/wexaaudio/mpeg/mpeg_header.h"
#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

struct mpeg_stream {
    mpeg_header head;   // of the first frame of music
    frame_index index;  // owned; an entry of 0 bytes is a lost frame, to be replaced by silence
    int64_t tag;        // offset of the ID3v2 tag before the stream, -1 without one
    int64_t tag_bytes;  //
};

// False when there is no stream, on a read error and when out of memory, with nothing held.
bool mpeg_scan(io_file *file, mpeg_stream *stream);

// Total bytes of an ID3v2 tag from its first 10 bytes, footer included; 0 when it is none.
int64_t id3v2_bytes(const uint8_t *p);

#endif
