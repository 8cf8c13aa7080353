// The set-up data that xoggds_get_format returns and xvorbisd_decode expects before any audio: the
// three header packets of a Vorbis stream in Xiph's packing.
#ifndef WEXAAUDIO_VORBIS_SETUP_H
#define WEXAAUDIO_VORBIS_SETUP_H

#include <cstdint>

constexpr int32_t kVorbisHeaders = 3;                     // identification, comments, set-up
constexpr uint8_t kVorbisSetupMark = kVorbisHeaders - 1;  // the first byte: their number minus one

#endif
