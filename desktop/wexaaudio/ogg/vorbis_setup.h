// The set-up data that xoggds_get_format gives out and xvorbisd_decode takes before any audio: the
// three header packets of a Vorbis stream in Xiph's packing.
#ifndef WEXAAUDIO_VORBIS_SETUP_H
#define WEXAAUDIO_VORBIS_SETUP_H

#include <cstdint>

constexpr int32_t kVorbisHeaders = 3;                     // identification, comments, set-up
constexpr uint8_t kVorbisSetupMark = kVorbisHeaders - 1;  // the first byte: their number less one

#endif
