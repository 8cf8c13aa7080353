// The sound files of a song: the click track (--click), which the library writes, and the highlight
// (--clip), which the ffmpeg program cuts out of the song.
//
// Input: the options, and for a clip a record with a highlight (run/record.h) and its song
// (input/song_file.h). Output: files. Used by run/analyse.h and run/reply.h.
#pragma once

#include <string>

#include "cli/failure.h"
#include "cli/input/song_file.h"
#include "cli/options.h"
#include "cli/run/record.h"
#include "cli/write/output_file.h"

// Called before the job. Without --click, no track is written. Otherwise points fnamedec (tavo.h)
// at the temporary file of the track. Fails if the track would replace the input.
failure begin_click(output_file &track, const options &opts, const std::string &input);

// Called after the job. Renames a complete track to its target and removes an incomplete one.
failure finish_click(output_file &track, const options &opts, bool is_analysed);

// Returns the path of an input's clip. If opts.clip is a folder, the clip is a file in that folder,
// with an extension that depends on the input's. Otherwise the path is opts.clip.
std::string clip_path(const std::string &input, const options &opts);

// Writes opts.length_s seconds of the song, starting at the highlight, with fades of opts.fade_s
// seconds at both ends. All times are player times. Fails if stop_fd becomes readable,
// which requests a stop. A failure leaves the target unchanged.
failure write_clip(const record &result, const options &opts, const std::string &target,
                   int stop_fd, const song_file &song);
