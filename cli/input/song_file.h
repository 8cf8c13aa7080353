// A song in a form that the library can open: the file itself, the contents of a pipe, or the
// output of ffmpeg.
//
// Input: a path that the user named. Output: a path for the library. Used by inputs.h,
// run/analyse.h, run/reply.h and write/sound_files.h.
#pragma once

#include <string>

#include "cli/failure.h"
#include "cli/options.h"

struct song_file {
    std::string path;        // for the library; valid at least until close_song
    int fd = -1;             // open while path is used, or -1
    int source_fd = -1;      // descriptor that ffmpeg reads; -1 if it opens the file by name
    bool by_ffmpeg = false;  // path is the output of ffmpeg
};

// Opens a file, or reads an inherited pipe (/dev/stdin, /dev/fd/N) to its end. Only such a pipe can
// block. After a failure there is nothing to close.
failure open_song(const std::string &path, int stop_fd, song_file &song);

// Replaces the song with the output of ffmpeg. After a failure, or without ffmpeg, the song is
// unchanged.
failure decode_song(const std::string &path, const options &opts, int stop_fd, song_file &song);

// Decodes the open song at `path` again with ffmpeg, into `raised`. The output is the mono signal
// that the library analyses. It starts offset_ms before player time 0, and each sample is
// multiplied by `gain` and clipped. After a failure there is nothing to close.
failure raise_song(const std::string &path, const options &opts, int stop_fd, const song_file &song,
                   double gain, double offset_ms, song_file &raised);

// May be called twice.
void close_song(song_file &song);
