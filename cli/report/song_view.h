// Builds the JSON that song.js draws: a song's result, waveform and loudness. The pages of --report
// and web/ use it.
//
// Input: a record (run/record.h). Output: JSON. Precedes report/report.h.
#ifndef TAVO_CLI_REPORT_SONG_VIEW_H
#define TAVO_CLI_REPORT_SONG_VIEW_H

#include "cli/failure.h"
#include "cli/run/record.h"
#include "cli/write/json.h"

// Reads the sound once, up to its end or a read error. Fails if stop_fd becomes readable, which
// requests a stop.
//
// The view receives values of the result and the following. "wave" has the lowest and the highest
// sample of each of 4000 columns, scaled to a peak of 127. "loudness" has a value every 2 s, for
// the 6 s that start there. All times are player times, so "sound_ms", the time of the first
// decoded sample, may be negative; "read_ms" is the length of the decoded sound. The caller adds
// the sound as "audio" (a URL) or "embedded" (base64).
failure read_song_view(const record &result, int stop_fd, result_json &view);

#endif
