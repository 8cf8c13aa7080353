// Results of scanning files, shared by the readers of a file: a job opens one file five times.
//
// A file is identified by its path's device, inode, size and time of change, so that a file that
// was replaced or written to is scanned again. The result used last is kept for the next reader,
// unless the file changed so shortly before that a further change could go unnoticed. Readers whose
// callbacks serve other paths, or none, share nothing.
#ifndef WEXAAUDIO_SCAN_CACHE_H
#define WEXAAUDIO_SCAN_CACHE_H

#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

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

    // FLAC, which needs no index.
    int64_t base;  // number of the stream's first sample
    int64_t end;   // sample frames
};

// One format's scan, which identifies the format. Fills in a zeroed result. False when the file is
// not of the format or cannot be read, and when out of memory; what the result owns by then is
// released by the caller.
typedef bool (*scan_function)(io_file *file, stream_info *info);

// The result for an open file: another reader's, or of a new scan. Null when the scan fails.
// Returned with scan_cache_put. Any thread.
const stream_info *scan_cache_get(io_file *file, scan_function scan);

void scan_cache_put(const stream_info *info);  // null is allowed

#endif
