// The difference between the library's times and a player's. The library counts from the first
// sample that it decodes, but players drop the encoder delay, which the file states.
//
// In: an MP3 or MP4 file. Out: milliseconds for record.h. docs/FORMATS.md has the table.
#ifndef TAVO_CLI_INPUT_PLAYER_OFFSET_H
#define TAVO_CLI_INPUT_PLAYER_OFFSET_H

#include <cstdint>
#include <string>

// Returns the offset: player's time = library's time - offset. rate and channels: of the library's
// stream. Returns 0 if the file states no delay, for other formats, and if the file cannot be read.
double find_player_offset_ms(const std::string &path, int32_t rate, int32_t channels);

#endif
