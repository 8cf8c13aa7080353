// One stream of compressed frames, read as 16-bit PCM from any sample on: what AAC, MPEG audio, MP4
// and Ogg have in common.
//
// In: the frames that a format's scan finds. Out: PCM, frame by frame, for the copying decoders.
//
// The output depends on the position in the file alone: after a seek a fresh decoder first decodes
// as many earlier frames as it needs to reach the state of a linear read.
#ifndef WEXAAUDIO_STREAM_H
#define WEXAAUDIO_STREAM_H

#include "desktop/wexaaudio/shared/codec_library.h"
#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"
#include "desktop/wexaaudio/shared/scan_cache.h"

constexpr int32_t kMaxTracks = 64;

// What a scan finds in a file. Not changed afterwards: readers of the same file share it.
struct stream_info {
    frame_index frames;  // owned
    frame_index pages;  // owned; Ogg: offset is a page body's offset in the file, first its logical
                        // offset, samples its bytes. Frames then have logical offsets
    const char *codec;  // libavcodec's name; null when there is no stream that can be decoded
    uint8_t *setup;     // owned; set-up data of the decoder, may be null
    int32_t setup_bytes;
    int32_t rate;          // Hz, of the output
    int32_t channels;      // of the stream
    int32_t out_channels;  // of the output, 1 or 2
    int64_t delay;         // sample frames that the source drops at the start: seeks and the
                           // duration count without them

    // What a decoder must have decoded before frame n: from the start of n's group of this many
    // frames (0: there are no groups) as many frames more, and those with as many bytes of payload
    // before these. Each group starts a fresh decoder.
    int32_t group;
    int32_t preroll;
    int32_t reservoir;  // bytes
    int32_t overhead;   // bytes of a frame before its payload

    int64_t cut_frame;    // the frame whose output loses cut_samples at its front
    int32_t cut_samples;  // 0: none does

    // In a container.
    int32_t track_count;
    int32_t kind[kMaxTracks];  // kWexaKindAudio for audio
    int32_t track;             // the one that is read; -1 without one
};

struct stream_reader {
    io_file file;
    const codec_library *library;
    const stream_info *info;  // shared by the readers of the file
    av_decoder *decoder;      // owned; null until the first read
    int64_t next;             // frame read next
    int32_t skip;             // sample frames cut from its front
    bool fresh;               // it needs a fresh decoder
};

// The functions below take this reader as the interface's handle, which has no type.
//
// Null when the file cannot be read as the format, when libavcodec is missing, and when out of
// memory. Released with stream_close.
// kind: its results are stream_info records.
stream_reader *stream_open(const mtsrc_io *io, const scan_kind *kind);

void stream_close(void *reader);  // null is allowed

// 100-ns units.
int64_t stream_duration(const stream_reader *reader);

// Reads the next frame that has samples: a frame that cannot be decoded becomes silence. Returns 0,
// 1 at the end, -1 on failure. first and second: start and length, 100-ns units.
int32_t stream_read(void *reader, void *buf, int32_t size, int32_t *bytes, int64_t *first,
                    int64_t *second);

// Moves to the first sample at or after position (100-ns units), at most to the end. Returns 0, -1
// on a bad argument.
int32_t stream_seek(void *reader, const int64_t *position, int64_t *reached);

// Copies bytes at an offset of the frames' kind. Returns the bytes copied, fewer when the pages or
// the file end before, -1 on a read error.
int64_t stream_copy(io_file *file, const stream_info *info, int64_t offset, uint8_t *buf,
                    int64_t bytes);

// Stores a copy of set-up data. False when out of memory.
bool stream_set_up(stream_info *info, const uint8_t *setup, int32_t bytes);

// Releases what a scan's result owns.
void stream_info_release(void *info);

#endif
