// Runs the ffmpeg program on one file, which is not trusted.
//
// In: a file and the arguments for the output. Out: the bytes of its standard output. Called by
// ffmpeg.h and write/clip.h in a worker process.
#ifndef TAVO_CLI_INPUT_FFMPEG_PROCESS_H
#define TAVO_CLI_INPUT_FFMPEG_PROCESS_H

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "cli/failure.h"

struct ffmpeg_task {
    std::string program;                 // path of ffmpeg
    std::string path;                    // of the file to read, any bytes except NUL
    int fd = -1;                         // read instead of path unless negative; seekable
    std::vector<std::string> arguments;  // everything after the input
};

// Receives the program's standard output. A failure ends the program.
using byte_sink = std::function<failure(std::string_view bytes)>;

// Path of the ffmpeg program in PATH, or an empty string.
std::string find_ffmpeg();

// Runs the program and waits until it has ended. It is killed at a stop (stop_fd readable or closed
// at its other end) or if it writes nothing for kIdleSeconds. It can read only the given file, and
// nothing from the network. A failure quotes the first line of the program's messages.
failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const byte_sink &sink);

constexpr int kIdleSeconds = 30;

// Like a player, this filter starts the timeline at 0 and fills gaps with silence.
constexpr const char *kPlayerTimeFilter = "aresample=async=1:first_pts=0";

#endif
