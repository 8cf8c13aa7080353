// Runs the ffmpeg program on one file of any origin.
//
// In: a file and the arguments for the output. Out: the bytes of its standard output. Called by
// ffmpeg.h and write/clip.h, in a worker process.
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
    std::string path;                    // of the file to read, any bytes
    int fd = -1;                         // read instead of path when not negative; seekable
    std::vector<std::string> arguments;  // everything after the input
};

// Receives what the program writes to its standard output. A failure ends the program.
using byte_sink = std::function<failure(std::string_view bytes)>;

// Path of the ffmpeg program that PATH leads to; empty if PATH leads to none.
std::string find_ffmpeg();

// Returns after the program has ended: by itself, at a stop (stop_fd readable or closed at its
// other end), or because it wrote nothing for kIdleSeconds, in which cases it is killed. It reads
// no other file than the one given, and nothing from the network. A failure is a sentence with the
// first line of its messages.
failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const byte_sink &sink);

constexpr int kIdleSeconds = 30;

// Players start their time line at 0 and play gaps as silence: so does this filter.
constexpr const char *kPlayerTimeFilter = "aresample=async=1:first_pts=0";

#endif
