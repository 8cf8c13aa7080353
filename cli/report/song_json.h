// What song.js draws: the result, the waveform and the loudness as JSON. In the page of --report
// and in the page of web/.
#ifndef TAVO_CLI_REPORT_SONG_JSON_H
#define TAVO_CLI_REPORT_SONG_JSON_H

#include "cli/report/song_view.h"
#include "cli/run/record.h"
#include "cli/write/json.h"

constexpr int kReportColumns = 4000;  // of the waveform: sharp when zoomed, about 30 KB

// All times are the player's; the first decoded sample is at sound_ms, which may be negative.
// Without the sound: the caller adds "audio" (a URL) or "embedded" (base64).
result_json song_json(const record &result, const song_view &view);

#endif
