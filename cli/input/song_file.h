// A song in a form that the library can open: the file itself, the contents of a pipe, or the
// output of ffmpeg.
//
// Input: a path that the user named. Output: a path for the library. Used by inputs.h and the
// worker's files in run/.
#ifndef TAVO_CLI_INPUT_SONG_FILE_H
#define TAVO_CLI_INPUT_SONG_FILE_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"

struct song_file {
    std::string path;        // for the library; valid at least until close_song
    int fd = -1;             // stays open as long as path is used; or -1
    int source_fd = -1;      // what ffmpeg decoded, or -1 if it is the file itself
    bool by_ffmpeg = false;  // path is the sound decoded by ffmpeg
};

// Opens a file, or reads an inherited pipe (/dev/stdin, /dev/fd/N) to its end. Does not wait for
// any other file. After a failure there is nothing to close.
failure open_song(const std::string &path, int stop_fd, song_file &song);

// Replaces the song with the output of ffmpeg. After a failure, or without ffmpeg, the song is
// unchanged.
failure decode_song(const std::string &path, const options &opts, int stop_fd, song_file &song);

// Decodes the song at `path` again with ffmpeg into `raised`: the channel that the library
// analyses, starting offset_ms before the player's time 0, with each sample multiplied by `gain`
// and clipped. song: the same song, opened before. After a failure there is nothing to close.
failure raise_song(const std::string &path, const options &opts, int stop_fd, const song_file &song,
                   double gain, double offset_ms, song_file &raised);

// May be called twice.
void close_song(song_file &song);

#endif
