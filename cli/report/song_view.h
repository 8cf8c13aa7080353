// Builds the JSON that song.js draws: a song's result, waveform and loudness. The pages of --report
// and web/ use it.
//
// Input: a record (run/record.h). Output: JSON. Precedes report/report.h.
#pragma once

#include "cli/failure.h"
#include "cli/run/record.h"
#include "cli/write/format.h"

// Reads the sound once, up to its end or a read error. Fails if stop_fd becomes readable, which
// requests a stop.
//
// The view is the object of --format json, with the file's name instead of its path, and the
// following. "wave" has the lowest and the highest sample of each of 4000 columns, scaled to a peak
// of 127. "loudness" has a value every 2 s, for the 6 s that start there. "read_ms" is the length
// of the decoded sound, "searched_ms" the span that is searched for a highlight, and
// "region_end_ms" the end of the region to show. The script converts times to a player's. The
// caller adds the sound as "audio" (a URL) or "embedded" (base64).
failure read_song_view(const record &result, int stop_fd, result_json &view);
