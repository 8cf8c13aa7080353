// AAC streams that no encoder at hand writes, made out of one that it does.
#ifndef TAVO_TESTS_PLATFORM_AAC_STREAMS_H
#define TAVO_TESTS_PLATFORM_AAC_STREAMS_H

#include <vector>

#include "tests/platform/codec_test.h"

namespace codec_test {

// Offsets of the ADTS frames; the file's end is the last one.
std::vector<size_t> adts_frames(const bytes &file);

// Gives every frame of a one-channel stream at 22,050 Hz spectral band replication: one band, a
// noise floor, an envelope that changes with every frame, and the header in every header_every-th
// frame. The headers go on stating half the rate and one channel.
bytes with_band_replication(const bytes &adts, size_t header_every);

// The same raw blocks behind an ADIF header.
bytes as_adif(const bytes &adts);

// The same raw blocks with ADTS headers that leave the channels to a program configuration in the
// first block.
bytes with_program_configuration(const bytes &adts);

}  // namespace codec_test

#endif
