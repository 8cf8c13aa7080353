// Packets and times of one Vorbis stream from its pages, in their order.
//
// In: pages of the stream, header packets included. Out: the packets of an ogg_index.
#ifndef WEXAAUDIO_OGG_SCAN_H
#define WEXAAUDIO_OGG_SCAN_H

#include <ogg/ogg.h>

#include <cstdint>

#include "desktop/wexaaudio/ogg/ogg_index.h"

struct AVVorbisParseContext;

struct ogg_scan {
    ogg_index *index;
    io_file *file;
    wexa_tags *tags;
    AVVorbisParseContext *parser;  // owned; once the headers are complete
    int64_t header_at[kVorbisHeaders];
    int32_t header_bytes[kVorbisHeaders];
    int32_t headers;       // found so far
    int64_t page_number;   // of the last page, -1 before the first
    bool open;             // a packet has begun
    int64_t packet_at;     // logical offset of it
    int32_t packet_bytes;  // of it so far
    uint8_t packet_first;  // its first byte
    bool primed;           // the packet before is whole, so that the next gives audio
    int64_t hole;          // the entry that stands for a hole just passed, -1 when none
    int64_t base;          // granule position at sample 0; known once has_base
    bool has_base;
    int64_t page_end;  // end of the audio at the last page with a granule position but one
    int64_t last_end;  // what the last granule position says the end is, sample frames
};

void ogg_scan_start(ogg_scan *scan, ogg_index *index, io_file *file, wexa_tags *tags);

// Takes the next page of the stream; body_at is its body's offset in the file. False when out of
// memory or when the stream is not Vorbis.
bool ogg_scan_page(ogg_scan *scan, ogg_page *page, int64_t body_at);

// Cuts the last packets to the final granule position. False when the stream has no audio.
bool ogg_scan_end(ogg_scan *scan);

void ogg_scan_free(ogg_scan *scan);

#endif
