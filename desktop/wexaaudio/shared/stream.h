// Reads one stream of compressed frames as 16-bit PCM, starting at any sample. AAC, MPEG audio, MP4
// and Ogg share this code: their readers are stream_reader records, and the same functions read
// from them, seek in them and delete them.
//
// Input: the frames that a format's scan found. Output: PCM. Precedes copy_decoder.cpp.
#pragma once

#include "desktop/wexaaudio/shared/codec_library.h"
#include "desktop/wexaaudio/shared/scan_cache.h"

struct stream_reader {
    io_file file;
    const codec_library *library;
    const stream_info *info;  // shared by the readers of the file
    av_decoder *decoder;      // owned; null until the first read after opening or a seek
    int64_t next;             // index of the frame to read next
    int32_t skip;             // sample frames to drop from the start of that frame
};

// Opens a reader and stores the stream's duration in 100-ns units. Returns null if `scan`
// rejects the file, a read fails, libavcodec is missing or memory runs out.
stream_reader *stream_open(const mtsrc_io *io, scan_function scan, int64_t *duration);

// Copies bytes. `offset` comes from a frame_entry, so it is logical for Ogg. Returns the number of
// bytes copied, which is smaller if the pages or the file end first, or -1 on a read error.
int64_t stream_copy(io_file *file, const stream_info *info, int64_t offset, uint8_t *buf,
                    int64_t bytes);
