// The highlight as an audio file, cut out of the song by the ffmpeg program: --clip.
//
// Input: a record with a highlight (run/record.h) and its song (input/song_file.h). Output: a file.
// Follows run/analyse.h. Used by run/worker_process.h.
#ifndef TAVO_CLI_WRITE_CLIP_H
#define TAVO_CLI_WRITE_CLIP_H

#include <string>

#include "cli/failure.h"
#include "cli/input/song_file.h"
#include "cli/options.h"
#include "cli/run/record.h"

// Returns the path of an input's clip. If opts.clip is a folder, the clip is a file in that folder,
// with an extension that depends on the input's. Otherwise the path is opts.clip.
std::string clip_path(const std::string &input, const options &opts);

// Writes opts.length_s seconds of the song, starting at the highlight, with fades of opts.fade_s
// seconds at both ends. All times are player times. Fails if stop_fd becomes readable,
// which requests a stop. A failure leaves the target unchanged.
failure write_clip(const record &result, const options &opts, const std::string &target,
                   int stop_fd, const song_file &song);

#endif
