// Decodes with the ffmpeg program what the library refuses.
//
// In: a file. Out: a WAV file in memory that the library reads: one channel, 16 bits, the file's
// own rate or the nearest that is accepted, on the time line of players. Called by song_file.h.
#ifndef TAVO_CLI_INPUT_FFMPEG_H
#define TAVO_CLI_INPUT_FFMPEG_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"

// Decodes the first audio stream of path, or of fd when not negative, into sound_fd, a new
// descriptor that the caller closes; -1 after a failure. filter: further filters of ffmpeg, each
// after a comma.
failure decode_with_ffmpeg(const options &opts, const std::string &path, int fd,
                           const std::string &filter, int stop_fd, int &sound_fd);

// True if a file's name ends as those of formats that ffmpeg reads and the library does not. In a
// folder such files count as audio when there is ffmpeg, whatever they hold.
bool has_media_suffix(const std::string &name);

#endif
