// Runs the ffmpeg program on one untrusted file.
//
// Input: a file, and the arguments that describe the output. Output: what the program writes to
// standard output. Used by song_file.h and write/sound_files.h in a worker process.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "cli/failure.h"

struct ffmpeg_task {
    std::string program;                 // path of ffmpeg
    std::string path;                    // of the file to read, any bytes except NUL
    int fd = -1;                         // if not negative, this seekable file is read instead
    std::vector<std::string> arguments;  // everything after the input
};

// Called with the size of the program's standard output when it has grown. If it returns a failure,
// the program is killed. May be null.
using output_check = std::function<failure(int output, int64_t bytes)>;

// Searches PATH. Returns the path of the ffmpeg program, or an empty string.
std::string find_ffmpeg();

// Runs the program and waits until it has ended. It is killed if stop_fd becomes readable or if
// it writes nothing for kIdleSeconds. It can read only the given file, and nothing from the
// network. A failure quotes the first line of the program's messages. `output` receives its
// standard output, a file in memory, or -1. The caller closes it, also after a failure.
failure run_ffmpeg(const ffmpeg_task &task, int stop_fd, const output_check &check, int &output);

constexpr int kIdleSeconds = 30;

// An ffmpeg filter that starts the timeline at 0 and fills gaps with silence, as players do.
constexpr const char *kPlayerTimeFilter = "aresample=async=1:first_pts=0";
