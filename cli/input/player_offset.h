// The difference between the library's times and a player's. The library counts from the first
// sample that it decodes, but players drop the encoder delay, which the file states.
//
// Input: an MP3 or MP4 file. Output: milliseconds for run/record.h. docs/FORMATS.md lists the
// offsets. Used by run/analyse.h.
#pragma once

#include <cstdint>
#include <string>

// Returns how far the library's times are ahead of a player's. `rate` and `channels` describe the
// library's stream. Returns 0 for other formats, and if the file states no delay or cannot be read.
double find_player_offset_ms(const std::string &path, int32_t rate, int32_t channels);
