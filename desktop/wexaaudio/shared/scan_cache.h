// Caches the results of scanning files, because a job opens its file five times.
//
// A file is identified by the device, inode, size and change time of its path, so a file that
// was replaced or written to is scanned again. The last result is kept for the next reader, unless
// the file changed so recently that another change could go unnoticed. Readers whose callbacks do
// not read the file at the path share nothing.
#pragma once

#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

constexpr int32_t kMaxTracks = 64;

// Result of a scan. Readers of the same file share it, so it never changes.
struct stream_info {
    frame_index frames;  // owned
    frame_index pages;   // owned; the page bodies of Ogg: `first` is a logical offset and `samples`
                         // a size in bytes. For Ogg, the offsets in `frames` are logical, too
    const char *codec;   // libavcodec's name; null if no stream can be decoded
    uint8_t *setup;      // owned; set-up data of the decoder, or null
    int32_t setup_bytes;
    int32_t rate;          // of the output, Hz
    int32_t channels;      // of the stream
    int32_t out_channels;  // of the output, 1 or 2
    int64_t delay;         // sample frames that the source drops at the start; seeks and the
                           // duration do not count them

    // To deliver frame n, a fresh decoder must start earlier: `preroll` frames before n (or before
    // n's group), plus enough frames to contain `reservoir` bytes of payload. Each group has its
    // own decoder.
    int32_t group;  // frames in a group, or 0 if there are no groups
    int32_t preroll;
    int32_t reservoir;
    int32_t overhead;  // bytes of a frame before its payload

    int64_t cut_frame;    // the frame whose first cut_samples are cut off
    int32_t cut_samples;  // sample frames, or 0

    // For containers.
    int32_t track_count;
    int32_t kind[kMaxTracks];  // kWexaKindAudio for audio
    int32_t track;             // index of the track to read, or -1

    // For FLAC, which needs no index.
    int64_t base;  // number of the stream's first sample
    int64_t end;   // sample frames
};

// Scans a file of one format and fills in a zeroed result. Returns false if the file is not of that
// format or cannot be read, or if memory runs out. The caller releases what the result owns, even
// after a failure.
typedef bool (*scan_function)(io_file *file, stream_info *info);

// Returns the result for an open file, from the cache or from a new scan, or null if the scan
// fails. The caller returns it with scan_cache_put. May be called on any thread.
const stream_info *scan_cache_get(io_file *file, scan_function scan);

void scan_cache_put(const stream_info *info);  // null is allowed
