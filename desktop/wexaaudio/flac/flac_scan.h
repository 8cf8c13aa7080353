// One pass over a FLAC file: its stream information, its comment block, its frames.
//
// A frame header does not say how long the frame is: it ends where the next header of the stream
// follows. A header that continues the numbering is believed; any other one only when the frame
// before it ends there by its check sum, or when it starts a run of its own (then what lies between
// is damage, and the numbers tell how much time it took).
#ifndef WEXAAUDIO_FLAC_SCAN_H
#define WEXAAUDIO_FLAC_SCAN_H

#include "desktop/wexaaudio/flac/flac_header.h"
#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

struct flac_stream {
    uint8_t raw_info[kFlacInfoBytes];
    flac_info info;
    flac_header first;  // header of the first frame: rate, channels, bits of the stream
    frame_index index;  // owned; an entry of 0 bytes is lost: silence. Frames are not decoded here,
                        // so a damaged one is found only when it is
    bool last_unsure;   // the last frame's check sum does not hold up to the end of the file: it is
                        // cut, or something follows it
    int64_t comment;    // offset of the comment block's body, -1 without one
    int64_t comment_bytes;
};

// False when there is no stream, on a read error and when out of memory, with nothing held.
bool flac_scan(io_file *file, flac_stream *stream);

#endif
