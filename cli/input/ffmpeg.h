// Runs the ffmpeg program on one untrusted file.
//
// Input: a file, and the arguments that describe the output. Output: the bytes that the program
// writes to standard output. Used by song_file.h and write/clip.h in a worker process.
#ifndef TAVO_CLI_INPUT_FFMPEG_H
#define TAVO_CLI_INPUT_FFMPEG_H

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "cli/failure.h"

struct ffmpeg_task {
    std::string program;                 // path of ffmpeg
    std::string path;                    // of the file to read, any bytes except NUL
    int fd = -1;                         // if not negative, this seekable file is read instead
    std::vector<std::string> arguments;  // everything after the input
};

// Receives the program's standard output. If it returns a failure, the program is killed.
using byte_sink = std::function<failure(std::string_view bytes)>;

// Searches PATH. Returns the path of the ffmpeg program, or an empty string.
std::string find_ffmpeg();

// Runs the program and waits until it has ended. It is killed if stop_fd becomes readable or if
// it writes nothing for kIdleSeconds. It can read only the given file, and nothing from the
// network. A failure quotes the first line of the program's messages.
failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const byte_sink &sink);

constexpr int kIdleSeconds = 30;

// An ffmpeg filter that starts the timeline at 0 and fills gaps with silence, as players do.
constexpr const char *kPlayerTimeFilter = "aresample=async=1:first_pts=0";

#endif
