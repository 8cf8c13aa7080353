// A song as the library can open it: the file itself, what came through a pipe, or what ffmpeg
// decoded.
//
// In: a path of the command line. Out: a path for the library. Called by run/analyse.h.
#ifndef TAVO_CLI_INPUT_SONG_FILE_H
#define TAVO_CLI_INPUT_SONG_FILE_H

#include <string>

#include "cli/failure.h"
#include "cli/options.h"

struct song_file {
    std::string path;        // for the library; holds at least until close_song
    int fd = -1;             // kept open for path, -1 for none
    int source_fd = -1;      // what the song was before ffmpeg decoded it; -1 if a file
    bool by_ffmpeg = false;  // path leads to ffmpeg's sound
};

// Opens a file, or reads a pipe that the command was started with (/dev/stdin, /dev/fd/N) to its
// end. Waits for no other file. After a failure there is nothing to close.
failure open_song(const std::string &path, int stop_fd, song_file &song);

// True if the library refuses the song for a reason that ffmpeg may not have: its format, its
// coding or its rate.
bool needs_ffmpeg(const song_file &song);

// Replaces the song by what ffmpeg decodes of it. After a failure, as without ffmpeg, the song is
// as before.
failure decode_song(const std::string &path, const options &opts, int stop_fd, song_file &song);

// Decodes the song at path, which is open as song, with ffmpeg into a second one: the channel that
// the library analyses, from offset_ms before the player's time 0, each sample multiplied by gain
// and saturated. After a failure there is nothing to close.
failure raise_song(const std::string &path, const options &opts, int stop_fd, const song_file &song,
                   double gain, double offset_ms, song_file &raised);

// Harmless when called twice.
void close_song(song_file &song);

#endif
