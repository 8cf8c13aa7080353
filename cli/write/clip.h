// The highlight as an audio file, cut by the ffmpeg program: --clip.
//
// In: a record with a highlight (record.h) and its song. Out: a file. Called by
// run/worker_process.h.
#ifndef TAVO_CLI_WRITE_CLIP_H
#define TAVO_CLI_WRITE_CLIP_H

#include <string>

#include "cli/failure.h"
#include "cli/input/song_file.h"
#include "cli/options.h"
#include "cli/run/record.h"

// Returns the path of an input's clip: opts.clip, or a file in that folder with the extension of
// the input's kind of audio.
std::string clip_path(const std::string &input, const options &opts);

// Writes opts.length_s seconds from the highlight on, at the player's time, with fades of
// opts.fade_s seconds at both ends. A failure is stored in result; target is then unchanged.
failure write_clip(const record &result, const options &opts, const std::string &target,
                   int stop_fd, const song_file &song);

#endif
