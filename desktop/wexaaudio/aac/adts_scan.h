// AAC in ADTS form, after any ID3v2 tags: one scan of the frame headers at open finds every frame.
//
// In: the file. Out: a stream_info record.
#ifndef WEXAAUDIO_ADTS_SCAN_H
#define WEXAAUDIO_ADTS_SCAN_H

#include "desktop/wexaaudio/shared/stream.h"

extern const scan_kind kAdtsScan;

#endif
