// One stream of compressed frames, read as 16-bit PCM from any sample on: what AAC, MPEG audio, MP4
// and Ogg have in common. stream.cpp defines the functions of the interface that read, seek and
// delete, once for all of these readers.
//
// In: the frames that a format's scan finds. Out: PCM, frame by frame, for the copying decoders.
#ifndef WEXAAUDIO_STREAM_H
#define WEXAAUDIO_STREAM_H

#include "desktop/wexaaudio/shared/codec_library.h"
#include "desktop/wexaaudio/shared/scan_cache.h"

struct stream_reader {
    io_file file;
    const codec_library *library;
    const stream_info *info;  // shared by the readers of the file
    av_decoder *decoder;      // owned; null until the first read after opening or a seek
    int64_t next;             // frame read next
    int32_t skip;             // sample frames cut from its front
};

// Null when the file cannot be read as the format, when libavcodec is missing, and when out of
// memory. *duration receives the stream's, in 100-ns units. The interface's functions delete it.
stream_reader *stream_open(const mtsrc_io *io, scan_function scan, int64_t *duration);

// Copies bytes at an offset of the frames' kind. Returns the bytes copied, fewer when the pages or
// the file end before, -1 on a read error.
int64_t stream_copy(io_file *file, const stream_info *info, int64_t offset, uint8_t *buf,
                    int64_t bytes);

#endif
