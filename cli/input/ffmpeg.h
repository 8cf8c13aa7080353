// Uses the ffmpeg program to decode files that the library refuses.
//
// In: a file. Out: a WAV file in memory for the library: 16-bit mono, at the file's own rate or
// the nearest supported one, on a player's timeline. Called by song_file.h.
#ifndef TAVO_CLI_INPUT_FFMPEG_H
#define TAVO_CLI_INPUT_FFMPEG_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"

// Decodes the first audio stream of `fd`, or of `path` if `fd` is negative. sound_fd receives a new
// descriptor, which the caller closes; -1 after a failure.
failure decode_with_ffmpeg(const options &opts, const std::string &path, int fd,
                           const std::string &filter, int stop_fd, int &sound_fd);

// True if a file's name has the extension of a format that ffmpeg reads and the library does not.
// In a folder such files count as audio if ffmpeg is installed, whatever they contain.
bool has_media_suffix(const std::string &name);

#endif
