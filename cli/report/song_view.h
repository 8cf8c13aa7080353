// Builds the JSON that song.js draws: the result, the waveform and the loudness of a song. Used by
// the page of --report and by the page of web/.
//
// In: a record (record.h) and the file that it describes. Out: JSON. After: report.h.
#ifndef TAVO_CLI_REPORT_SONG_VIEW_H
#define TAVO_CLI_REPORT_SONG_VIEW_H

#include "cli/failure.h"
#include "cli/run/record.h"
#include "cli/write/json.h"

// Reads the sound once, up to its end or a read error. stop_fd: as for analyse.
//
// view receives values of the result and: "wave", the lowest and the highest sample of each of at
// most 4000 columns, on a scale of -127 to 127 relative to the song's peak; "loudness", one value
// every 2 s for the following 6 s; and "mean", the mean of these values. All times are those of a
// player. The first decoded sample is at "sound_ms", which may be negative. The caller adds the
// sound as "audio" (a URL) or "embedded" (base64).
failure read_song_view(const record &result, int stop_fd, result_json &view);

#endif
