// Bare MPEG audio files, Layers I to III: one scan over the frame headers, past tags and garbage.
//
// In: the file. Out: a stream_info record.
//
// Positions of seeks and the duration count the PCM that the source delivers. The source drops the
// start of the first frame of a 44.1-kHz stereo stream, so a sample is that much later in what is
// decoded. The times that come with the frames count what is decoded: 0 marks the first frame,
// whole.
#ifndef WEXAAUDIO_MPEG_SCAN_H
#define WEXAAUDIO_MPEG_SCAN_H

#include "desktop/wexaaudio/shared/stream.h"

extern const scan_kind kMpegScan;

#endif
