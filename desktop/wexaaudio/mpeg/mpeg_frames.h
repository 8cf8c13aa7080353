// Frames of an indexed MPEG audio stream as the decoder wants them. Any container may fill the
// index.
//
// In: the file, the index. Out: a bundle. After: xmp123d_decode.
#ifndef WEXAAUDIO_MPEG_FRAMES_H
#define WEXAAUDIO_MPEG_FRAMES_H

#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

// Writes frame n into buf, of size bytes. fresh: the decoder's state is dropped first, and as many
// frames go before it as make its output equal to that of a linear read: the two that the filter
// bank remembers, and those whose bytes they and the frame itself reach back to. skip: sample
// frames cut from the front of the output. channels: of the output. Returns the bytes written; 0
// when the file ends early, -1 on failure.
int32_t mpeg_frames_read(io_file *file, const frame_index *index, int64_t n, bool fresh,
                         int32_t skip, int32_t channels, void *buf, int32_t size);

#endif
