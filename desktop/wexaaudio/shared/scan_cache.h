// Results of scanning files, shared by the readers of a file: a job opens it five times.
//
// A file is identified by its path's device, inode, size and time of change, so a file that was
// replaced or written to is scanned again. The result used last stays for the next reader, unless
// the file changed so recently that another change could go unnoticed. Readers whose callbacks use
// another kind of path, or none, share nothing.
#ifndef WEXAAUDIO_SCAN_CACHE_H
#define WEXAAUDIO_SCAN_CACHE_H

#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"

constexpr int32_t kMaxTracks = 64;

// Result of a scan. It does not change afterwards, because readers of the same file share it.
struct stream_info {
    frame_index frames;  // owned
    frame_index pages;  // owned; Ogg: offset is a page body's offset in the file, first its logical
                        // offset, samples its bytes. Frames then have logical offsets
    const char *codec;  // libavcodec's name; null if no stream can be decoded
    uint8_t *setup;     // owned; set-up data of the decoder, or null
    int32_t setup_bytes;
    int32_t rate;          // of the output, Hz
    int32_t channels;      // of the stream
    int32_t out_channels;  // of the output, 1 or 2
    int64_t delay;         // sample frames that the source drops at the start: seeks and the
                           // duration count without them

    // Frames that a fresh decoder decodes first. To deliver frame n, it starts from the first frame
    // of n's group, or from n if there are no groups. Before that frame it decodes `preroll`
    // frames, and before those as many as contain `reservoir` bytes of payload. Each group has its
    // own decoder.
    int32_t group;  // frames, or 0 if there are no groups
    int32_t preroll;
    int32_t reservoir;
    int32_t overhead;  // bytes of a frame before its payload

    int64_t cut_frame;    // the frame whose output is shortened by cut_samples at its start
    int32_t cut_samples;  // sample frames, or 0

    // For containers.
    int32_t track_count;
    int32_t kind[kMaxTracks];  // kWexaKindAudio for audio
    int32_t track;             // index of the track to read, or -1

    // For FLAC, which needs no index.
    int64_t base;  // number of the stream's first sample
    int64_t end;   // sample frames
};

// Scans a file for one format and fills in a zeroed result. False if the file is not of the format,
// if it cannot be read or if memory runs out. The caller releases what the result owns, also after
// a failure.
typedef bool (*scan_function)(io_file *file, stream_info *info);

// Returns the result for an open file, from another reader or from a new scan. Null if the scan
// fails. The caller returns it with scan_cache_put. May be called on any thread.
const stream_info *scan_cache_get(io_file *file, scan_function scan);

void scan_cache_put(const stream_info *info);  // null is allowed

#endif
