// One pass over an Ogg file: its streams, and of the first audio stream, when it is Vorbis, every
// packet with its place in the file and in the decoded stream.
//
// In: the file. Out: an index and the set-up data. After: ogg_demux.cpp.
//
// A stream's pages lie scattered and its packets run over their ends, so packets are placed by
// their logical offset: the bytes of the stream's page bodies before them.
#ifndef WEXAAUDIO_OGG_INDEX_H
#define WEXAAUDIO_OGG_INDEX_H

#include <cstdint>

#include "desktop/wexaaudio/ogg/vorbis_setup.h"
#include "desktop/wexaaudio/shared/frame_index.h"
#include "desktop/wexaaudio/shared/io_file.h"
#include "media_source/wexaaudio.h"

constexpr int32_t kOggVorbis = 323;  // codec code

struct ogg_index {
    int32_t stream_count;       // of the file's first group of streams, at most kOggStreams
    int32_t kind[kOggStreams];  // kWexaKindAudio for audio
    int32_t serial[kOggStreams];
    int32_t stream;  // the first audio stream, -1 without one
    int32_t codec;   // kOggVorbis, 0 for any other
    vorbis_setup setup;

    // Owned. The stream's pages: offset is the body's place in the file, first its logical offset,
    // samples its bytes.
    frame_index pages;

    // Owned. The packets: offset is logical. An entry of 0 samples only primes the decoder for the
    // next one, an entry of 0 bytes is a hole in the stream, to be filled with silence.
    frame_index packets;
    int64_t cut_packet;   // the packet whose front is cut off, -1 when none is
    int32_t cut_samples;  // sample frames
};

// Stops at the first page of a second group of streams chained behind the first. Also fills in
// tags. False when there is no Ogg stream, on a read error and when out of memory, with nothing
// held. A Vorbis stream without whole headers counts as any other codec.
bool ogg_index_read(ogg_index *index, io_file *file, wexa_tags *tags);

// Copies bytes at a logical offset. False when the pages or the file end before.
bool ogg_index_copy(const ogg_index *index, io_file *file, int64_t offset, void *buf,
                    int32_t bytes);

void ogg_index_free(ogg_index *index);

#endif
