// Decodes with the ffmpeg program what the library refuses.
//
// In: a file. Out: a WAV file in memory that the library reads: one channel, 16 bits, the file's
// own rate or the nearest that is accepted, on the time line of players. Called by sound_file.h.
#ifndef TAVO_CLI_INPUT_FFMPEG_H
#define TAVO_CLI_INPUT_FFMPEG_H

#include <cstdint>
#include <string>

#include "cli/failure.h"

struct ffmpeg_limits {
    std::string program;  // path of ffmpeg
    int64_t minutes = 0;  // of sound at most
    std::string filter;   // further filters of ffmpeg, after a comma; or empty
};

// Decodes the first audio stream of path, or of fd when not negative, into sound_fd, a new
// descriptor that the caller closes; -1 after a failure.
failure decode_with_ffmpeg(const ffmpeg_limits &limits, const std::string &path, int fd,
                           int stop_fd, int &sound_fd);

// True if a file's name ends as those of formats that ffmpeg reads and the library does not. In a
// folder such files count as audio when there is ffmpeg, whatever they hold.
bool has_media_suffix(const std::string &name);

#endif
