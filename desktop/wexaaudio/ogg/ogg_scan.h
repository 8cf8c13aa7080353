// Packets and times of one Vorbis stream from its pages, in their order.
//
// In: pages of the stream, header packets included. Out: the frames of a stream_info.
//
// A stream's pages are scattered and its packets continue across them, so packets are identified by
// their logical offset: the bytes of the stream's page bodies before them.
#ifndef WEXAAUDIO_OGG_SCAN_H
#define WEXAAUDIO_OGG_SCAN_H

#include <ogg/ogg.h>

#include "desktop/wexaaudio/shared/stream.h"

constexpr int32_t kVorbisHeaders = 3;  // packets: identification, comments, set-up

struct ogg_scan {
    io_file *file;
    const codec_library *library;
    stream_info *info;
    vorbis_parser *parser;  // owned; once the headers are complete
    int64_t header_at[kVorbisHeaders];
    int32_t header_bytes[kVorbisHeaders];
    int32_t headers;       // found so far
    long next_page;        // number of the page after the last
    bool gap;              // pages are missing since the last granule position
    bool open;             // a packet has begun
    int64_t packet_at;     // logical offset of it
    int32_t packet_bytes;  // of it so far
    uint8_t packet_first;  // its first byte
    bool has_base;
    int64_t base;      // granule position at sample 0; known once has_base
    int64_t page_end;  // end of the audio at the second-last page with a granule position
    int64_t last_end;  // end by the last granule position, sample frames
};

// Adds the next page of the stream; body_at is its body's offset in the file. False when out of
// memory or when the stream is not Vorbis. *scan starts zeroed except for its first three fields.
bool ogg_scan_page(ogg_scan *scan, ogg_page *page, int64_t body_at);

// Cuts the last packets to the final granule position. False when the stream has no audio.
bool ogg_scan_end(ogg_scan *scan);

#endif
