// How much later a time counts in the library than in a player. The library counts from the first
// sample that it decodes; players leave out the encoder's delay, which the file states.
//
// In: an MP3 or MP4 file. Out: milliseconds for record.h. docs/FORMATS.md has the table.
#ifndef TAVO_CLI_INPUT_PLAYER_OFFSET_H
#define TAVO_CLI_INPUT_PLAYER_OFFSET_H

#include <cstdint>
#include <string>

// Player's time = library's time - offset. rate and channels are those of the library's stream.
// 0 where the file states nothing, for other formats, and for a file that cannot be read.
double find_player_offset_ms(const std::string &path, int32_t rate, int32_t channels);

#endif
