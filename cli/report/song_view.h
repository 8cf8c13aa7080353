// Builds the JSON that song.js draws: the result, the waveform and the loudness of a song. The page
// of --report and the page of web/ use it.
//
// Input: a record (run/record.h). Output: JSON. Precedes report/report.h.
#ifndef TAVO_CLI_REPORT_SONG_VIEW_H
#define TAVO_CLI_REPORT_SONG_VIEW_H

#include "cli/failure.h"
#include "cli/run/record.h"
#include "cli/write/json.h"

// Reads the sound once, up to its end or a read error. Fails after a stop, which makes stop_fd
// readable.
//
// The view receives values of the result and: "wave", the lowest and the highest sample of each of
// at most 4000 columns, from -127 to 127 at the song's peak; "loudness", one value every 2 s for
// the following 6 s; and "mean", the mean of these values. All times are those of a player, so the
// first decoded sample is at "sound_ms", which may be negative. The caller adds the sound as
// "audio" (a URL) or "embedded" (base64).
failure read_song_view(const record &result, int stop_fd, result_json &view);

#endif
