// What song.js draws: a song's result, its waveform and its loudness, as JSON. In the page of
// --report and in the page of web/.
//
// In: a record (record.h) and the file that it describes. Out: JSON. After: report.h.
#ifndef TAVO_CLI_REPORT_SONG_VIEW_H
#define TAVO_CLI_REPORT_SONG_VIEW_H

#include "cli/failure.h"
#include "cli/run/record.h"
#include "cli/write/json.h"

// Reads the sound once, from its start to its end or to a read error. stop_fd: as for analyse.
//
// view receives, besides values of the result: "wave", the lowest and the highest sample of each of
// at most 4000 columns in turn, on a scale of -127 to 127 of the song's own peak; "loudness", a
// value for the 6 s from each 2 s on, and its "mean". All times are the player's; the first decoded
// sample is at "sound_ms", which may be negative. The sound itself is left to the caller: "audio"
// (a URL) or "embedded" (base64).
failure read_song_view(const record &result, int stop_fd, result_json &view);

#endif
